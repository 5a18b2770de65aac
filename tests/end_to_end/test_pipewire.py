"""Real audio streams on a real PipeWire become stored events: who played what, where, how loud and when.

The times of real streams are compared with a tolerance; this is the one place that does so.
"""

import contextlib
import json
import os
import pathlib
import select
import shutil
import signal
import subprocess
import tempfile
import time
import unittest

from tal_harness import BIN_DIR, PATIENCE_SECONDS, DaemonTest

PRIVATE_PIPEWIRE = pathlib.Path(__file__).parents[2] / "scripts/lib/private-pipewire.sh"
PROGRAMS = ["dbus-daemon", "pipewire", "wireplumber", "pw-play", "pw-record", "pw-cli", "pw-dump", "pw-metadata", "sox"]
# Starting and stopping a stream takes PipeWire some turns of its graph, and longer on a busy machine.
TOLERANCE_SECONDS = 1.5
LOOK_AGAIN_SECONDS = 0.05
# Longer than any case: it is ended by the case.
LONG_SECONDS = PATIENCE_SECONDS


class Program:
    """A process that ends with the test, whatever happens; its output is kept for failures."""

    def __init__(self, test, *command, env=None):
        self.output = tempfile.TemporaryFile("w+")
        self.process = subprocess.Popen([str(word) for word in command], env=env, stdin=subprocess.DEVNULL,
                                        stdout=subprocess.PIPE, stderr=self.output, text=True)
        test.addCleanup(self.clean_up)

    def await_line(self, text):
        ready, _, _ = select.select([self.process.stdout], [], [], PATIENCE_SECONDS)
        line = self.process.stdout.readline() if ready else ""
        if text not in line:
            raise AssertionError(f"{self.process.args[0]} did not say {text!r}: {line!r}\n{self.errors()}")

    def errors(self):
        self.output.seek(0)
        return self.output.read()

    def end(self, number=signal.SIGTERM):
        self.process.send_signal(number)
        return self.process.wait(PATIENCE_SECONDS)

    def clean_up(self):
        if self.process.poll() is None:
            self.process.send_signal(signal.SIGCONT)
            try:
                self.end()
            except subprocess.TimeoutExpired:
                self.process.kill()
                self.process.wait()
        self.process.stdout.close()
        self.output.close()


