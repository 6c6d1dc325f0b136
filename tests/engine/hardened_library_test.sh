#!/usr/bin/env bash
# SPDX-License-Identifier: MIT
# The shared library is protected against overruns and against being rewired by its host: checks of
# the stack, of copies and of indirect branches, relocations that are final before the first call,
# and no call of its own functions that another library's function of the same name could take over.
#   hardened_library_test.sh LIBRARY BUILD_TYPE COMPILER NM READELF OBJDUMP
set -euo pipefail
library=$1 build_type=$2 compiler=$3 nm=$4 readelf=$5 objdump=$6
status=0
complain() { printf '%s\n' "$1"; status=1; }
has() { grep -q -- "$1" <<<"$2"; }

dynamic=$("$readelf" -dW "$library")
segments=$("$readelf" -lW "$library")
undefined=$("$nm" -D --undefined-only "$library" | awk '{print $2}')

has 'GNU_RELRO' "$segments" || complain "no read-only relocations"
has 'NOW' "$dynamic" || complain "symbols are bound lazily: the relocation table stays writable"
has '__stack_chk_fail' "$undefined" || complain "no stack protector"
# Clang writes the library's few lines without any function that has a checked form.
if [ "$build_type" != Debug ] && [ "$compiler" = GNU ]; then
  has '_chk\b' "$(grep -v __stack_chk_fail <<<"$undefined")" || complain "no checked string functions"
fi

# Exported functions that the library calls by name instead of directly.
exported=$("$nm" -D --defined-only "$library" | awk '{print $3}' | sort)
called=$("$readelf" -rW "$library" | awk '/JUMP_SL/ {sub(/@.*/, "", $5); print $5}' | sort)
open=$(comm -12 <(echo "$exported") <(echo "$called"))
[ -z "$open" ] || complain "a host can replace the library's own:
$open"

case "$("$readelf" -hW "$library")" in
  *AArch64*)
    code=$("$objdump" -d "$library")
    [ "$(grep -c paciasp <<<"$code")" -ge 50 ] || complain "return addresses are not signed"
    [ "$(grep -cE "\sbti\s" <<<"$code")" -ge 50 ] || complain "no branch target marks"
    ;;
  *X86-64*)
    [ "$("$objdump" -d "$library" | grep -c endbr64)" -ge 100 ] || complain "no branch target marks"
    ;;
esac
exit "$status"
