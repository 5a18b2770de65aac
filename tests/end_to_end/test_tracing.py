"""Performance traces for real: a program emits known signposts while a test session runs."""

import json
import os
import pathlib
import plistlib
import subprocess
import sys
import unittest

import talreporting
from tal_harness import BIN_DIR, PATIENCE_SECONDS, DaemonTest, run_program

LIBRARY = BIN_DIR.parent / "lib/libtalreporting.so"

# Emits pairs of known length, and tells how long each took by its own clock, as seen from outside the signposts.
EMITTER = """
import ctypes, json, os, sys, time
library = ctypes.CDLL(sys.argv[1])
def work(subsystem, name, milliseconds):
    begun = time.monotonic()
    library.talreporting_signpost_begin(subsystem, name)
    time.sleep(milliseconds / 1000)
    library.talreporting_signpost_end(subsystem, name)
    return (time.monotonic() - begun) * 1000
times = {"decode": [work(b"org.vantle.audio", b"decode", 20) for _ in range(20)],
         "mix": [work(b"org.vantle.talsys", b"mix", 50) for _ in range(3)]}
work(b"org.example", b"foreign", 1)
print(json.dumps({"times": times, "threads": len(os.listdir("/proc/self/task"))}))
"""

NOBODY = 65534
NOBODYS_CLIENT = """
import sys, talreporting
with talreporting.Client({socket!r}, timeout=120) as client:
    client.create_reporting_session(8)
    client.set_service_type(8, talreporting.SERVICE_TYPES["test"])
    client.set_configuration(8, {{"TalReportingSkeinPlistFilePath": {probes!r},
                                  "TalReportingSkeinOutputFileName": "out.pdj",
                                  "TalReportingSkeinOutputFileDirectory": {results!r}}})
    client.start_reporting_session(8)
    client.get_all_reporters()
    print("started", flush=True)
    sys.stdin.readline()
    client.stop_reporting_session(8)
"""


