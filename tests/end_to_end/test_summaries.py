"""What real streams on a real PipeWire amount to once they end: summaries, session files, and a report of them.

Like all of real streams' times, these are compared with a tolerance.
"""

import json
import os
import pathlib
import stat
import subprocess
import time
import unittest

from tal_harness import BIN_DIR, PATIENCE_SECONDS
from test_pipewire import PipeWireTest

# A stretch that is shorter than half a second is not summed up; these are long enough to be told apart as well.
STRETCH_SECONDS = 1.5
# What a summary's 32-bit floats leave of microseconds.
EXACTLY_SECONDS = 0.01


class SummariesTest(PipeWireTest):
    def start_playing(self, application="Radio", volume="0.4"):
        """A player that goes on until it is ended, and the message with which its stream began."""
        player = self.play("long", "--media-role", "Music", "--volume", volume, "-P",
                           f'{{ application.id="{application}" node.name="{application}" }}')
        (start,) = self.await_events("longformaudio.Playback.Start", HostApplicationDisplayID=application)
        return player, start

    def let_pass(self, event, seconds=STRETCH_SECONDS):
        self.eventually(lambda: time.time() > event["talreporting_timestamp"] + seconds, "a stretch is long enough")

    def end_and_sum_up(self, player, application="Radio"):
        """The stream's last message and its summaries."""
        player.end()

        def closing():
            return [event for event in self.closings("longformaudio.Playback.Stop")
                    if event["HostApplicationDisplayID"] == application]

        self.eventually(closing, "the stream is closed")
        self.await_events("longformaudio.Session_Generic.Summary", HostApplicationDisplayID=application)
        (stop,) = closing()
        return stop, self.daemon.events("org.vantle.longformaudio.Volume.Summary",
                                        HostApplicationDisplayID=application)

    def assert_lasted(self, summary, begin, end):
        self.assertAlmostEqual(summary["play_seconds"], end["talreporting_timestamp"] - begin["talreporting_timestamp"],
                               delta=EXACTLY_SECONDS)


class Stretches(SummariesTest):
    def test_a_change_of_volume_half_way_yields_two_that_add_up(self):
        player, start = self.start_playing()
        self.let_pass(start)
        self.tool("pw-cli", "set-param", self.node(node_name="Radio")["object.id"], "Props", "{ volume: 0.8 }")
        (change,) = self.await_events("longformaudio.Volume.Generic")
        self.let_pass(change)
        stop, (first, second) = self.end_and_sum_up(player)
        self.assert_has(first, RvSessionVolume=0.4, RvSessionVolumeBucketed="0.375", msgidx=1, msgcnt=2)
        self.assert_has(second, RvSessionVolume=0.8, RvSessionVolumeBucketed="0.8125", msgidx=2, msgcnt=2)
        self.assert_lasted(first, start, change)
        self.assert_lasted(second, change, stop)

    def test_a_move_to_another_device_yields_one_for_each(self):
        player, start = self.start_playing()
        self.tool("pw-cli", "create-node", "adapter",
                  '{ factory.name=support.null-audio-sink node.name=second-sink node.description="Second Sink" '
                  "media.class=Audio/Sink object.linger=true audio.position=[FL FR] }")
        self.let_pass(start)
        self.tool("pw-metadata", self.node(node_name="Radio")["object.id"], "target.object",
                  self.node(node_name="second-sink")["object.serial"])
        (change,) = self.await_events("longformaudio.RouteChange.Generic", active_devices="Second Sink")
        self.let_pass(change)
        stop, (first, second) = self.end_and_sum_up(player)
        self.assert_has(first, active_devices="Private Sink")
        self.assert_has(second, active_devices="Second Sink")
        self.assert_lasted(first, start, change)
        self.assert_lasted(second, change, stop)

    def test_a_pause_is_not_counted(self):
        player, start = self.start_playing()
        self.let_pass(start)
        for channel in ("FL", "FR"):
            self.tool("pw-link", "-d", f"Radio:output_{channel}", f"private-sink:playback_{channel}")
        (pause,) = self.await_events("longformaudio.Playback.Stop", stretch_index=1)
        self.let_pass(pause)
        for channel in ("FL", "FR"):
            self.tool("pw-link", f"Radio:output_{channel}", f"private-sink:playback_{channel}")
        (again,) = self.await_events("longformaudio.Playback.Start", stretch_index=2)
        self.let_pass(again)
        stop, (first, second) = self.end_and_sum_up(player)
        self.assert_lasted(first, start, pause)
        self.assert_lasted(second, again, stop)
        (session,) = self.daemon.events("org.vantle.longformaudio.Session_Generic.Summary")
        self.assertGreater(session["total_active_time"], first["play_seconds"] + second["play_seconds"] + STRETCH_SECONDS)

    def test_two_applications_at_once_are_told_apart_and_reported(self):
        radio, radio_start = self.start_playing("Radio", "0.25")
        music, music_start = self.start_playing("Music", "1.0")
        self.let_pass(music_start)
        radio_stop, (of_radio,) = self.end_and_sum_up(radio, "Radio")
        music_stop, (of_music,) = self.end_and_sum_up(music, "Music")
        self.assert_has(of_radio, RvSessionVolume=0.25, msgidx=1, msgcnt=1)
        self.assert_has(of_music, RvSessionVolume=1.0, msgidx=1, msgcnt=1)
        self.assert_lasted(of_radio, radio_start, radio_stop)
        self.assert_lasted(of_music, music_start, music_stop)
        self.assertLess(music_start["talreporting_timestamp"], radio_stop["talreporting_timestamp"], "not at once")

        report = subprocess.run([BIN_DIR / "talctl", "--root", self.root, "report"], check=True, text=True,
                                capture_output=True, timeout=PATIENCE_SECONDS).stdout
        for application, summary, volume in (("Radio", of_radio, 25), ("Music", of_music, 100)):
            self.assertRegex(report, rf"(?m)^{application} +longformaudio +{summary['play_seconds']:.1f} s +{volume} % ")


