#!/usr/bin/env bash
# Builds and starts the daemon and the PipeWire reporter, and prints analytics events as they come, until Ctrl-C or
# SIGTERM. Ends everything that it started and nothing else.
#
# A daemon that runs already on this user's directories is used, and left running. So is the PipeWire of the user's
# session; where there is none, a private one with a null sink is started, and a tone is played to it.
set -euo pipefail

cd "$(dirname "${BASH_SOURCE[0]}")/.."
readonly bin=$PWD/build/release/bin
readonly patience_seconds=30

scripts/setup.sh run
scripts/build.sh release programs

say() { printf 'run: %s\n' "$*"; }
fail() {
  printf 'run: %s\n' "$*" >&2
  exit 1
}

# Where the daemon that this user starts listens; talctl and the reporter are told, so that all three mean the same one.
if [[ -z ${TALREPORTING_SOCKET:-} ]]; then
  if [[ $(id -u) -eq 0 ]]; then
    TALREPORTING_SOCKET=/run/talreporting/talreporting.sock
  else
    [[ -n ${XDG_RUNTIME_DIR:-} ]] || fail "XDG_RUNTIME_DIR is not set: log in to a session of your own, or set it"
    TALREPORTING_SOCKET=$XDG_RUNTIME_DIR/talreporting/talreporting.sock
  fi
  default_socket=1
fi
export TALREPORTING_SOCKET

work=$(mktemp -d "${TMPDIR:-/tmp}/talreporting-run.XXXXXX")
started=()  # process groups, the last one first
watched=()  # what has to run for as long as this does

# start NAME COMMAND…: in the background, in a process group of its own, which Ctrl-C does not reach; so the end has an
# order. $! is the group. What it says goes to a file.
start() {
  setsid "${@:2}" </dev/null >"$work/$1.out" 2>"$work/$1.log" &
  started=("$!" "${started[@]}")
}

# stop GROUP: politely, then not.
stop() {
  # The group may not have been made yet.
  kill -TERM -- "-$1" 2>/dev/null || kill -TERM "$1" 2>/dev/null || return 0
  for ((tries = 0; tries < 200; ++tries)); do
    kill -0 -- "-$1" 2>/dev/null || return 0
    sleep 0.05
  done
  kill -KILL -- "-$1" 2>/dev/null || true
}

end() {
  trap - EXIT
  trap '' INT TERM HUP
  for group in "${started[@]}"; do stop "$group"; done
  # Last, so that the events of the end are seen, too.
  [[ -z ${events:-} ]] || kill "$events" 2>/dev/null || true
  wait 2>/dev/null || true
  rm -rf "$work"
}
trap end EXIT
trap 'echo; exit 0' INT TERM HUP

# await NAME COMMAND…: until the command succeeds, while what was started last runs.
await() {
  local deadline=$((SECONDS + patience_seconds))
  until "${@:2}" >/dev/null 2>&1; do
    if ! kill -0 "${started[0]}" 2>/dev/null || ((SECONDS >= deadline)); then
      cat "$work/$1.log" >&2
      fail "$1 does not come up"
    fi
    sleep 0.05
  done
}

runs_already() {
  local process
  for process in /proc/[0-9]*; do
    # The kernel keeps the first 15 characters of a name.
    [[ -O $process && $(cat "$process/comm" 2>/dev/null) == "${1:0:15}" ]] && return 0
  done
  return 1
}

if "$bin/talctl" status >/dev/null 2>&1; then
  say "a daemon runs already at $TALREPORTING_SOCKET: using it"
else
  [[ -n ${default_socket:-} ]] || fail "no daemon at TALREPORTING_SOCKET=$TALREPORTING_SOCKET, and another cannot be started there"
  start daemon "$bin/talreportingd"
  watched+=("$!")
  await daemon "$bin/talctl" status
  say "the daemon runs at $TALREPORTING_SOCKET"
fi

private=""
if timeout 5 pw-cli info 0 >/dev/null 2>&1; then
  say "using the PipeWire of this session"
else
  private=$work/pipewire
  start pipewire scripts/lib/private-pipewire.sh "$private"
  watched+=("$!")
  await pipewire grep -q ready "$work/pipewire.out"
  export PIPEWIRE_RUNTIME_DIR=$private
  say "this session has no PipeWire: started a private one"
fi

if [[ -z $private ]] && runs_already tal-pipewire-reporter; then
  say "a PipeWire reporter runs already: using it"
elif [[ -x $bin/tal-pipewire-reporter ]]; then
  start reporter "$bin/tal-pipewire-reporter"
  watched+=("$!")
else
  fail "tal-pipewire-reporter was not built: libpipewire-0.3 was missing when the build was configured"
fi

"$bin/talctl" events --follow -n 0 </dev/null &
events=$!
watched+=("$events")

if [[ -n $private ]]; then
  tone=$work/tone.wav
  sox -q -n -r 44100 -c 2 -b 16 "$tone" synth 2 sine 440 fade 0.1 2 gain -12
  start tone pw-play --media-role Music "$tone"
  say "playing a tone; to play it again: PIPEWIRE_RUNTIME_DIR=$private pw-play --media-role Music $tone"
else
  say "play something"
fi
say "Ctrl-C ends"

# All of these run until they are told to end.
wait -n -p ended "${watched[@]}" || status=$?
if [[ $ended == "$events" ]]; then exit "${status:-0}"; fi
cat "$work"/*.log >&2
fail "the daemon, the reporter or PipeWire has ended by itself"