@unittest.skipUnless(all(map(shutil.which, PROGRAMS)), f"needs {', '.join(PROGRAMS)}")
class PipeWireTest(DaemonTest):
    """Each case has a daemon, a PipeWire and a reporter of its own."""

    own_config = {}  # files of that daemon's config directory

    @classmethod
    def setUpClass(cls):
        cls.sounds = pathlib.Path(tempfile.mkdtemp(prefix="tal-sounds-"))
        cls.addClassCleanup(shutil.rmtree, cls.sounds)
        for name, seconds in (("short", 4), ("long", LONG_SECONDS)):
            subprocess.run(["sox", "-n", "-r", "44100", "-c", "2", "-b", "16", cls.sounds / f"{name}.wav",
                            "synth", str(seconds), "sine", "440", "vol", "0.1"], check=True)

    def setUp(self):
        self.root = pathlib.Path(self.make_root(self.addCleanup))
        self.daemon = self.start_daemon(root=self.root, config=self.own_config)
        self.runtime = self.root / "pipewire"
        self.environment = {**os.environ, "PIPEWIRE_RUNTIME_DIR": str(self.runtime)}
        self.environment.pop("PIPEWIRE_REMOTE", None)
        self.start_pipewire()
        self.reporter = Program(self, BIN_DIR / "tal-pipewire-reporter", "--root", self.root, env=self.environment)
        self.await_said("follows", 1)

    def start_pipewire(self):
        self.pipewire = Program(self, PRIVATE_PIPEWIRE, self.runtime)
        self.pipewire.await_line("ready")

    def eventually(self, condition, what):
        """Looks again until the condition holds, or the reporter has ended."""
        deadline = time.monotonic() + PATIENCE_SECONDS
        while not condition():
            with contextlib.suppress(subprocess.TimeoutExpired):
                self.reporter.process.wait(LOOK_AGAIN_SECONDS)
                self.fail(f"the reporter has ended before {what}:\n{self.reporter.errors()}")
            if time.monotonic() > deadline:
                self.fail(f"never came true: {what}\n{self.state()}")

    def state(self):
        """What a failure is understood from."""
        events = self.daemon.rows("SELECT recorded_at, name, payload FROM events WHERE name LIKE 'org.vantle.talsys.%'")
        logs = [path.read_text(errors="replace")[-2000:] for path in sorted(self.runtime.glob("*.log"))]
        graph = subprocess.run(["pw-link", "-l"], env=self.environment, text=True, capture_output=True,
                               timeout=PATIENCE_SECONDS)
        return "\n".join([self.reporter.errors(), *map(str, events[-20:]), *logs, graph.stdout, graph.stderr])

    def await_said(self, text, times):
        self.eventually(lambda: self.reporter.errors().count(text) >= times, f"the reporter says {text!r}")

    def tool(self, *command):
        return subprocess.run([str(word) for word in command], env=self.environment, check=True, text=True,
                              capture_output=True, timeout=PATIENCE_SECONDS).stdout

    def play(self, sound, *options):
        return Program(self, "pw-play", *options, self.sounds / f"{sound}.wav", env=self.environment)

    def play_until_started(self, starts=1):
        player = self.play("long", "--media-role", "Music", "--volume", "0.4")
        self.await_events("longformaudio.Playback.Start", starts)
        return player

    def await_events(self, name, count=1, **fields):
        """The payloads of the first `count` events of the name that have these fields."""
        full_name = f"org.vantle.{name}"
        self.eventually(lambda: len(self.daemon.events(full_name, **fields)) >= count,
                        f"{count} events {name} {fields}")
        return self.daemon.events(full_name, **fields)

    def await_closing(self, name):
        """The one message that closes the only stream."""
        self.eventually(lambda: self.closings(name), f"{name} with session_duration")
        (closing,) = self.closings(name)
        return closing

    def closings(self, name):
        return [event for event in self.daemon.events(f"org.vantle.{name}") if "session_duration" in event]

    def node(self, **properties):
        """The properties of the node that has these."""
        for thing in json.loads(self.tool("pw-dump")):
            found = (thing.get("info") or {}).get("props", {})
            if thing["type"].endswith(":Node") and all(found.get(key.replace("_", ".")) == value
                                                       for key, value in properties.items()):
                return found
        raise AssertionError(f"no node {properties}")

    def assert_near(self, value, expected):
        self.assertAlmostEqual(value, expected, delta=TOLERANCE_SECONDS)

    def assert_has(self, event, **fields):
        self.assertEqual({key: event.get(key) for key in fields}, fields)


