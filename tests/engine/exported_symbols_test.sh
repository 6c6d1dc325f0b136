#!/usr/bin/env bash
# SPDX-License-Identifier: MIT
# The shared library exports what the public headers declare and nothing else, and is fit for
# devices with 16 KB pages.
#   exported_symbols_test.sh LIBRARY SOURCE_DIRECTORY NM READELF
set -euo pipefail
library=$1 source=$2 nm=$3 readelf=$4
status=0
complain() { printf '%s\n' "$1"; status=1; }

# Functions declared in the headers, by the name they are linked under.
declared=$(cat "$source"/include/*.h | tr '\n' ' ' | sed 's#/\*[^*]*\*\+\([^/*][^*]*\*\+\)*/# #g' |
  grep -o 'N3DS_API [^;{]*;' | grep -v __attribute__ |
  sed -E 's/.*N3DS_CPP_NAME\("([^"]+)"\).*/\1/; t; s/^N3DS_API +[^(]*[ *]([A-Za-z0-9_]+)\(.*/\1/' | sort)
exported=$("$nm" -D --defined-only "$library" | awk '{print $3}' | sort)
listed=$(sed -n 's/^    \([A-Za-z0-9_]*\);$/\1/p' "$source/src/exports.map" | sort)

difference=$(diff <(echo "$declared") <(echo "$exported") || true)
[ -z "$difference" ] || complain "declared (<) and exported (>) differ:
$difference"
difference=$(diff <(echo "$listed") <(echo "$exported") || true)
[ -z "$difference" ] || complain "listed in exports.map (<) and exported (>) differ:
$difference"
for name in _Z30Norvale_3DSticker_InitializeExPvPKhjjj _Z36Norvale_3DSticker_SetDegreeAndMirrorPvjj; do
  grep -qx "$name" <<<"$exported" || complain "$name is missing"
done
[ "$(wc -l <<<"$exported")" -ge 80 ] || complain "suspiciously few exports"

# Sanitizer builds need their runtime and are not shipped.
if ! "$readelf" -dW "$library" | grep -qE 'NEEDED.*(asan|tsan|ubsan)'; then
  foreign=$("$readelf" -dW "$library" | sed -n 's/.*NEEDED.*\[\(.*\)\]/\1/p' |
    grep -vE '^(libstdc\+\+|libc|libm|libgcc_s|libpthread)\.so|^ld-linux' || true)
  [ -z "$foreign" ] || complain "needs more than the standard libraries: $foreign"
fi
misaligned=$("$readelf" -lW "$library" | awk '$1 == "LOAD" && $NF != "0x4000"')
[ -z "$misaligned" ] || complain "LOAD segments not aligned to 16 KB:
$misaligned"
"$readelf" -lW "$library" | grep 'GNU_STACK' | grep -q 'RW ' || complain "executable stack"
! "$readelf" -dW "$library" | grep -q TEXTREL || complain "text relocations"
exit "$status"
