"""What the daemon refuses: every row of the error table has its error, has no effect, and spares everyone else."""

import os
import pwd
import struct
import unittest

import cbor2

import talreporting
from tal_harness import IPC_SETTINGS, PLAYBACK, START, DaemonTest

CALL = 0xFFFFFF  # out of the way of the client's own
C = "1a00ffffff"  # the same as CBOR
SHAPE, UNKNOWN_OPERATION, NOT_PERMITTED, BAD_LENGTH, BAD_VERSION = 1, 2, 3, 4, 5
LIMIT = 1 << 20
# Reporter 7 exists and keeps service type 7; nothing that is refused may change that, or bring up another one.
REPORTER, TYPE, NEW = 7, 7, 1000
DEEPEST = 32


def frame(body):
    return struct.pack("<I", len(body)) + body


def raw(hex_text):
    return bytes.fromhex(hex_text)


def send_message(value, key=b"bad"):
    """The request [6, CALL, {"bad": value}, 4, 1, [7]] around a value given as bytes."""
    return raw(f"8606{C}a163") + key + value + raw("04018107")


# Not one CBOR item: a call number may or may not have been read before the fault.
NOT_WELL_FORMED = {
    "truncated array": raw(f"8301{C}"),
    "truncated head": raw("82011b0000"),
    "truncated text": send_message(raw("65616263"))[:-4],
    "bytes after the item": cbor2.dumps([talreporting.CREATE, CALL, NEW]) + b"\x00",
    "two items": cbor2.dumps([talreporting.CREATE, CALL, NEW]) * 2,
    "break alone": raw("ff"),
    "break in an array of definite length": raw(f"8301{C}ff"),
    "unterminated array": raw(f"9f01{C}1903e8"),
    "reserved head": raw(f"8301{C}1c"),
    "text chunk in a byte string": send_message(raw("5f6161ff")),
    "nested indefinite chunk": send_message(raw("7f7f6161ffff")),
    "odd indefinite map": send_message(raw("bf6161ff")),
    "indefinite integer": send_message(raw("1f")),
    "simple value below 32 in two bytes": send_message(raw("f818")),
    "array of 2^64-1 items": raw("9bffffffffffffffff"),
    "map of 2^63 entries": send_message(raw("bb8000000000000000")),
    "text of 2^63 bytes": send_message(raw("7b8000000000000000")),
    "bytes of 2^32 bytes": send_message(raw("5b0000000100000000")),
    "array nested without end": b"\x81" * 200_000,
    "tags without end": b"\xc1" * 200_000,
}

NO_REQUEST = {
    "a text": "create", "a map": {1: 2}, "an empty array": [], "operation alone": [1],
    "operation a text": ["1", CALL, NEW], "operation negative": [-1, CALL, NEW], "operation a float": [1.0, CALL, NEW],
    "call a text": [1, "77", NEW], "call negative": [1, -CALL, NEW], "call null": [1, None, NEW],
    "call a float": [1, 77.0, NEW],
}

M = {"bad": 1}
# Arguments that do not fit their operation: the call is known.
WRONG_ARGUMENTS = {
    "hello without version": [0], "hello, text version": [0, "1"], "hello, options no map": [0, 1, []],
    "hello, one too many": [0, 1, {}, 1],
    "create without ID": [1], "create, one too many": [1, NEW, NEW], "create, text ID": [1, "1000"],
    "create, float ID": [1, 1000.0], "create, null ID": [1, None], "create, ID 2^63": [1, 2**63],
    "create, ID -2^63-1": [1, -2**63 - 1], "create, bool ID": [1, True],
    "type, one too few": [2, 3], "type 65536": [2, 65536, REPORTER], "type negative": [2, -1, REPORTER],
    "type a text": [2, "haptics", REPORTER], "type, one too many": [2, 3, REPORTER, 0],
    "look-up without ID": [3], "look-up of a list": [3, [REPORTER]],
    "configuration a list": [4, [], REPORTER], "configuration a text": [4, "a", REPORTER],
    "configuration with null": [4, {"HostApplicationDisplayID": None}, REPORTER], "configuration alone": [4, {}],
    "configuration, integer key": [4, {1: "x"}, REPORTER],
    "start without ID": [5], "start, text ID": [5, "7"], "start, one too many": [5, REPORTER, 1],
    "message null": [6, None, 4, 1, [REPORTER]], "message a list": [6, [], 4, 1, [REPORTER]],
    "message without receivers": [6, M, 4, 1], "message, one too many": [6, M, 4, 1, [REPORTER], 1],
    "category 2^32": [6, M, 2**32, 1, [REPORTER]], "category negative": [6, M, -1, 1, [REPORTER]],
    "category a float": [6, M, 4.0, 1, [REPORTER]], "type 2^16": [6, M, 4, 2**16, [REPORTER]],
    "type null": [6, M, 4, None, [REPORTER]], "receivers a number": [6, M, 4, 1, REPORTER],
    "receivers a map": [6, M, 4, 1, {}], "a receiver null": [6, M, 4, 1, [REPORTER, None]],
    "a receiver 2^63": [6, M, 4, 1, [REPORTER, 2**63]], "a receiver a text": [6, M, 4, 1, [REPORTER, "8"]],
    "a receiver a list": [6, M, 4, 1, [REPORTER, [8]]],
    "stop without ID": [7], "stop, bool ID": [7, False], "destroy without ID": [8], "destroy, list": [8, [REPORTER]],
    "destroy, one too many": [8, REPORTER, 0], "validate, text": [9, "7"], "reporters, one too many": [10, None],
    "kill, one too many": [11, 0],
}

