#!/usr/bin/env bash
# SPDX-License-Identifier: MIT
# The tree's text: no tabs, no trailing blanks, a newline at the end, a licence line in every source
# file; no stray entries in the root.
set -euo pipefail
cd "$(dirname "$0")/.."

status=0
complain() { printf '%s\n' "$1" >&2; status=1; }

# A script that takes an option for a file name leaves such entries behind, and they turn into
# options of the next `wc *`.
root_entries='.ci .clang-format .clang-tidy .editorconfig .gitattributes .github .gitignore
CHANGELOG.md CMakeLists.txt CMakePresets.json CONTRIBUTING.md LICENSE README.md SECURITY.md
THIRD_PARTY.md android bench cmake data demo docs examples include scripts src test tests tools web'
while IFS= read -r entry; do
  if ! grep -qxF -- "$entry" <<<"${root_entries//[[:space:]]/$'\n'}"; then
    complain "$entry: not an entry of the root; if it is meant to be, list it in $0"
  fi
done < <(git ls-files | cut -d/ -f1 | sort -u)
while IFS= read -r path; do
  complain "$path: a name that starts with a dash"
done < <(git ls-files | grep -E '(^|/)-' || true)

sources=('*.h' '*.c' '*.cpp' '*.inc' '*.py' '*.sh' '*.cmake' '*CMakeLists.txt' 'src/exports.map'
  demo test .ci/run)
while IFS= read -r file; do
  if ! head -n 3 -- "$file" | grep -q 'SPDX-License-Identifier: MIT'; then
    complain "$file: no licence line"
  fi
done < <(git ls-files -- "${sources[@]}")

while IFS= read -r file; do
  [ -s "$file" ] || continue
  grep -Iq . "$file" || continue
  if grep -nP '[ \t]+$' "$file" >/dev/null; then complain "$file: blanks at the end of a line"; fi
  if grep -nP '\t' "$file" >/dev/null; then complain "$file: tab"; fi
  if [ -n "$(tail -c 1 "$file")" ]; then complain "$file: no newline at the end"; fi
done < <(git ls-files -- "${sources[@]}" '*.md' '*.yml')
exit "$status"
