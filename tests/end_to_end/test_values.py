"""Every kind of value from the wire to the JSON in the store."""

import json
import struct
import time
import unittest

import cbor2

from tal_harness import PLAYBACK, START, DaemonTest

NAME = "org.vantle.unknown.Playback.Start"


def raw(hex_text):
    return bytes.fromhex(hex_text)


def parse(text):
    """JSON with the difference between 1, 1.0 and true kept, and names that stand twice refused."""
    def unique(pairs):
        assert len({key for key, _ in pairs}) == len(pairs), f"a name stands twice in {text}"
        return dict(pairs)
    return json.loads(text, parse_int=lambda t: ("integer", t), parse_float=lambda t: ("double", t),
                      object_pairs_hook=unique)


# name: (value as CBOR, its JSON in the store)
VALUES = {
    "zero": (raw("00"), "0"),
    "one": (raw("01"), "1"),
    "one in eight bytes": (raw("1b0000000000000001"), "1"),
    "2^53+1": (cbor2.dumps(2**53 + 1), "9007199254740993"),
    "2^63-1": (raw("1b7fffffffffffffff"), "9223372036854775807"),
    "2^63": (raw("1b8000000000000000"), "9223372036854775808"),
    "2^64-1": (raw("1bffffffffffffffff"), "18446744073709551615"),
    "minus one": (raw("20"), "-1"),
    "-2^63": (raw("3b7fffffffffffffff"), "-9223372036854775808"),
    "half float": (raw("f93e00"), "1.5"),
    "smallest half float": (raw("f90001"), "5.960464477539063e-08"),
    "single float": (raw("fa3dcccccd"), "0.10000000149011612"),
    "double": (raw("fb3fb999999999999a"), "0.1"),
    "whole double": (raw("fb4059000000000000"), "100.0"),
    "whole half float": (raw("f90000"), "0.0"),
    "minus zero": (raw("fb8000000000000000"), "-0.0"),
    "third": (cbor2.dumps(1 / 3), "0.3333333333333333"),
    "not a number": (raw("f97e00"), "null"),
    "infinity": (raw("fb7ff0000000000000"), "null"),
    "minus infinity": (raw("faff800000"), "null"),
    "true": (raw("f5"), "true"),
    "false": (raw("f4"), "false"),
    "text": (cbor2.dumps("Grüße 🎧 \"\\/"), json.dumps("Grüße 🎧 \"\\/")),
    "control characters": (cbor2.dumps("\0\x01\t\n\x1b\x7f"), json.dumps("\0\x01\t\n\x1b\x7f")),
    "empty text": (raw("60"), '""'),
    "text in chunks": (raw("7f 6161 60 626263 ff"), '"abc"'),
    "text that looks like a number": (cbor2.dumps("1.0"), '"1.0"'),
    "data": (raw("4300ff10"), '"AP8Q"'),
    "data to be padded": (raw("41ff"), '"/w=="'),
    "empty data": (raw("40"), '""'),
    "data in chunks": (raw("5f 4100 42ff10 ff"), '"AP8Q"'),
    "date in whole seconds": (raw("c100"), '"1970-01-01T00:00:00.000000Z"'),
    "date with a fraction": (b"\xc1" + cbor2.dumps(1769870702.625), '"2026-01-31T14:45:02.625000Z"'),
    "date before 1970": (raw("c120"), '"1969-12-31T23:59:59.000000Z"'),
    "date in half precision": (raw("c1f93e00"), '"1970-01-01T00:00:01.500000Z"'),
    "empty array": (raw("80"), "[]"),
    "empty map": (raw("a0"), "{}"),
    "mixed array": (raw("84 01 f93c00 f5 c100"), '[1, 1.0, true, "1970-01-01T00:00:00.000000Z"]'),
    "endless array": (raw("9f 01 9f ff 6161 ff"), '[1, [], "a"]'),
    "endless map": (raw("bf 6161 01 6162 bf 6163 f97e00 ff ff"), '{"a": 1, "b": {"c": null}}'),
    "key in chunks": (raw("a1 7f 6161 6162 ff 01"), '{"ab": 1}'),
    "nested": (cbor2.dumps({"a": [{"b": [[-1.5], {}]}, b"\0"]}), '{"a": [{"b": [[-1.5], {}]}, "AA=="]}'),
    "key twice": (raw("a2 6161 01 6161 02"), '{"a": 2}'),
    "key thrice, of several kinds": (raw("a4 6161 01 6161 80 6162 02 6161 a0"), '{"a": {}, "b": 2}'),
    "key with a blank, nested": (raw("a1 63612062 01"), '{"a b": 1}'),
    "empty key": (raw("a1 60 01"), '{"": 1}'),
}


