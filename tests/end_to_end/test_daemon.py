"""The daemon as an administrator meets it: command line, log, settings, retention."""

import os
import re
import socket
import subprocess
import tempfile
import unittest

import talreporting
from tal_harness import (ANALYTICS_SETTINGS, BIN_DIR, GENERIC, PATIENCE_SECONDS, PLAYBACK, START, STOP, STORE_SETTINGS,
                         DaemonTest, run_program)

LINE = re.compile(r"\d{4}-\d\d-\d\dT\d\d:\d\d:\d\d\.\d{6}Z tal\w+ (default|info   |debug  |error  ) "
                  r"(?=[ \w]{25,}:) *\w+:(?=.{5} )\d+ * \S.*")

class CommandLine(unittest.TestCase):
    def test_help_and_version(self):
        run = run_program("talreportingd", "--help")
        self.assertEqual((run.returncode, run.stderr), (0, ""))
        for option in "root host-root config-dir state-dir runtime-dir log-dir log-level log-to version help".split():
            self.assertIn(f"--{option}", run.stdout)
        run = run_program("talreportingd", "--version")
        self.assertRegex(run.stdout, r"^talreportingd \d+\.\d+\.\d+\n$")
        self.assertEqual(run.returncode, 0)

    def test_wrong_use_is_refused_with_a_line(self):
        for arguments in (["--no-such-option"], ["--log-level", "loud"], ["--log-to", "printer"], ["stray"],
                          ["--root", "/dev/null/x"]):
            with self.subTest(arguments):
                run = run_program("talreportingd", *arguments)
                self.assertNotIn(run.returncode, (0, -11, -6))
                self.assertRegex(run.stderr, r"\S")


class Log(DaemonTest):
    def life(self, daemon):
        client = self.connect(daemon)
        client.create_reporting_session(7)
        client.set_configuration(7, {"HostApplicationDisplayID": "evil\n2026-01-31T14:45:02Z \x1b[31m\r\x00\x7f"})
        client.start_reporting_session(7)
        client.send_message({"te\nxt": "a\nb\x1b"}, PLAYBACK, START, [7])
        client.stop_reporting_session(7)
        client.close()
        uptime = "org.vantle.talsys.talreportingclientuptime"
        daemon.eventually(lambda: daemon.events(uptime), "the client is known to have left")
        self.assertEqual(daemon.terminate(), 0)
        return daemon.log()

    def test_levels_and_format(self):
        expected = {"default": {"default"}, "info": {"default", "info"}, "debug": {"default", "info", "debug"},
                    "error": {"error"}}
        for level, levels in expected.items():
            with self.subTest(level):
                log = self.life(self.start_daemon("--log-level", level))
                for line in log.splitlines():
                    self.assertRegex(line, "^" + LINE.pattern + "$")
                printed = {LINE.match(line)[1].strip() for line in log.splitlines()}
                self.assertEqual(printed - {"error"}, levels - {"error"})
                self.assertNotRegex(log, r"[\x00-\x09\x0b-\x1f\x7f]", "what a client sent is escaped")

    def test_the_words_of_the_service(self):
        log = self.life(self.start_daemon("--log-level", "debug"))
        self.assertRegex(log, r"(?m)^\S+ talrs default       TalReportingService:\d+ +newConnection: ")
        for text in ("new client with pid", "session created for reporter 7", "starting session for reporter 7",
                     "1 active reporting session(s) ", "ending session. reporterID=7", "stopping 7",
                     "invalidationHandler: connection exited process=", "removing ", "destroying service"):
            self.assertIn(text, log)


