"""Captures that an internal build takes by itself when it sees a fault, and what a full disk and kill -9 leave of them."""

import json
import os
import pathlib
import signal
import subprocess
import sys
import unittest
from unittest import mock

import talreporting
from tal_harness import DaemonTest, PLAYBACK, run_program

ERROR, ENERGYLOG, ISSUE_DETECTOR = 11, 8, 7
IO, ERROR_TYPE = 7, 6
INTERNAL = {"device.toml": "InternalBuild = true\nHapticLeakCaptureOptIn = true\n"}

# A client of its own process: does what it is told, then stays until its input ends.
LEAKING_CLIENT = """
import sys, talreporting
client = talreporting.Client(sys.argv[1])
client.create_reporting_session(77)
client.start_reporting_session(77)
client.send_message({"Haptic_Active_Hardware_Time_Seconds": 9}, 4, 8, [77])
print("sent", flush=True)
sys.stdin.read()
"""


class Captures(DaemonTest):
    def setUp(self):
        self.root = pathlib.Path(self.make_root(self.addCleanup))
        self.captures = self.root / "log/Audio/Captures"

    def start(self, config=INTERNAL):
        # One log for each run, so that a line is of this one.
        log = f"stderr{len(list(self.root.glob('stderr*')))}.log"
        return self.start_daemon("--log-level", "info", root=self.root, config=config, log=log)

    def names(self):
        return sorted(os.listdir(self.captures)) if self.captures.exists() else []

    def whole(self):
        return [name for name in self.names() if not name.startswith(".")]

    def session(self, daemon, reporter, service):
        client = self.connect(daemon)
        client.create_reporting_session(reporter)
        client.set_service_type(reporter, talreporting.SERVICE_TYPES[service])
        client.start_reporting_session(reporter)
        return client

    def leak(self, daemon, key, reporter=7):
        client = self.session(daemon, reporter, "generic")
        client.send_message({key: 1}, PLAYBACK, ENERGYLOG, [reporter])
        return client

    def leak_system_sound(self, daemon):
        return self.leak(daemon, "System_Sound_Stuck_Time_Seconds")

    def test_a_quiet_alarm_opens_a_capture_that_its_stop_cancels(self):
        daemon = self.start()
        client = self.session(daemon, 7, "alarms")
        for number in range(3):
            client.send_message({"issue_type": "LowRMS", "number": number}, ERROR, ISSUE_DETECTOR, [7])
        opened = "Started Hound session for alarm Low RMS. sessionId="
        daemon.eventually(lambda: opened in daemon.log(), "a capture is opened")
        identifier = daemon.log().split(opened)[1].split()[0]
        self.assertIn("-alarms-IssueDetector", identifier)
        self.assertNotIn("cancelled capture", daemon.log())
        client.stop_reporting_session(7)
        self.assertIn(f"cancelled capture {identifier}", daemon.log())
        # The same in one breath: all of it may be one task of the daemon's.
        hasty = self.session(daemon, 8, "alarms")
        daemon.eventually(lambda: daemon.log().count("cancelled capture") == 1, "only one so far")
        hasty.send_raw(b"".join([
            *(talreporting.encode_frame([talreporting.SEND_MESSAGE, 0, {"issue_type": "LowRMS", "number": number}, ERROR,
                                         ISSUE_DETECTOR, [8]]) for number in range(3)),
            talreporting.encode_frame([talreporting.STOP, 0, 8])]))
        daemon.eventually(lambda: daemon.log().count("cancelled capture") == 2, "cancelled again")
        self.assertEqual(daemon.terminate(), 0)
        self.assertEqual(self.names(), [])

    def test_haptic_leaks_of_two_clients_make_one_capture_of_the_second(self):
        daemon = self.start()
        self.leak(daemon, "Haptic_Active_Hardware_Time_Seconds")
        other = subprocess.Popen([sys.executable, "-c", LEAKING_CLIENT, daemon.socket_path], stdin=subprocess.PIPE,
                                 stdout=subprocess.PIPE)
        self.addCleanup(other.wait)
        self.addCleanup(other.stdin.close)
        self.addCleanup(other.stdout.close)
        self.assertEqual(other.stdout.readline(), b"sent\n")
        daemon.eventually(self.whole, "there is a capture")
        (name,) = self.names()
        capture = self.captures / name
        payload = json.loads((capture / "payload.json").read_text())
        self.assertEqual(payload["PKParameters"]["org.vantle.EnergylogCore.PKSysLogFilterProcess"]["processIDs"],
                         [other.pid])
        processes = (capture / "processes.txt").read_text()
        self.assertIn(f"process {other.pid} ", processes)
        self.assertNotIn(f"process {os.getpid()} ", processes)
        self.assertIn("debug", (capture / "log.txt").read_text(), "lines that the log itself does not have")
        messages = [json.loads(line) for line in (capture / "messages.jsonl").read_text().splitlines()]
        self.assertEqual(messages[-1]["message"]["Haptic_Active_Hardware_Time_Seconds"], 9)
        for path, mode in ((self.captures, 0o750), (capture, 0o750), (capture / "log.txt", 0o640)):
            self.assertEqual(path.stat().st_mode & 0o7777, mode, path)
        daemon.eventually(lambda: f"sessionId={name} response" in daemon.log(), "the request is answered")

    def test_an_overload_is_captured_and_talctl_prints_it(self):
        daemon = self.start({**INTERNAL, "settings/org.vantle.talsys.talreporting.toml": "enable_flutter = true\n"})
        listed = run_program("talctl", "--root", str(self.root), "captures", "--json")
        self.assertEqual((listed.returncode, listed.stdout), (0, ""), "none as yet is no failure")
        self.session(daemon, 7, "generic").send_message(
            {"smallest_buffer_frame_size": 512, "text": "\x1b[2J\u202e"}, IO, ERROR_TYPE, [7])
        daemon.eventually(self.whole, "there is a capture")
        (name,) = self.whole()
        os.symlink("/etc/passwd", self.captures / name / "link.txt")
        os.symlink("/etc", self.captures / "20260101T000000Z-link")

        listed = run_program("talctl", "--root", str(self.root), "captures", "--json")
        (told,) = [json.loads(line) for line in listed.stdout.splitlines()]
        self.assertEqual((told["identifier"], told["kind"]), (name, "AudioOverloads"))
        self.assertEqual(told["bytes"], sum(file.lstat().st_size for file in (self.captures / name).iterdir()
                                            if not file.is_symlink()))
        table = run_program("talctl", "--root", str(self.root), "captures").stdout.splitlines()
        self.assertEqual(table[1].split()[:3], [name, "AudioOverloads", "AudioOverloads"])

        shown = run_program("talctl", "--root", str(self.root), "captures", "show", name)
        headings = [line[5:] for line in shown.stdout.splitlines() if line.startswith("==== ")]
        self.assertEqual([heading for heading in headings if heading != "trace.txt"],
                         ["signature.json", "payload.json", "processes.txt", "scheduler.txt", "system.txt", "log.txt"])
        self.assertIn("== /proc/stat", shown.stdout)
        for forbidden in ("\x1b", "\u202e", "root:"):
            self.assertNotIn(forbidden, shown.stdout)
        payload = run_program("talctl", "--root", str(self.root), "captures", "show", name, "--file", "payload.json")
        self.assertEqual(json.loads(payload.stdout)["text"], "\x1b[2J\u202e")
        for arguments in (["20260101T000000Z-link"], [".."], ["../.."], ["nothing"], [name, "--file", "link.txt"],
                          [name, "--file", "../x"]):
            refused = run_program("talctl", "--root", str(self.root), "captures", "show", *arguments)
            self.assertEqual((refused.returncode, refused.stdout), (1, ""), arguments)

    def test_a_customer_build_captures_nothing(self):
        daemon = self.start(config={"device.toml": "HapticLeakCaptureOptIn = true\n"})
        self.leak_system_sound(daemon)
        daemon.terminate()
        self.assertFalse(self.captures.exists())
        self.assertNotIn("ound session", daemon.log())

    def test_a_full_disk_leaves_no_half_capture_and_the_service_running(self):
        disk = self.root / "log"
        disk.mkdir()
        mount = subprocess.run(["mount", "-t", "tmpfs", "-o", "size=16k", "tmpfs", disk], capture_output=True)
        if mount.returncode != 0:
            self.skipTest("a file system can be mounted by root alone")
        self.addCleanup(subprocess.run, ["umount", "-l", disk], check=True)
        daemon = self.start()
        self.leak_system_sound(daemon)
        daemon.eventually(lambda: "reason=kHoundDiagErrorServiceUnavailable" in daemon.log(), "it is refused")
        self.assertEqual(self.names(), [])
        subprocess.run(["mount", "-o", "remount,size=16m", disk], check=True)
        self.leak(daemon, "Haptic_Active_Hardware_Time_Seconds", 8)
        self.leak(daemon, "Haptic_Active_Hardware_Time_Seconds", 9).send_message(
            {"Haptic_Active_Hardware_Time_Seconds": 2}, PLAYBACK, ENERGYLOG, [9])
        daemon.eventually(self.whole, "there is room again")

    def test_a_kill_in_mid_capture_leaves_no_half_one_under_its_name(self):
        tools = self.root / "tools"
        tools.mkdir()
        # The capture runs this tool; its parent is the daemon.
        (tools / "pw-dump").write_text("#!/bin/sh\nkill -9 $PPID\n")
        (tools / "pw-dump").chmod(0o755)
        with mock.patch.dict(os.environ, {"PATH": f"{tools}:{os.environ['PATH']}"}):
            daemon = self.start()
        self.leak_system_sound(daemon)
        self.assertEqual(daemon.wait(), -signal.SIGKILL)
        self.assertEqual(self.whole(), [])
        self.assertEqual(len(self.names()), 1, "it was killed in mid-capture")
        again = self.start()
        again.eventually(lambda: self.names() == [], "what was left is cleared away")
        self.leak_system_sound(again)
        again.eventually(lambda: "reason=kHoundDiagErrorRequestThrottled" in again.log(),
                         "the limits outlive the process")


if __name__ == "__main__":
    unittest.main()