# Values that no message may hold; each stands alone, in a list, in a map, and behind a good entry.
BAD_VALUES = {
    "null": raw("f6"), "undefined": raw("f7"), "simple value 16": raw("f0"), "simple value 255": raw("f8ff"),
    "text date": raw("c074") + b"2026-01-31T14:45:02Z", "big number": raw("c24101"), "tag 32": raw("d8206161"),
    "epoch tag on text": raw("c16161"), "epoch tag on a list": raw("c180"), "epoch tag on itself": raw("c1c100"),
    "integer below -2^63": raw("3b8000000000000000"), "integer -2^64": raw("3bffffffffffffffff"),
    "text that is not UTF-8": raw("61ff"), "overlong UTF-8": raw("62c080"), "surrogate": raw("63eda080"),
    "beyond Unicode": raw("64f4908080"), "truncated UTF-8": raw("62e282"),
    "key that is not UTF-8": raw("a161ff01"), "integer key": raw("a10101"), "bytes key": raw("a1416101"),
    "list key": raw("a18001"), "null key": raw("a1f601"), "tagged key": raw("a1c1616101"),
    "far too deep": b"\x81" * 40 + b"\x00", "maps far too deep": b"\xa1\x61a" * 40 + b"\x00",
    "deep beyond any stack": b"\x81" * 500_000 + b"\x00",
}
WRAPPINGS = {"": lambda v: v, " in a list": lambda v: b"\x82\x01" + v, " in a map": lambda v: b"\xa2\x61g\x01\x61b" + v,
             " in an endless list": lambda v: b"\x9f" + v + b"\xff"}


class other_user:
    """While it lasts, this process is an unprivileged user for whoever it connects to."""

    def __enter__(self):
        nobody = pwd.getpwnam("nobody")
        os.setegid(nobody.pw_gid)
        os.seteuid(nobody.pw_uid)

    def __exit__(self, *exception):
        os.seteuid(0)
        os.setegid(0)