class Values(DaemonTest):
    def setUp(self):
        self.client = self.connect()
        self.client.create_reporting_session(7)

    def send(self, message):
        """Sends a message given as CBOR."""
        body = b"\x86\x06\x01" + message + cbor2.dumps(PLAYBACK) + cbor2.dumps(START) + b"\x81\x07"
        self.client.send_raw(struct.pack("<I", len(body)) + body)
        self.assertIsNone(self.client.result(1))

    def stored(self, key):
        """The JSON texts that the store holds for a case, parsed."""
        self.daemon.settle()
        return [parse(payload) for (payload,) in self.daemon.rows(
            "SELECT payload FROM events WHERE name = ? AND payload ->> '$.key' = ? ORDER BY id", NAME, key)]

    def test_every_value(self):
        for name, (value, _) in VALUES.items():
            self.send(b"\xa2\x63key" + cbor2.dumps(name) + b"\x65value" + value)
        for name, (_, expected) in VALUES.items():
            with self.subTest(name):
                self.assertEqual([payload["value"] for payload in self.stored(name)], [parse(expected)])

    def test_keys_of_the_message_itself(self):
        self.send(raw("bf 63") + b"key" + cbor2.dumps("last") + raw("6161 01 6161 02") +
                  b"\x63a b\x03" + b"\x63a_b\x04" + raw("ff"))
        (payload,) = self.stored("last")
        self.assertEqual((payload["a"], payload["a_b"], "a b" in payload), (("integer", "2"), ("integer", "3"), False))

    def test_extreme_doubles_come_back_as_they_were(self):
        numbers = [1e300, -1.7976931348623157e308, 5e-324, 2.2250738585072014e-308, 1e22, 123456789012345680.0, 1e-7]
        self.client.send_message({"key": "extreme", "value": numbers}, PLAYBACK, START, [7])
        (payload,) = self.stored("extreme")
        self.assertEqual([float(text) for _, text in payload["value"]], numbers)

    def test_a_message_of_thousands_of_keys(self):
        message = {"key": "large", **{f"k{n}": n for n in range(5000)}}
        self.client.send_message(message, PLAYBACK, START, [7])
        (payload,) = self.stored("large")
        self.assertEqual([int(payload[f"k{n}"][1]) for n in range(5000)], list(range(5000)))

    def test_stamps_are_kept_or_repaired(self):
        now = time.time()
        for stamp, kept in ((now - 100, True), (now + 1e6, True), (now - 400 * 86400, False)):
            self.client.send_message({"key": f"stamp {stamp}", "talreporting_timestamp": stamp}, PLAYBACK, START, [7])
            (payload,) = self.stored(f"stamp {stamp}")
            with self.subTest(kept=kept):
                if kept:
                    self.assertEqual(float(payload["talreporting_timestamp"][1]), stamp)
                    self.assertNotIn("invalid_timestamp", payload)
                else:
                    self.assertEqual(float(payload["invalid_timestamp"][1]), stamp)
                    self.assertGreaterEqual(float(payload["talreporting_timestamp"][1]), now)


if __name__ == "__main__":
    unittest.main()