class Streams(PipeWireTest):
    def test_a_played_file_is_reported_from_start_to_stop(self):
        begin = time.time()
        player = self.play("short", "--media-role", "Music", "--volume", "0.4")
        self.eventually(lambda: player.process.poll() is not None, "the player ends")
        end = time.time()
        self.assertEqual(player.process.returncode, 0, player.errors())
        stop = self.await_closing("longformaudio.Playback.Stop")
        (start,) = self.daemon.events("org.vantle.longformaudio.Playback.Start")

        facts = dict(HostApplicationDisplayID="pw-cat", RvSessionVolume=0.4, active_devices="Private Sink",
                     session_selected_format="S16LE 44100 Hz", mFormatID="raw", mChannelsPerFrame=2,
                     stretch_index=1)
        self.assert_has(start, session_output_running=True, audiotag="PlaybackStart", **facts)
        self.assert_has(stop, session_output_running=False, audiotag="PlaybackStop", **facts)
        self.assert_near(start["talreporting_timestamp"], begin)
        self.assertGreaterEqual(start["talreporting_timestamp"], begin)
        self.assert_near(stop["talreporting_timestamp"], end)
        self.assert_near(stop["talreporting_timestamp"] - start["talreporting_timestamp"], 4)
        self.assert_near(stop["session_duration"], 4)
        (summary,) = self.await_events("longformaudio.Volume.Summary")
        self.assert_has(summary, HostApplicationDisplayID="pw-cat", RvSessionVolume=0.4, RvSessionVolumeBucketed="0.375",
                        active_devices="Private Sink", session_selected_format="S16LE 44100 Hz", mFormatID="raw",
                        mChannelsPerFrame=2, msgidx=1, msgcnt=1)
        self.assertAlmostEqual(summary["play_seconds"],
                               stop["talreporting_timestamp"] - start["talreporting_timestamp"], places=3)
        # The same under the general names, and nothing that did not happen.
        self.assertEqual(self.daemon.events("org.vantle.talsys.Playback.Start"), [start])
        for name in ("Volume.Generic", "RouteChange.Generic", "Record.Start"):
            self.assertEqual(self.daemon.events(f"org.vantle.talsys.{name}"), [], name)

    def test_the_service_follows_the_role(self):
        for role, service in (("Notification", "systemsounds"), ("Phone", "telephony"), ("Game", "nonlongformaudio")):
            with self.subTest(role=role):
                player = self.play("long", "--media-role", role)
                self.await_events(f"{service}.Playback.Start")
                player.end()
                self.await_closing(f"{service}.Playback.Stop")

    def test_a_recording_is_reported_from_start_to_stop(self):
        recorder = Program(self, "pw-record", "--media-role", "Communication", "--rate", "48000", "--channels", "1",
                           "-P", "{ stream.capture.sink=true }", self.root / "recording.wav", env=self.environment)
        (start,) = self.await_events("telephony.Record.Start")
        player = self.play("short")  # something to record, and long enough for a summary
        self.eventually(lambda: player.process.poll() is not None, "the player ends")
        recorder.end(signal.SIGINT)
        stop = self.await_closing("telephony.Record.Stop")
        facts = dict(HostApplicationDisplayID="pw-cat", active_devices="Private Sink",
                     session_selected_format="S16LE 48000 Hz", mFormatID="raw", mChannelsPerFrame=1)
        self.assert_has(start, session_input_running=True, **facts)
        self.assert_has(stop, session_input_running=False, **facts)
        self.assertNotIn("RvSessionVolume", start)
        (summary,) = self.await_events("telephony.Input.Summary")
        self.assert_has(summary, HostApplicationDisplayID="pw-cat", active_devices="Private Sink")
        self.assertAlmostEqual(summary["inputrunning_seconds"],
                               stop["talreporting_timestamp"] - start["talreporting_timestamp"], places=3)

    def test_a_change_of_volume_of_stream_or_sink_is_reported(self):
        self.play_until_started()
        stream = self.node(node_name="pw-play")["object.id"]
        sink = self.node(node_name="private-sink")["object.id"]
        changes = ((stream, "{ volume: 0.5 }", 0.5),
                   (sink, "{ channelVolumes: [ 0.25, 0.75 ] }", 0.25),
                   (sink, "{ mute: true }", 0.0))
        for count, (node, properties, gain) in enumerate(changes, 1):
            self.tool("pw-cli", "set-param", node, "Props", properties)
            events = self.await_events("longformaudio.Volume.Generic", count)
            self.assertEqual(events[-1]["RvSessionVolume"], gain, properties)

    def test_a_move_to_another_sink_is_reported(self):
        player = self.play_until_started()
        self.tool("pw-cli", "create-node", "adapter",
                  '{ factory.name=support.null-audio-sink node.name=second-sink node.description="Second Sink" '
                  "media.class=Audio/Sink object.linger=true audio.position=[FL FR] }")
        second = self.node(node_name="second-sink")
        self.tool("pw-metadata", self.node(node_name="pw-play")["object.id"], "target.object",
                  second["object.serial"])
        self.await_events("longformaudio.RouteChange.Generic", active_devices="Second Sink")
        player.end()
        self.assertEqual(self.await_closing("longformaudio.Playback.Stop")["active_devices"], "Second Sink")

    def test_a_stream_that_is_cut_off_and_connected_again_has_two_stretches(self):
        player = self.play_until_started()
        for channel in ("FL", "FR"):
            self.tool("pw-link", "-d", f"pw-play:output_{channel}", f"private-sink:playback_{channel}")
        (stop,) = self.await_events("longformaudio.Playback.Stop", stretch_index=1)
        self.assertNotIn("session_duration", stop)
        for channel in ("FL", "FR"):
            self.tool("pw-link", f"pw-play:output_{channel}", f"private-sink:playback_{channel}")
        self.await_events("longformaudio.Playback.Start", stretch_index=2)
        player.end()
        self.assertEqual(self.await_closing("longformaudio.Playback.Stop")["stretch_index"], 2)

    def test_an_overload_is_reported_once_per_episode(self):
        player = self.play_until_started()
        player.process.send_signal(signal.SIGSTOP)
        (error,) = self.await_events("longformaudio.IO.Error")
        player.process.send_signal(signal.SIGCONT)
        self.assert_has(error, issue_type="overload")
        self.assertGreater(error["smallest_buffer_frame_size"], 0)
        self.assertGreater(error["io_cycle"], 0)
        player.end()
        stop = self.await_closing("longformaudio.Playback.Stop")
        self.assertEqual(stop["xrun_episodes"], 1)
        self.assertGreater(stop["xrun_starved_seconds"], 0)