class Refusals(DaemonTest):
    def setUp(self):
        self.wait_for_no_sessions()
        self.client = self.connect()
        self.client.create_reporting_session(REPORTER)
        self.client.set_service_type(REPORTER, TYPE)

    def check(self, name, body, code, calls):
        """Sends a body that must be refused, answered on one of `calls`, and looks that all is as before."""
        with self.subTest(name):
            self.client.send_raw(frame(body))
            self.assertEqual(self.client.get_all_reporters(), [REPORTER])
            self.assertEqual(self.client.validate_reporter(REPORTER), {"reporterID": REPORTER, "serviceType": TYPE})
            answered = [call for call in calls if self.client.has_reply(call)]
            self.assertEqual(len(answered), 1, "one reply is expected")
            self.assert_refused(code, self.client, answered[0])
            self.assertFalse(self.client.has_reply(answered[0]))

    def test_table(self):
        for name, body in NOT_WELL_FORMED.items():
            self.check(name, body, SHAPE, (0, CALL))
        for name, item in NO_REQUEST.items():
            self.check(name, cbor2.dumps(item), SHAPE, (0, CALL) if CALL in list(item) else (0,))
        for name, (operation, *arguments) in WRONG_ARGUMENTS.items():
            self.check(name, cbor2.dumps([operation, CALL, *arguments]), SHAPE, (CALL,))
        for name, value in BAD_VALUES.items():
            for where, wrap in WRAPPINGS.items():
                self.check(name + where, send_message(wrap(value)), SHAPE, (CALL,))
        for operation in (12, 255, 2**32 + 1, 2**64 - 1):
            for arguments in ([], [NEW], [None, {1: 2}]):
                self.check(f"operation {operation} {arguments}", cbor2.dumps([operation, CALL, *arguments]),
                           UNKNOWN_OPERATION, (CALL,))
        for version in (0, 2, 2**64 - 1):
            self.check(f"version {version}", cbor2.dumps([0, CALL, version]), BAD_VERSION, (CALL,))
            self.check(f"version {version} with options", cbor2.dumps([0, CALL, version, {"acknowledge": "durable"}]),
                       BAD_VERSION, (CALL,))

        # A refused message left nothing in the store, a refused start started nothing, and a good message still counts.
        self.client.send_message({"good": 1}, PLAYBACK, START)
        self.assertEqual(len(self.daemon.events("org.vantle.standalone.Playback.Start", good=1)), 1)
        self.assertEqual(self.daemon.rows("SELECT count(*) FROM events WHERE payload LIKE '%\"bad\"%'"), [(0,)])
        self.client.send_message({"good": 2}, PLAYBACK, START, [REPORTER])
        (payload,) = self.daemon.events("org.vantle.longformaudio.Playback.Start", good=2)
        self.assertEqual(payload["HostApplicationDisplayID"], "Unknown", "a refused configuration changed nothing")

    def test_nesting_is_allowed_up_to_its_limit(self):
        def accepted(depth):
            """`depth` arrays and maps around a number, counting the request and the message."""
            message = cbor2.loads(b"\xa1\x61n" + b"\x81" * (depth - 2) + b"\x00")
            call = self.client.request(talreporting.SEND_MESSAGE, message, PLAYBACK, START, [REPORTER])
            try:
                return self.client.result(call) is None
            except talreporting.ReportingError as error:
                self.assertEqual(error.code, SHAPE)
                return False

        self.assertEqual([depth for depth in range(2, 40) if accepted(depth)], list(range(2, DEEPEST + 1)))

    def test_a_wrong_length_ends_the_connection(self):
        for length in (0, LIMIT + 1, 2**31, 2**32 - 1):
            with self.subTest(length):
                client = self.connect()
                client.create_reporting_session(NEW)
                client.send_raw(struct.pack("<I", length))
                self.assert_refused(BAD_LENGTH, client, 0)
                with self.assertRaises(ConnectionError):
                    client.get_all_reporters()
                self.assertEqual(self.client.get_service_name(REPORTER), TYPE)

    def test_a_frame_may_be_as_long_as_the_limit(self):
        room = LIMIT - len(send_message(raw("5a00000000")))
        self.client.send_raw(frame(send_message(b"\x5a" + struct.pack(">I", room) + bytes(room), b"big")))
        self.assertIsNone(self.client.result(CALL))

    def test_a_cut_off_frame_has_no_effect(self):
        whole = talreporting.encode_frame([talreporting.CREATE, CALL, NEW])
        for cut in range(1, len(whole)):
            client = self.connect()
            client.send_raw(whole[:cut])
            client.close()
        self.assertEqual(self.client.get_all_reporters(), [REPORTER])

    def test_refused_requests_that_want_no_reply_get_none(self):
        self.client.send_raw(talreporting.encode_frame([talreporting.CREATE, 0, "text"]))
        self.assertEqual(self.client.get_all_reporters(), [REPORTER])
        self.assertFalse(self.client.has_reply(0))

    @unittest.skipUnless(os.geteuid() == 0, "only root can connect as someone else")
    def test_another_user_may_connect_but_not_end_the_service(self):
        with other_user():
            client = self.connect()
        self.assertEqual(client.get_service_name(REPORTER), TYPE)
        self.assert_refused(NOT_PERMITTED, client, client.kill_service())
        self.assertEqual(client.get_service_name(REPORTER), TYPE)


class Settings(DaemonTest):
    config = {IPC_SETTINGS: "max_frame_bytes = 1000\n"}

    def test_the_frame_limit_can_be_lowered(self):
        client = self.connect()
        client.send_raw(frame(cbor2.dumps([1, 1, NEW, b"x" * 991])[:1000]))
        self.assert_refused(SHAPE, client, 1)
        client.send_raw(struct.pack("<I", 1001))
        self.assert_refused(BAD_LENGTH, client, 0)

    def test_only_allowed_users_are_let_in(self):
        own = pwd.getpwuid(os.geteuid()).pw_name
        open_daemon = self.start_daemon(config={IPC_SETTINGS: f'allowed_users = ["{own}"]\n'})
        self.assertEqual(self.connect(open_daemon).get_all_reporters(), [])
        self.assert_let_out(self.connect(self.start_daemon(config={IPC_SETTINGS: "allowed_users = []\n"})))
        if os.geteuid() == 0:
            with other_user():
                self.assert_let_out(self.connect(open_daemon))
            grouped = self.start_daemon(config={IPC_SETTINGS: 'allowed_groups = ["nogroup"]\n'})
            with other_user():
                self.assertEqual(self.connect(grouped).get_all_reporters(), [])

    def assert_let_out(self, client):
        self.assert_refused(NOT_PERMITTED, client, 0)
        with self.assertRaises(ConnectionError):
            client.get_all_reporters()


if __name__ == "__main__":
    unittest.main()
