"""What an internal build does for engineers beside its events."""

import json
import shutil
import subprocess
import unittest

from tal_harness import DaemonTest, PLAYBACK

IO, ERROR_TYPE = 7, 6
MEMORY_LOG = 19
WORKER_SETTINGS = "settings/org.vantle.talsys.talreporting.toml"
PROMPTS = {"device.toml": "InternalBuild = true\n", WORKER_SETTINGS: "ParleyInvalidXyBackOffSeconds = 3600.0\n"}
OVERLOAD = {"smallest_buffer_frame_size": 512, "io_cycle": 9}


def send_invalid_coordinates(client, reporter):
    """What calls for a prompt: a message that arms the worker, and one of invalid coordinates six seconds later."""
    for seconds, key in ((1, "ordinary"), (7, "vmox_invalid_x")):
        client.send_message({"talreporting_timestamp": 1.8e9 + seconds, key: 1}, PLAYBACK, 0, [reporter])


class InternalBuild(DaemonTest):
    config = {"device.toml": "InternalBuild = true\n",
              WORKER_SETTINGS: "enable_flutter = true\nio_buffer_size = 256\nwait_time = 1000.0\n"}

    def started(self, reporter, daemon=None):
        client = self.connect(daemon)
        client.create_reporting_session(reporter)
        client.start_reporting_session(reporter)
        return client

    def test_an_overload_asks_for_a_hang_trace_and_announces_it(self):
        client = self.started(7)
        announced = self.daemon.root / "run/notify/org.vantle.talsys.dropped-flutter"
        client.send_message({**OVERLOAD, "smallest_buffer_frame_size": 255}, IO, ERROR_TYPE, [7])
        client.send_message(OVERLOAD, PLAYBACK, ERROR_TYPE, [7])
        self.assertFalse(announced.exists())
        client.send_message(OVERLOAD, IO, ERROR_TYPE, [7])
        self.assertEqual(announced.read_text(), "0")

    def test_invalid_coordinates_leave_one_draft_in_the_back_off_time(self):
        root = self.make_root(self.addCleanup)
        for reporter in (7, 8):  # the second time a daemon that has been started anew
            daemon = self.start_daemon(root=root, config=PROMPTS,
                                       environment={"DBUS_SESSION_BUS_ADDRESS": "unix:path=/nowhere"})
            send_invalid_coordinates(self.started(reporter, daemon=daemon), reporter)
            self.assertEqual(daemon.terminate(), 0)
        drafts = sorted((daemon.root / "log/Audio/Drafts").iterdir())
        self.assertEqual([draft.suffix for draft in drafts], [".json", ".md"])
        draft = json.loads(drafts[0].read_text())
        self.assertEqual(draft["title"], "Invalid x/y coordinates during a Parley call (TTK)")
        self.assertEqual(draft["component"]["identifier"], 1084682)
        self.assertIn(f"`{draft['process_name']}`", drafts[1].read_text())
        self.assertEqual([draft.stat().st_mode & 0o007 for draft in drafts], [0, 0])

    @unittest.skipUnless(shutil.which("dbus-daemon") and shutil.which("busctl"), "no dbus-daemon or no busctl")
    def test_a_draft_is_shown_on_the_desktop(self):
        root = self.make_root(self.addCleanup)
        address = self.start_bus(root)
        monitor = self.start_process("busctl", f"--address={address}", "monitor", "--json=short",
                                     stdout=subprocess.PIPE, stderr=subprocess.PIPE)
        while b"Monitoring" not in monitor.stderr.readline():
            self.assertIsNone(monitor.poll())
        daemon = self.start_daemon(root=root, config=PROMPTS, environment={"DBUS_SESSION_BUS_ADDRESS": address})
        send_invalid_coordinates(self.started(7, daemon=daemon), 7)
        calls = (json.loads(line) for line in monitor.stdout)
        arguments = next(call["payload"]["data"] for call in calls if call.get("member") == "Notify")
        self.assertEqual((arguments[0], arguments[3]),
                         ("talreportingd", "Invalid x/y coordinates during a Parley call (TTK)"))
        self.assertIn("log/Audio/Drafts/", arguments[4])
        self.assertEqual(daemon.terminate(), 0)

    def test_memory_is_logged_for_a_message_without_a_session(self):
        client = self.connect()
        for number in (1, 2):  # the second comes too soon
            client.send_message({"n": number}, PLAYBACK, MEMORY_LOG)
        self.daemon.settle()
        lines = [line for line in self.daemon.log().splitlines() if "wiredlog:" in line]
        self.assertEqual([line.split("wiredlog: ")[1] for line in lines if "captured" in line].count(
            "request talresources captured"), 1)
        blocks = [line for line in lines if "WIRED LOG BLOCK" in line]
        self.assertTrue(blocks and all(" error " in line for line in lines))
        process = self.daemon.process.pid
        (daemon_block,) = (block for block in blocks if f"wiredlog: RESOURCE talreportingd ({process})" in block)
        self.assertIn(" cpu_time ", daemon_block)
        self.assertTrue(any("MemTotal" in block or "slabinfo" in block for block in blocks))


if __name__ == "__main__":
    unittest.main()