class Restarts(PipeWireTest):
    def test_the_end_of_pipewire_closes_the_stream_and_the_next_one_is_followed(self):
        self.play_until_started()
        self.assertEqual(self.pipewire.end(), 0)
        self.await_closing("longformaudio.Playback.Stop")
        self.start_pipewire()
        self.await_said("follows", 2)
        self.play_until_started(starts=2)

    def test_a_daemon_that_comes_back_learns_what_plays(self):
        player = self.play_until_started()
        (start,) = self.daemon.events("org.vantle.longformaudio.Playback.Start")
        self.assertEqual(self.daemon.terminate(), 0)
        self.daemon = self.start_daemon(root=self.root)
        _, repeated = self.await_events("longformaudio.Playback.Start", 2)
        self.assertEqual(repeated, start, "dated back, so that no playing time is lost")
        player.end()
        self.await_closing("longformaudio.Playback.Stop")

    def test_a_stream_that_ends_while_the_daemon_is_away_is_reported_whole(self):
        player = self.play_until_started()
        self.assertEqual(self.daemon.terminate(), 0)
        self.await_said("the daemon is gone", 1)
        player.end()
        self.daemon = self.start_daemon(root=self.root)
        self.await_closing("longformaudio.Playback.Stop")
        self.assertEqual(len(self.daemon.events("org.vantle.longformaudio.Playback.Start")), 2)

    def test_the_reporter_closes_its_streams_when_it_is_ended(self):
        for number in (signal.SIGTERM, signal.SIGINT):
            with self.subTest(signal=number):
                count = len(self.closings("longformaudio.Playback.Stop"))
                player = self.play_until_started(starts=count + 1)
                self.assertEqual(self.reporter.end(number), 0, self.reporter.errors())
                self.assertEqual(len(self.closings("longformaudio.Playback.Stop")), count + 1)
                player.end()
                self.reporter = Program(self, BIN_DIR / "tal-pipewire-reporter", "--root", self.root,
                                        env=self.environment)
                self.await_said("follows", 1)


class Usage(unittest.TestCase):
    def test_wrong_usage_is_told_in_one_line(self):
        for arguments in (["--nonsense"], ["--root", "/a", "--socket", "/b"]):
            run = subprocess.run([BIN_DIR / "tal-pipewire-reporter", *arguments], capture_output=True, text=True,
                                 timeout=PATIENCE_SECONDS)
            self.assertEqual(run.returncode, 2, arguments)
            self.assertNotEqual(run.stderr, "")


if __name__ == "__main__":
    unittest.main()
