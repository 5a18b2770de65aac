"""The ends of the daemon, orderly and not: what was promised to be in the store is there, once."""

import contextlib
import os
import signal
import sqlite3
import stat
import threading
import unittest

import talreporting
from tal_harness import PLAYBACK, START, DaemonTest

NAME = "org.vantle.longformaudio.Playback.Start"
GENERIC_NAME = "org.vantle.talsys.Playback.Start"


def start_session(client, reporter=7):
    client.create_reporting_session(reporter)
    client.set_service_type(reporter, talreporting.SERVICE_TYPES["longformaudio"])
    return client.start_reporting_session(reporter)


def send(client, number, reply=True):
    return client.request(talreporting.SEND_MESSAGE, {"number": number}, PLAYBACK, START, [7], reply=reply)


def read_rest(client):
    """Reads until the connection is at its end, or broken."""
    with contextlib.suppress(ConnectionError):
        client.result(-1)


class Ends(DaemonTest):
    @classmethod
    def setUpClass(cls):
        """Each case ends its own daemon."""

    def numbers(self, daemon, name=NAME):
        return [number for (number,) in daemon.rows(
            "SELECT payload ->> '$.number' FROM events WHERE name = ? ORDER BY id", name)]

    def test_kill_9_in_mid_stream_loses_nothing_that_was_acknowledged(self):
        root, acknowledged, number = self.make_root(self.addCleanup), set(), 0
        for life in range(20):
            daemon = self.start_daemon(root=root)
            client = self.connect(daemon, durable=True)
            start_session(client)
            calls = {}
            for _ in range(400):
                calls[send(client, number)] = number
                number += 1
            for call in list(calls)[:life * 20]:  # dies at another place of the stream each time
                client.result(call)
                acknowledged.add(calls[call])
            daemon.process.send_signal(signal.SIGKILL)
            read_rest(client)
            acknowledged |= {n for call, n in calls.items() if client.has_reply(call)}
            self.assertEqual(daemon.wait(), -signal.SIGKILL)

        daemon = self.start_daemon(root=root)
        self.assertEqual(daemon.rows("PRAGMA integrity_check"), [("ok",)])
        for name in (NAME, GENERIC_NAME):
            stored = self.numbers(daemon, name)
            self.assertEqual(len(stored), len(set(stored)), "each at most once")
            self.assertEqual(acknowledged - set(stored), set(), "each that was acknowledged")
            self.assertEqual(stored, sorted(stored))
        self.assertEqual(daemon.terminate(), 0)

    def test_sigterm_carries_out_what_was_received(self):
        for signal_number in (signal.SIGTERM, signal.SIGINT):
            with self.subTest(signal_number):
                daemon, count = self.start_daemon("--log-level", "debug"), 1000
                client = self.connect(daemon)
                started = start_session(client)
                client.get_all_reporters()
                # Held still, the daemon finds the requests and the signal at once.
                daemon.process.send_signal(signal.SIGSTOP)
                calls = range(101, 101 + count)
                client.send_raw(b"".join(talreporting.encode_frame(
                    [talreporting.SEND_MESSAGE, call, {"number": call - 101}, PLAYBACK, START, [7]]) for call in calls))
                daemon.process.send_signal(signal_number)
                daemon.process.send_signal(signal.SIGCONT)
                read_rest(client)
                self.assertEqual(daemon.wait(), 0)
                stored = self.numbers(daemon)
                self.assertEqual(stored, list(range(count)))
                self.assertTrue(all(client.has_reply(call) for call in calls))
                self.assertFalse(client.has_reply(started), "the held start stays unanswered")
                self.assertIn("ending session. reporterID=7", daemon.log())
                with self.assertRaises(OSError):
                    daemon.client()

    def test_sigterm_in_a_stream_stores_all_that_was_answered(self):
        daemon = self.start_daemon()
        client = self.connect(daemon)
        start_session(client)
        calls = []

        def stream():
            with contextlib.suppress(OSError):
                while True:
                    calls.append(send(client, len(calls)))

        sender = threading.Thread(target=stream)
        sender.start()
        witness = self.connect(daemon)
        while len(calls) < 2000:
            witness.get_all_reporters()
        daemon.process.terminate()
        sender.join()
        self.assertEqual(daemon.wait(), 0)
        stored = self.numbers(daemon)
        self.assertEqual(stored, list(range(len(stored))), "no gap")
        answered = sum(client.has_reply(call) for call in calls)
        self.assertGreaterEqual(len(stored), answered)
        self.assertGreater(answered, 0)

    def test_kill_service_commits_what_was_answered_and_ends_with_2(self):
        daemon = self.start_daemon()
        client = self.connect(daemon)
        start_session(client)
        calls = [send(client, number) for number in range(1000)]
        for call in calls:
            client.result(call)
        kill = client.kill_service()
        with contextlib.suppress(OSError):
            for number in range(1000, 1100):
                send(client, number, reply=False)
        read_rest(client)
        self.assertEqual(daemon.wait(), 2)
        self.assertFalse(client.has_reply(kill))
        self.assertEqual(self.numbers(daemon), list(range(1000)), "later requests are not carried out")
        self.assertIn("DESTROYING SERVICE", daemon.log())
        # Its remains do not hinder the next one.
        again = self.start_daemon(root=daemon.root)
        self.assertEqual(self.numbers(again), list(range(1000)))

    def test_a_second_daemon_refuses_and_harms_nothing(self):
        daemon = self.start_daemon()
        client = self.connect(daemon)
        start_session(client)
        files = sorted(os.listdir(daemon.root / "run")), os.stat(daemon.socket_path).st_ino
        second = self.start_daemon(root=daemon.root, log="second.log", wait_ready=False)
        self.assertEqual(second.wait(), 1)
        (line,) = second.log().splitlines()
        self.assertIn(str(daemon.root), line)
        self.assertEqual((sorted(os.listdir(daemon.root / "run")), os.stat(daemon.socket_path).st_ino), files)
        client.result(send(client, 1))
        self.assertEqual(self.connect(daemon).get_all_reporters(), [7])
        self.assertEqual([p["number"] for p in daemon.events(NAME)], [1])
        self.assertEqual(daemon.terminate(), 0)

    def test_files_are_for_the_daemons_user_and_group(self):
        self.addCleanup(os.umask, os.umask(0))
        daemon = self.start_daemon()
        modes = {path: stat.S_IMODE(os.stat(daemon.root / path).st_mode)
                 for path in ("state", "log", "state/store.db", "state/store.db-wal", "run/talreporting.sock")}
        self.assertEqual({path: oct(mode) for path, mode in modes.items()},
                         {"state": "0o750", "log": "0o750", "state/store.db": "0o640", "state/store.db-wal": "0o640",
                          "run/talreporting.sock": "0o666"})

    def test_the_store_is_as_documented(self):
        daemon = self.start_daemon()
        store = sqlite3.connect(f"file:{daemon.store_path}?mode=ro", uri=True)
        self.addCleanup(store.close)
        self.assertEqual(store.execute("PRAGMA journal_mode").fetchone(), ("wal",))
        columns = {"events": ["id", "recorded_at", "name", "payload"],
                   "metrics": ["id", "recorded_at", "metric", "record"],
                   "energylog": ["id", "recorded_at", "class", "name", "payload"]}
        for table, expected in columns.items():
            with self.subTest(table):
                names = [row[1] for row in store.execute(f"PRAGMA table_info({table})")]
                self.assertEqual(names[:len(expected)], expected)


if __name__ == "__main__":
    unittest.main()
