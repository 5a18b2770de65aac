#!/usr/bin/env bash
# Builds the benchmarks (Release) and runs them one after the other, so that none disturbs another.
#
# usage: bench.sh [option of the benchmarks…]
set -euo pipefail

cd "$(dirname "${BASH_SOURCE[0]}")/.."
scripts/build.sh release programs benchmarks

shopt -s nullglob
benchmarks=(build/release/bin-bench/*)
[[ ${#benchmarks[@]} -gt 0 ]] || { echo "bench: there are no benchmarks" >&2; exit 1; }
for benchmark in "${benchmarks[@]}"; do
  "$benchmark" "$@"
done