class Tracing(DaemonTest):
    config = {"device.toml": "InternalBuild = true\n"}

    def setUp(self):
        self.root = pathlib.Path(self.make_root(self.addCleanup)).resolve()
        self.probes = self.root / "probes.plist"
        self.write_probes([{"name": "beat", "kind": "count", "events": ["begin:decode", "talreporting:signpost_end",
                                                                       "lttng_ust_statedump:start"]},
                           {"name": "gap", "kind": "interval", "begin": "end:decode", "end": "begin:decode"},
                           {"name": "load", "kind": "cpu"}])

    def write_probes(self, probes):
        self.probes.write_bytes(plistlib.dumps(probes))

    def traced_session(self, meanwhile=lambda: None, **configuration):
        """A test session from start to stop; requests are carried out in order, so it is traced once one is answered."""
        client = self.connect()
        client.create_reporting_session(7)
        client.set_service_type(7, talreporting.SERVICE_TYPES["test"])
        client.set_configuration(7, {"TalReportingSkeinPlistFilePath": str(self.probes),
                                     "TalReportingSkeinOutputFileName": "out.pdj",
                                     "TalReportingSkeinOutputFileDirectory": str(self.root / "results"),
                                     **configuration})
        before = len(self.daemon.log())
        client.start_reporting_session(7)
        client.get_all_reporters()
        told = meanwhile()
        client.stop_reporting_session(7)
        client.close()
        return told, self.daemon.log()[before:]

    def emit(self, **environment):
        done = subprocess.run([sys.executable, "-c", EMITTER, str(LIBRARY)], capture_output=True, text=True, check=True,
                              timeout=PATIENCE_SECONDS, env={**os.environ, **environment,
                                                             "LTTNG_HOME": str(self.daemon.root / "run/lttng")})
        return json.loads(done.stdout)

    def test_signposts_of_a_program_are_counted_and_timed(self):
        for trace_type in ("sktrace", "sktrace_profile"):
            with self.subTest(trace_type):
                self.check_signposts(trace_type)

    def check_signposts(self, trace_type):
        told, log = self.traced_session(lambda: self.emit(TALREPORTING_SIGNPOSTS="1"),
                                        TalReportingTraceType=trace_type, TalReportingTestName="a known program",
                                        TalReportingPerfProcesses=["python3"])
        self.assertGreater(told["threads"], 1)
        results = self.root / "results/out.pdj"
        self.assertTrue(results.exists(), log)
        self.assertEqual(sorted(os.listdir(results.parent)), ["out.pdj"])
        data = json.loads(results.read_text())
        self.assertEqual((data["version"], data["name"], data["test_name"]), (4, "out.pdj", "a known program"))
        metrics = {metric["name"]: metric for metric in data["metrics"]}
        for name, times in told["times"].items():
            with self.subTest(name):
                total, average = metrics[f"{name} Total"], metrics[f"{name} AVG"]
                self.assertEqual(total["count"], len(times))
                self.assertAlmostEqual(total["value"], sum(times), delta=0.1 * sum(times))
                self.assertAlmostEqual(average["value"], sum(times) / len(times), delta=0.1 * sum(times) / len(times))
                self.assertAlmostEqual(total["maximum"], max(times), delta=0.1 * max(times))
                self.assertAlmostEqual(total["percentile_50"], sorted(times)[(len(times) - 1) // 2],
                                       delta=0.1 * max(times))
        self.assertNotIn("foreign Total", metrics)
        self.assertEqual(metrics["beat begin:decode"]["value"], 20)
        self.assertEqual(metrics["beat talreporting:signpost_end"]["value"], 24)
        other_providers = metrics["beat lttng_ust_statedump:start"]["value"]
        self.assertEqual(other_providers > 0, trace_type == "sktrace_profile", other_providers)
        self.assertEqual(metrics["gap Total"]["count"], 19)
        self.assertIn("skipping probe load: the trace has no scheduler events", log)

        shown = run_program("talctl", "perf", "show", str(results))
        self.assertEqual(shown.returncode, 0, shown.stderr)
        self.assertIn("decode Total", shown.stdout)

    def test_a_program_that_was_not_asked_to_gets_no_threads_and_leaves_nothing(self):
        told, _ = self.traced_session(lambda: self.emit(TALREPORTING_SIGNPOSTS="0"))
        self.assertEqual(told["threads"], 1)
        self.assertFalse((self.root / "results/out.pdj").exists(), "nothing was recorded, so there is no trace")

    def test_what_a_client_names_wrongly_is_one_line_and_no_file(self):
        emit = lambda: self.emit(TALREPORTING_SIGNPOSTS="1")
        (self.root / "link").symlink_to(self.root)
        for configuration, line in (
                ({"TalReportingSkeinOutputFileDirectory": "results"}, "can't create logging directory at results: "),
                ({"TalReportingSkeinOutputFileDirectory": str(self.root / "link/x")},
                 "can't create logging directory at "),
                ({"TalReportingSkeinOutputFileName": "../out.pdj"}, "is no plain file name: ../out.pdj")):
            with self.subTest(line):
                _, log = self.traced_session(emit, **configuration)
                self.assertEqual(log.count(line), 1, log)
        self.probes.write_text("no property list")
        _, log = self.traced_session(emit)
        self.assertEqual(log.count("failed to get SkeinProbes from "), 1, log)
        self.assertEqual([path for path in self.root.rglob("*.pdj")], [])

        self.probes.unlink()
        _, log = self.traced_session()
        self.assertEqual(log.count("is not a valid path"), 1, log)
        self.assertNotIn("Performance Trace", log)

    @unittest.skipUnless(os.geteuid() == 0, "only root can be another user's client")
    def test_a_client_reaches_no_further_than_its_own_rights(self):
        os.chmod(self.root, 0o755)
        os.chmod(self.probes, 0o600)
        before = len(self.daemon.log())
        self.session_of_nobody()
        self.assertIn("is not a valid path", self.daemon.log()[before:])

        os.chmod(self.probes, 0o644)
        before = len(self.daemon.log())
        self.session_of_nobody()
        self.assertIn("the client may not make results", self.daemon.log()[before:])
        self.assertFalse((self.root / "results").exists())

        (self.root / "results").mkdir()
        os.chown(self.root / "results", NOBODY, NOBODY)
        self.session_of_nobody()
        self.assertEqual((self.root / "results/out.pdj").stat().st_uid, NOBODY)

    def session_of_nobody(self):
        script = NOBODYS_CLIENT.format(socket=self.daemon.socket_path, probes=str(self.probes),
                                       results=str(self.root / "results"))
        client = subprocess.Popen([sys.executable, "-c", script], user=NOBODY, group=NOBODY, extra_groups=[],
                                  stdin=subprocess.PIPE, stdout=subprocess.PIPE, text=True)
        self.assertEqual(client.stdout.readline(), "started\n")
        self.emit(TALREPORTING_SIGNPOSTS="1")
        client.communicate("stop\n", timeout=PATIENCE_SECONDS)
        self.assertEqual(client.returncode, 0)


if __name__ == "__main__":
    unittest.main()
