#!/usr/bin/env bash
# SPDX-License-Identifier: MIT
# Runs every benchmark program and writes one CSV of medians each; without program names also the
# comparison of the tracking with solvePnP, a text.
# usage: bench/run.sh [OUTPUT_DIRECTORY] [PROGRAM_NAME...]      default: build/bench/results, all
set -euo pipefail
root=$(cd "$(dirname "$0")/.." && pwd)
out=${1:-$root/build/bench/results}
names=("${@:2}")
programs=$root/build/bench/programs
if [ ! -d "$programs" ]; then
  echo "no programs in $programs: cmake --preset bench && cmake --build --preset bench" >&2
  exit 1
fi
mkdir -p "$out"
peer=$root/build/bench/solve_pnp_peer
if [ "${#names[@]}" -eq 0 ]; then
  for program in "$programs"/*; do names+=("$(basename "$program")"); done
  if [ -x "$peer" ]; then
    echo solve_pnp_peer >&2
    "$peer" "$root"/examples/tracks/synthetic_*.track.jsonl >"$out/solve_pnp_peer.txt"
  fi
fi
for name in "${names[@]}"; do
  echo "$name" >&2
  # Repetitions of different benchmarks take turns, so that a busy minute of the machine falls on
  # all of them alike.
  "$programs/$name" --benchmark_repetitions=15 --benchmark_min_time=0.05 \
    --benchmark_enable_random_interleaving=true --benchmark_report_aggregates_only=true \
    --benchmark_format=csv >"$out/$name.csv.part" 2>"$out/$name.log"
  {
    grep '^name,' "$out/$name.csv.part"
    grep '_median"' "$out/$name.csv.part" | sort
  } | cut -d, -f1,3-5,11- >"$out/$name.csv"
  rm "$out/$name.csv.part"
done