class Wanted(DaemonTest):
    def send_all(self, daemon, client, case):
        for category, type_ in ((PLAYBACK, START), (PLAYBACK, STOP), (GENERIC, START)):
            client.send_message({"case": case}, category, type_, [7])
        daemon.settle()
        return sorted(name for (name,) in daemon.rows("SELECT name FROM events WHERE payload ->> '$.case' = ?", case))

    def open_session(self, daemon):
        client = self.connect(daemon)
        client.create_reporting_session(7)
        client.set_service_type(7, 7)
        return client

    def test_globs_choose_what_is_stored(self):
        everything = sorted(f"org.vantle.{service}.{event}" for service in ("talsys", "longformaudio")
                            for event in ("Playback.Start", "Playback.Stop", "Generic.Start"))
        cases = {"# absent": everything, "wanted = []": [], 'wanted = ["*"]': everything,
                 'wanted = ["org.vantle.talsys.*.Start"]': [everything[3], everything[4]],
                 'wanted = ["nothing", "org.vantle.longformaudio.Playback.Sto?"]': [everything[2]],
                 'wanted = ["org.vantle.longformaudio"]': []}
        # One daemon sees each change of its settings without a restart.
        daemon = self.daemon
        client = self.open_session(daemon)
        for number, (text, names) in enumerate(cases.items()):
            with self.subTest(text):
                daemon.write_config(ANALYTICS_SETTINGS, text + "\n")
                tries = iter(range(10**9))
                daemon.eventually(lambda: self.send_all(daemon, client, f"{number}.{next(tries)}") == names, text)

    def test_a_file_that_does_not_parse_reads_as_empty_and_is_named(self):
        daemon = self.start_daemon(config={ANALYTICS_SETTINGS: 'wanted = [\n"a\n'})
        self.assertEqual(len(self.send_all(daemon, self.open_session(daemon), "broken")), 6)
        self.assertRegex(daemon.log(), r"org\.vantle\.talsys\.analytics.*\b2\b")
        self.assertEqual((daemon.root / "config" / ANALYTICS_SETTINGS).read_text(), 'wanted = [\n"a\n')


class Activation(unittest.TestCase):
    def test_a_socket_of_the_service_manager_is_taken_over_and_left_behind(self):
        with tempfile.TemporaryDirectory() as root, socket.socket(socket.AF_UNIX) as listening:
            path = f"{root}/given.sock"
            listening.bind(path)
            listening.listen()
            command = f'exec 3<&{listening.fileno()}; export LISTEN_FDS=1 LISTEN_PID=$$; exec "$0" --root "$1"'
            client = talreporting.Client(path, timeout=PATIENCE_SECONDS)  # before there is a daemon
            with client, subprocess.Popen(["sh", "-c", command, BIN_DIR / "talreportingd", root],
                                          pass_fds=[listening.fileno()], stderr=subprocess.DEVNULL) as process:
                self.assertEqual(client.get_all_reporters(), [])
                process.terminate()
                self.assertEqual(process.wait(PATIENCE_SECONDS), 0)
            self.assertTrue(os.path.exists(path))
            self.assertFalse(os.path.exists(f"{root}/run/talreporting.sock"))

    def test_no_file_of_the_daemon_takes_the_place_of_a_missing_standard_descriptor(self):
        with tempfile.TemporaryDirectory() as root, socket.socket(socket.AF_UNIX) as listening:
            listening.bind(f"{root}/given.sock")
            listening.listen()
            command = (f'exec 3<&{listening.fileno()}; export LISTEN_FDS=1 LISTEN_PID=$$; '
                       'exec "$0" --root "$1" --log-level debug <&- >&- 2>&-')
            client = talreporting.Client(f"{root}/given.sock", timeout=PATIENCE_SECONDS)
            with client, subprocess.Popen(["sh", "-c", command, BIN_DIR / "talreportingd", root],
                                          pass_fds=[listening.fileno()]) as process:
                client.get_all_reporters()
                files = [os.readlink(f"/proc/{process.pid}/fd/{number}") for number in range(3)]
                process.terminate()
                self.assertEqual(process.wait(PATIENCE_SECONDS), 0)
            self.assertEqual(files, ["/dev/null"] * 3)


class Retention(DaemonTest):
    config = {STORE_SETTINGS: "max_mebibytes = 1\n"}

    def test_the_oldest_rows_go_when_the_store_is_full(self):
        client = self.connect()
        client.create_reporting_session(7)
        numbers = iter(range(10**9))

        def send_some():
            for _ in range(200):
                message = {"number": next(numbers), "text": "x" * 1000}
                client.request(talreporting.SEND_MESSAGE, message, PLAYBACK, START, [7], reply=False)
            client.get_all_reporters()
            self.daemon.settle()

        def kept():
            return self.daemon.rows("SELECT min(payload ->> '$.number'), count(*), sum(length(payload)) FROM events"
                                    " WHERE payload ->> '$.number' IS NOT NULL")[0]

        for _ in range(10):
            send_some()
        self.daemon.eventually(lambda: send_some() or (kept()[0] > 0 and kept()[2] <= 1.5 * 2**20), "old rows go")
        self.assertEqual(self.daemon.rows("SELECT max(payload ->> '$.number') FROM events"), [(next(numbers) - 1,)])


if __name__ == "__main__":
    unittest.main()
