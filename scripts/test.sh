#!/usr/bin/env bash
# Builds a preset and runs its tests.
#
# usage: test.sh PRESET [option of ctest…]
set -euo pipefail

cd "$(dirname "${BASH_SOURCE[0]}")/.."
preset=${1:?usage: test.sh PRESET [option of ctest…]}
shift

scripts/build.sh "$preset"
# A test that finds no test is a mistake in the build, not a success.
exec ctest --preset "$preset" --parallel "$(nproc)" --no-tests=error "$@"
