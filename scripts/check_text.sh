#!/usr/bin/env bash
# Text files: no tabs outside of makefiles, no trailing blanks, a newline at the end.
set -euo pipefail
cd "$(dirname "$0")/.."

status=0
complain() { printf '%s\n' "$1" >&2; status=1; }

while IFS= read -r file; do
  [ -s "$file" ] || continue
  grep -Iq . "$file" || continue
  if grep -nP '[ \t]+$' "$file" >/dev/null; then complain "$file: blanks at the end of a line"; fi
  if grep -nP '\t' "$file" >/dev/null; then complain "$file: tab"; fi
  if [ -n "$(tail -c 1 "$file")" ]; then complain "$file: no newline at the end"; fi
done < <(git ls-files '*.h' '*.c' '*.cpp' '*.inc' '*.py' '*.sh' '*.md' '*.cmake' '*CMakeLists.txt')
exit "$status"
