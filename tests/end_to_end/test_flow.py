"""Clients that take more than their share: they are made to wait, lose nothing, and cost the others nothing."""

import struct
import threading
import unittest

import cbor2

import talreporting
from tal_harness import GENERIC, IPC_SETTINGS, PATIENCE_SECONDS, PLAYBACK, START, DaemonTest

MEBIBYTE = 1 << 20
# What one connection may make the daemon hold while it does not read its replies. The bound is the daemon's own
# affair; this is far above it, and far below what an unbounded daemon would reach here.
BOUND = 64 * MEBIBYTE


FRAME = 11  # bytes of [10, call], the call in four bytes


def read_reply(stream):
    return cbor2.loads(stream.read(struct.unpack("<I", stream.read(4))[0]))


class Flow(DaemonTest):
    def setUp(self):
        self.wait_for_no_sessions()

    def test_a_slow_reader_waits_and_loses_nothing(self):
        client, other = self.connect(), self.connect()
        reporters = list(range(10**12, 10**12 + 100))  # so that a reply is a hundred times as long as its request
        for reporter in reporters:
            client.request(talreporting.CREATE, reporter, reply=False)
        self.assertEqual(client.get_all_reporters(), reporters)
        before = self.daemon.memory_bytes()

        slow = self.daemon.raw_socket()
        self.addCleanup(slow.close)
        slow.setblocking(False)
        sent, requests = 0, b"".join(struct.pack("<I", FRAME - 4) + b"\x82\x0a\x1a" + struct.pack(">I", call)
                                     for call in range(1, 150_000))
        # Pushes for as long as the daemon takes some, in a hundred round trips of another client.
        idle_round_trips = 0
        while sent < len(requests) and idle_round_trips < 100:
            try:
                sent += slow.send(requests[sent:sent + 65536])
                idle_round_trips = 0
            except BlockingIOError:
                self.assertEqual(other.validate_reporter(reporters[0])["reporterID"], reporters[0])
                idle_round_trips += 1
        self.assertLess(sent, len(requests), "the daemon stops reading from one who does not read")
        self.assertLess(self.daemon.memory_bytes() - before, BOUND)

        slow.settimeout(PATIENCE_SECONDS)
        with slow.makefile("rb") as stream:
            for call in range(1, sent // FRAME + 1):
                self.assertEqual(read_reply(stream), [call, 0, reporters])

    def test_floods_leave_others_their_turn(self):
        """Two clients send without pause or end; a third one's round trips all come back."""
        stop, counts, clients = threading.Event(), [0, 0], [self.connect(), self.connect()]

        def flood(index, client):
            client.create_reporting_session(index + 1)
            batch = talreporting.encode_frame(
                [talreporting.SEND_MESSAGE, 0, {"flood": index}, PLAYBACK, START, [index + 1]]) * 500
            while not stop.is_set():
                client.send_raw(batch)
                counts[index] += 500

        threads = [threading.Thread(target=flood, args=item) for item in enumerate(clients)]
        for thread in threads:
            thread.start()
        try:
            polite = self.connect()
            polite.create_reporting_session(3)
            seen = list(counts)
            for number in range(60):
                polite.send_message({"polite": number}, PLAYBACK, START, [3])
            while not all(now > then for now, then in zip(counts, seen)):  # the floods were served too
                polite.get_all_reporters()
        finally:
            stop.set()
            for thread in threads:
                thread.join()
        for index, client in enumerate(clients):
            client.get_all_reporters()  # the flood is worked off
            self.assertEqual(len(self.daemon.events("org.vantle.unknown.Playback.Start", flood=index)), 1)

    def test_a_great_many_distinct_messages_are_all_stored(self):
        """More than any queue on the way holds, faster than the store takes them."""
        count, client = 50_000, self.connect()
        client.create_reporting_session(7)
        for number in range(count):
            client.request(talreporting.SEND_MESSAGE, {"number": number}, GENERIC, START, [7], reply=False)
        client.get_all_reporters()
        self.daemon.settle()
        self.assertEqual(self.daemon.rows("SELECT payload ->> '$.number' FROM events WHERE name = ? ORDER BY id",
                                          "org.vantle.unknown.Generic.Start"), [(number,) for number in range(count)])


class Bounds(DaemonTest):
    config = {IPC_SETTINGS: "max_kept_mebibytes = 1\nmax_connections = 5\n"}

    def setUp(self):
        self.wait_for_no_sessions()

    def test_kept_messages_are_bounded_per_connection(self):
        greedy, modest = self.connect(), self.connect()
        for reporter, client in ((7, greedy), (8, modest)):
            client.create_reporting_session(reporter)
            client.start_reporting_session(reporter)

        def fill():
            """Sends until refused; returns how many were taken."""
            for number in range(5000):
                try:
                    greedy.send_message({"number": number, "text": "x" * 4000}, PLAYBACK, START, [7])
                except talreporting.ReportingError as error:
                    self.assertEqual((error.domain, error.code), ("org.vantle.talsys.ipc", 7))
                    return number
            self.fail("never refused")

        first = fill()
        self.assertTrue(MEBIBYTE // 4000 // 4 <= first <= MEBIBYTE // 4000 * 2, first)
        stored = self.daemon.events("org.vantle.unknown.Playback.Start")
        self.assertEqual([p["number"] for p in stored], list(range(first)), "what was refused is not stored")
        self.assertEqual(greedy.get_all_reporters(), [7, 8])
        modest.send_message({"modest": 1}, PLAYBACK, START, [8])
        greedy.stop_reporting_session(7)
        greedy.start_reporting_session(7)
        self.assertGreater(fill(), first // 2, "a stop makes room")
        greedy.destroy_reporting_session(7)
        greedy.create_reporting_session(7)
        greedy.send_message({"again": 1}, PLAYBACK, START, [7])

    def test_connections_past_the_limit_wait_for_their_turn(self):
        clients = [self.connect() for _ in range(20)]
        calls = [client.request(talreporting.VALIDATE, 7) for client in clients]
        for client, call in zip(clients, calls):  # each is answered, as the ones before it leave
            self.assertEqual(client.result(call)["serviceType"], talreporting.NO_SERVICE_TYPE)
            client.close()


if __name__ == "__main__":
    unittest.main()
