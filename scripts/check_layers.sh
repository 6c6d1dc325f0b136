#!/usr/bin/env bash
# SPDX-License-Identifier: MIT
# scripts/check_layers.sh [FOLDER]: fails when a source file includes one of a higher layer. The
# layers are the folders of src/ in FOLDER (by default the repository) in the order below, and above
# them the files directly in src/.
set -euo pipefail
cd "${1:-$(dirname "$0")/..}"

# shellcheck disable=SC2016  # the dollars are awk's
find src -name '*.h' -o -name '*.cpp' | sort | xargs awk -v layers="platform math core mask steady" '
  BEGIN {
    top = split(layers, names) + 1
    for (i in names) rank[names[i]] = i
  }
  FNR == 1 {
    folder = FILENAME
    sub(/^src\//, "", folder)
    mine = top
    if (sub(/\/.*/, "", folder)) {
      mine = folder in rank ? rank[folder] : top
      if (!(folder in rank)) { print FILENAME ": its folder has no place among the layers"; bad = 1 }
    }
  }
  /^#include "/ {
    split($0, part, "\"")
    folder = part[2]
    if (sub(/\/.*/, "", folder)) {
      theirs = folder in rank ? rank[folder] : 0
    } else {
      theirs = (getline line < ("src/" part[2])) >= 0 ? top : 0  # else a public header or a table
      close("src/" part[2])
    }
    if (theirs > mine) {
      print FILENAME ":" FNR ": includes " part[2] " of a higher layer"
      bad = 1
    }
  }
  END { exit bad }'
