#!/usr/bin/env bash
# Runs clang-tidy over every source that a preset builds, or over those whose paths match.
#
# usage: lint.sh [REGULAR EXPRESSION…]
set -euo pipefail

cd "$(dirname "${BASH_SOURCE[0]}")/.."
# The compiler's command lines are enough; nothing is built.
[[ -f build/release/build.ninja ]] || cmake --preset release
patterns=("$@")
[[ $# -gt 0 ]] || patterns=("^$PWD/(src|tests|bench)/")
# clang-tidy reads options of g++ that clang does not have; the probes of sys/sdt.h are written in GNU C.
exec run-clang-tidy -quiet -extra-arg=-Wno-ignored-optimization-argument -extra-arg=-Wno-gnu-statement-expression -p build/release -j "$(nproc)" "${patterns[@]}"