class Sessions(SummariesTest):
    own_config = {"device.toml": "InternalBuild = true\n"}

    def test_a_session_leaves_a_file_and_the_state_of_the_machine(self):
        player, start = self.start_playing()
        self.let_pass(start)
        _, (summary,) = self.end_and_sum_up(player)

        (session,) = self.daemon.events("org.vantle.longformaudio.Session_Generic.Summary")
        self.assert_has(session, HostApplicationDisplayID="Radio", summaryServiceName="longformaudio", active_count=1,
                        singleMessageSession=False,
                        # On a busy machine there can be some.
                        overload_count=len(self.daemon.events("org.vantle.longformaudio.IO.Error")))
        self.assertIn(session["thermal_state"], ("Nominal", "Fair", "Serious", "Critical"))
        self.assertIn(session["low_power_enabled"], (0, 1))
        self.assertAlmostEqual(session["vmInfo_phys_footprint_MiB"], self.footprint_bytes() / 2**20, delta=8)
        self.assertAlmostEqual(session["load_avg_15_min"], os.getloadavg()[2], delta=1)

        folder = self.root / "log/Audio/Reporting"
        self.assertEqual(stat.S_IMODE(folder.stat().st_mode), 0o777)
        (file,) = folder.iterdir()
        self.assertIn("Radio", file.name)
        entries = {}
        for entry in json.loads(file.read_text()):
            entries.update(entry)
        for name in ("Playback_Start_1", "Playback_Stop_1", "Volume_Summary_1"):
            self.assertIn(name, entries)
        self.assertEqual(entries["Volume_Summary_1"]["play_seconds"], summary["play_seconds"])
        self.assertEqual(entries["Playback_Start_1"]["talreporting_timestamp"], start["talreporting_timestamp"])

    def footprint_bytes(self):
        """The memory that is the daemon's own, and its share of what it has with others."""
        rollup = pathlib.Path(f"/proc/{self.daemon.process.pid}/smaps_rollup").read_text()
        return int(rollup.split("Pss:")[1].split()[0]) * 1024


if __name__ == "__main__":
    unittest.main()
