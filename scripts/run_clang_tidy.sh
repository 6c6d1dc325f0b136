#!/usr/bin/env bash
# SPDX-License-Identifier: MIT
# clang-tidy over the project's own sources; any finding is an error.
#   scripts/run_clang_tidy.sh BUILD_DIRECTORY   (configured, with compile_commands.json)
set -euo pipefail
cd "$(dirname "$0")/.."

git ls-files 'src/*.cpp' 'tools/*.cpp' | sort |
  xargs -P "$(nproc)" -n 4 clang-tidy --quiet -p "$1" 2>/dev/null
