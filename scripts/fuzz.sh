#!/usr/bin/env bash
# Runs the fuzzers in turn, each from its kept corpus; they share the time. New inputs that reach new code are left in
# build/fuzz/corpus/; an input that breaks something is left in build/fuzz/findings/, and the script fails.
#
# usage: fuzz.sh SECONDS [--keep]    --keep: adds what was found, minimized, to the kept corpus
set -euo pipefail

cd "$(dirname "${BASH_SOURCE[0]}")/.."
seconds=${1:?usage: fuzz.sh SECONDS [--keep]}
keep=${2:-}

fuzzers=(frame_decoding metric_record)
scripts/build.sh fuzz "${fuzzers[@]/%/_fuzzer}"
mkdir -p build/fuzz/findings

for name in "${fuzzers[@]}"; do
  fuzzer=build/fuzz/bin/${name}_fuzzer
  kept=fuzz/corpus/$name
  found=build/fuzz/corpus/$name
  mkdir -p "$found"
  # A frame of the real limit in length is not needed to reach all code.
  "$fuzzer" -max_total_time=$((seconds / ${#fuzzers[@]})) -max_len=8192 -timeout=10 -rss_limit_mb=1024 -print_final_stats=1 \
    -artifact_prefix="build/fuzz/findings/$name-" "$found" "$kept"
  if [[ $keep == --keep ]]; then
    # By edges alone, so that it stays small.
    "$fuzzer" -set_cover_merge=1 -use_counters=0 -max_len=8192 "$kept" "$found"
  fi
done
