#!/bin/sh
# Installs the client library into a directory of its own, and builds the examples against it as another project would:
# by the CMake package, and by pkg-config.
#
# usage: installed_library.sh BUILD_DIRECTORY EXAMPLES_DIRECTORY
set -eu
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

cmake --install "$1" --component client --prefix "$work/usr" >"$work/log"
cmake -S "$2" -B "$work/build" -DCMAKE_PREFIX_PATH="$work/usr" >>"$work/log"
cmake --build "$work/build" >>"$work/log"

PKG_CONFIG_PATH=$(dirname "$(find "$work/usr" -name talreporting.pc)")
export PKG_CONFIG_PATH
flags=$(pkg-config --define-variable=prefix="$work/usr" --cflags --libs talreporting)
# shellcheck disable=SC2086
cc -std=c11 -Wall -Wextra -Werror "$2/send_message.c" -o "$work/send_message" $flags

# Nobody is there to talk to: one clear line, and status 1.
LD_LIBRARY_PATH=$(dirname "$(find "$work/usr" -name libtalreporting.so)")
export LD_LIBRARY_PATH
export TALREPORTING_SOCKET="$work/nobody.sock"
if "$work/send_message" 2>"$work/said"; then exit 1; fi
grep -q "no daemon at $work/nobody.sock" "$work/said"
