#!/usr/bin/env bash
# SPDX-License-Identifier: MIT
# clang-tidy over the project's own sources; any finding is an error.
#   scripts/run_clang_tidy.sh BUILD_DIRECTORY FOLDER...   (configured, with compile_commands.json)
set -euo pipefail
cd "$(dirname "$0")/.."

if [ "$#" -lt 2 ]; then
  echo "usage: scripts/run_clang_tidy.sh BUILD_DIRECTORY FOLDER..." >&2
  exit 2
fi
build=$1
shift

# The counts of suppressed warnings go to the error stream with everything else; they say nothing.
git ls-files -- "${@/%//*.cpp}" | sort |
  xargs -P "$(nproc)" -n 4 clang-tidy --quiet -p "$build" 2>&1 |
  { grep -vE '^[0-9]+ warnings? (and [0-9]+ errors? )?generated\.$' || true; }
