#!/usr/bin/env bash
# Configures a preset where that was not done yet, and builds it.
#
# usage: build.sh PRESET [TARGET…]    no target: everything
set -euo pipefail

cd "$(dirname "${BASH_SOURCE[0]}")/.."
preset=${1:?usage: build.sh PRESET [TARGET…]}
shift

# Ninja configures anew by itself when a CMake file has changed.
[[ -f build/$preset/build.ninja ]] || cmake --preset "$preset"
targets=()
[[ $# -eq 0 ]] || targets=(--target "$@")
exec cmake --build --preset "$preset" --parallel "${CMAKE_BUILD_PARALLEL_LEVEL:-$(nproc)}" "${targets[@]}"
