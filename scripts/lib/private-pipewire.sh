#!/usr/bin/env bash
# A PipeWire of one's own, for machines without sound hardware or a user session, and for tests: WirePlumber and a
# null sink, no devices, nothing of the user's configuration. Everything it writes is in DIRECTORY.
#
# usage: private-pipewire.sh DIRECTORY
#
# Runs until SIGTERM or SIGINT, or until PipeWire ends. Prints one line, "ready", once streams are played; what
# PipeWire and WirePlumber say goes to DIRECTORY/*.log. Clients reach it with PIPEWIRE_RUNTIME_DIR=DIRECTORY.
# Started again on the same DIRECTORY it remembers volumes, as a session's PipeWire does.
set -euo pipefail

readonly sink=private-sink
readonly patience_seconds=20

if [[ $# -ne 1 ]]; then
  echo "usage: private-pipewire.sh DIRECTORY" >&2
  exit 2
fi
mkdir -p "$1"
directory=$(cd "$1" && pwd)

for program in dbus-daemon pipewire wireplumber pw-metadata setpriv; do
  if ! command -v "$program" >/dev/null; then
    echo "private-pipewire: $program is missing" >&2
    echo "the Debian packages: dbus pipewire pipewire-bin util-linux wireplumber" >&2
    exit 1
  fi
done

export PIPEWIRE_RUNTIME_DIR=$directory XDG_RUNTIME_DIR=$directory
export XDG_CONFIG_HOME=$directory/config XDG_STATE_HOME=$directory/state XDG_CACHE_HOME=$directory/cache
unset PIPEWIRE_REMOTE PIPEWIRE_CONFIG_DIR PIPEWIRE_CONFIG_NAME WIREPLUMBER_CONFIG_DIR WIREPLUMBER_DATA_DIR DISPLAY
# WirePlumber ends where it finds no bus. On the user's it would dispute devices with the user's own WirePlumber, so it
# gets one on which nothing else is, nor can be started.
export DBUS_SESSION_BUS_ADDRESS=unix:path=$directory/bus

write() {
  mkdir -p "$(dirname "$1")"
  cat >"$1"
}

write "$XDG_CONFIG_HOME/pipewire/pipewire.conf.d/private-sink.conf" <<CONF
context.objects = [
  { factory = adapter
    args = {
      factory.name     = support.null-audio-sink
      node.name        = $sink
      node.description = "Private Sink"
      media.class      = Audio/Sink
      audio.position   = [ FL FR ]
    }
  }
]
CONF
# WirePlumber 0.4 is configured in Lua, later ones in a format of their own; each reads only its own.
write "$XDG_CONFIG_HOME/wireplumber/main.lua.d/60-no-devices.lua" <<'LUA'
alsa_monitor.enabled = false
v4l2_monitor.enabled = false
libcamera_monitor.enabled = false
LUA
write "$XDG_CONFIG_HOME/wireplumber/bluetooth.lua.d/60-no-devices.lua" <<'LUA'
bluez_monitor.enabled = false
LUA
write "$XDG_CONFIG_HOME/wireplumber/wireplumber.conf.d/60-no-devices.conf" <<'CONF'
wireplumber.profiles = {
  main = {
    monitor.alsa = disabled, monitor.alsa-midi = disabled
    monitor.bluez = disabled, monitor.bluez-midi = disabled
    monitor.libcamera = disabled, monitor.v4l2 = disabled
  }
}
CONF

write "$XDG_CONFIG_HOME/bus.conf" <<XML
<!DOCTYPE busconfig PUBLIC "-//freedesktop//DTD D-BUS Bus Configuration 1.0//EN"
 "http://www.freedesktop.org/standards/dbus/1.0/busconfig.dtd">
<busconfig>
  <type>session</type>
  <listen>$DBUS_SESSION_BUS_ADDRESS</listen>
  <auth>EXTERNAL</auth>
  <policy context="default">
    <allow send_destination="*" eavesdrop="true"/>
    <allow eavesdrop="true"/>
    <allow own="*"/>
  </policy>
</busconfig>
XML

pids=()
end() {
  trap - EXIT
  for pid in "${pids[@]}"; do kill "$pid" 2>/dev/null || true; done
  wait || true
}
trap end EXIT
trap 'exit 0' TERM INT

fail() {
  echo "private-pipewire: $1" >&2
  tail -n 5 "$directory"/*.log >&2
  exit 1
}

# start NAME COMMAND…: in the background, ended before those that were started earlier, and with this script even
# where that is killed.
start() {
  setpriv --pdeathsig TERM "${@:2}" </dev/null >"$directory/$1.log" 2>&1 &
  pids=("$!" "${pids[@]}")
}

deadline=$((SECONDS + patience_seconds))
# await WHAT COMMAND…: until the command succeeds, while what was started last runs.
await() {
  until "${@:2}"; do
    kill -0 "${pids[0]}" 2>/dev/null || fail "$1 has ended"
    ((SECONDS < deadline)) || fail "$1 does not come up"
    sleep 0.02
  done
}

# A socket's file is there a moment before somebody listens on it.
bus_listens() { grep -q "^unix:" "$directory/bus.log"; }
pipewire_listens() { pw-cli info 0 >"$directory/pw-cli.log" 2>&1; }
sink_is_chosen() { pw-metadata 0 default.audio.sink 2>/dev/null | grep -q "$sink"; }

rm -f "$directory/bus" "$directory/pipewire-0" "$directory"/*.log
start bus dbus-daemon --nofork --nopidfile --nosyslog --print-address --config-file="$XDG_CONFIG_HOME/bus.conf"
await "the bus" bus_listens
start pipewire pipewire
pipewire=${pids[0]}
await PipeWire pipewire_listens
start wireplumber wireplumber
# Streams are connected from the moment at which WirePlumber has chosen where to.
await WirePlumber sink_is_chosen

echo ready
wait "$pipewire" || true
