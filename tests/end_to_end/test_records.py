"""What leaves the daemon besides events: metric records that protocol-buffers tools decode, and the power log."""

import json
import pathlib
import re
import shutil
import signal
import subprocess
import unittest

import talreporting
from tal_harness import PATIENCE_SECONDS, PLAYBACK, DaemonTest

PROTO = pathlib.Path(__file__).parents[2] / "docs/plumemetrics.proto"
AUDIO_ISSUE_DETECTED = 0x5B0003
ISSUE_DETECTOR, ENERGYLOG = 7, 8


def protoc(verb, data):
    """The record as protoc reads or writes it."""
    done = subprocess.run(["protoc", f"--{verb}=plumemetrics.AudioIssueDetected", f"--proto_path={PROTO.parent}",
                           PROTO.name], input=data, capture_output=True, timeout=PATIENCE_SECONDS, check=False)
    assert done.returncode == 0, done.stderr
    return done.stdout


class Records(DaemonTest):
    def records(self):
        self.daemon.settle()
        return self.daemon.rows("SELECT metric, record FROM metrics ORDER BY id")

    @unittest.skipUnless(shutil.which("protoc"), "no protoc")
    def test_protoc_decodes_the_metric_record_of_an_issue(self):
        client = self.connect()
        issue = {"issue_type": "overload", "node": "Mixer ♪", "rtaid_client": "player", "any_channel_silence_seconds": -3}
        before = len(self.records())
        client.send_message(issue, PLAYBACK, ISSUE_DETECTOR)  # no session: the service's own takes it
        client.send_message({"node": "alone"}, PLAYBACK, ISSUE_DETECTOR)
        (metric, full), (_, partial) = self.records()[before:]
        self.assertEqual(metric, AUDIO_ISSUE_DETECTED)
        text = protoc("decode", full).decode()
        self.assertEqual(text.splitlines(), ["duration: -3", 'issuetype: "overload"',
                                             r'node: "Mixer \342\231\252"', 'rtaidclient: "player"'])
        self.assertEqual(protoc("encode", text.encode()), full)
        self.assertEqual(re.findall(r'(\w+): "?([^"\n]*)', protoc("decode", partial).decode()),
                         [("duration", "0"), ("issuetype", ""), ("node", "alone"), ("rtaidclient", "")])
        self.assertIn("Failed to get issue_type for AudioIssueDetected", self.daemon.log())

    def test_acknowledged_records_survive_kill_9(self):
        daemon = self.start_daemon()
        client = self.connect(daemon, durable=True)
        for number in range(20):
            client.send_message({"any_channel_silence_seconds": number}, PLAYBACK, ISSUE_DETECTOR)
            client.send_message({"EngineOnTime": number}, PLAYBACK, ENERGYLOG)
        self.assertEqual(daemon.kill(), -signal.SIGKILL)
        records = [record for (record,) in daemon.rows("SELECT record FROM metrics ORDER BY id")]
        self.assertEqual([record[1] for record in records], list(range(20)))
        durations = daemon.rows("SELECT class, name, payload ->> '$.EngineOnDuration' FROM energylog ORDER BY id")
        self.assertEqual(durations, [(28, "Vidra_Haptics_EngineOnDuration", number) for number in range(20)])

    def test_the_power_log_names_the_application(self):
        client = self.connect()
        client.create_reporting_session(7)
        client.set_service_type(7, talreporting.SERVICE_TYPES["haptics"])
        client.set_configuration(7, {"HostApplicationDisplayID": "game"})
        client.send_message({"EngineOnTime": 1.5, "EngineState": "EngineOn", "talreporting_timestamp": 2e9,
                             "Haptic_Active_Hardware_Time_Seconds": 2}, PLAYBACK, ENERGYLOG, [7])
        self.daemon.settle()
        rows = self.daemon.rows("SELECT name, payload FROM energylog ORDER BY id")
        common = {"ApplicationName": "game", "TimestampEnd": 2e9}
        self.assertEqual([(name, json.loads(payload)) for name, payload in rows],
                         [("Vidra_Haptics_EngineOnDuration", {"EngineOnDuration": 1.5, **common}),
                          ("Vidra_Haptics_ClientStatus", {"Status": 1, **common}),
                          ("LeakedHapticsSessionInfo", {"Haptic_Active_Hardware_Time_Seconds": 2})])


if __name__ == "__main__":
    unittest.main()
