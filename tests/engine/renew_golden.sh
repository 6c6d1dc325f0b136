#!/usr/bin/env bash
# SPDX-License-Identifier: MIT
# Writes golden_values.inc and golden_frames.txt anew from what the tests find.
# usage: tests/engine/renew_golden.sh [BUILD_FOLDER]       default: build/release
set -euo pipefail
here=$(cd "$(dirname "$0")" && pwd)
programs=${1:-$here/../../build/release}/tests
table=$here/golden_values.inc
export N3DS_GOLDEN_FOLDER
N3DS_GOLDEN_FOLDER=$(mktemp -d)
trap 'rm -r "$N3DS_GOLDEN_FOLDER"' EXIT

for program in engine/golden_tracks_test math/pose_solver_test core/shape_fitting_test; do
  # They fail where a value has changed.
  "$programs/$program" --gtest_filter='*Golden*' >/dev/null || true
done
mapfile -t names < <(sed -nE 's/^\{"([a-z0-9_]+)".*/\1/p' "$table")
rows=("${names[@]/#/$N3DS_GOLDEN_FOLDER/}")
{ grep '^//' "$table"; cat "${rows[@]/%/.row}"; } >"$N3DS_GOLDEN_FOLDER/table"
cat "${rows[@]/%/.frames}" >"$here/golden_frames.txt"
cp "$N3DS_GOLDEN_FOLDER/table" "$table"
