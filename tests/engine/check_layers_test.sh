#!/usr/bin/env bash
# SPDX-License-Identifier: MIT
# check_layers_test.sh SCRIPT: scripts/check_layers.sh sees what it is there to see.
set -euo pipefail
tree=$(mktemp -d)
trap 'rm -rf "$tree"' EXIT
mkdir -p "$tree"/src/platform "$tree"/src/math
echo '#include "platform/low.h"' >"$tree/src/math/high.h"
echo '#include <cstdint>' >"$tree/src/platform/low.h"
printf '#include "math/high.h"\n#include "table.inc"\n' >"$tree/src/engine.h"
"$1" "$tree"

refused() {  # SCRIPT MESSAGE: the script fails, saying that and nothing else
  local said
  if said=$("$1" "$tree"); then echo "accepted, instead of: $2"; exit 1; fi
  [ "$said" = "$2" ] || { echo "said '$said' instead of '$2'"; exit 1; }
}
echo '#include "math/high.h"' >>"$tree/src/platform/low.h"
refused "$1" 'src/platform/low.h:2: includes math/high.h of a higher layer'
echo '#include "engine.h"' >"$tree/src/platform/low.h"
refused "$1" 'src/platform/low.h:1: includes engine.h of a higher layer'
mkdir "$tree/src/elsewhere"
echo >"$tree/src/platform/low.h"
echo >"$tree/src/elsewhere/file.cpp"
refused "$1" 'src/elsewhere/file.cpp: its folder has no place among the layers'
