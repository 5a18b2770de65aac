#!/usr/bin/env python3
"""Writes the seeds of the fuzzers: one file per case below, named after it.

usage: make_seed_corpus.py    (into corpus/ beside this file; what a fuzzer found stays there)
"""

import pathlib
import struct

# CBOR by hand, as hex with 'text' in quotes: most of these no encoder would write.
REQUESTS = {
    "hello": "83 00 01 01",
    "hello-durable": "84 00 01 01 A1 6B 'acknowledge' 67 'durable'",
    "hello-other-options": "84 00 01 01 BF 61 'x' F6 61 'y' C2 41 01 FF",
    "hello-version-2": "83 00 01 02",
    "create": "83 01 02 07",
    "create-smallest-id": "83 01 02 3B 7FFFFFFFFFFFFFFF",
    "create-id-too-large": "83 01 02 1B 8000000000000000",
    "set-service-type": "84 02 03 19 FFFF 07",
    "get-service-name": "83 03 04 00",
    "set-configuration": "84 04 05 A1 61 'k' 61 'v' 07",
    "set-configuration-null": "84 04 05 F6 07",
    "start": "83 05 06 07",
    "send": "86 06 07 A2 61 'a' 01 61 'b' F5 04 01 81 07",
    "send-broadcast": "86 06 07 A0 1A FFFFFFFF 19 FFFF F6",
    "send-vocabulary": "86 06 07 A6 75 'session_output_running' F5 6F 'RvSessionVolume' F9 3800 6E 'active_devices'"
                       "68 'Built-in' 77 'session_selected_format' 6E 'S16LE 44100 Hz' 69 'mFormatID' 63 'raw'"
                       "76 'talreporting_timestamp' C1 FB 41D452D9EC200000 04 01 81 07",
    "send-every-kind": "86 06 07 AB 61 'a' 00 61 'b' 1B FFFFFFFFFFFFFFFF 61 'c' 3B 7FFFFFFFFFFFFFFF 61 'd' F93C00 61 'e'"
                       "FA47C35000 61 'f' FB3FF199999999999A 61 'g' F4 61 'h' C120 61 'i' 42 00FF 61 'j' 83 01 80 A0"
                       "61 'k' A1 61 'n' 60 04 01 80",
    "send-indefinite": "9F 06 07 BF 7F 61 'a' 61 'b' FF 5F 41 01 41 02 FF 61 'c' 9F 01 BF FF FF FF 04 01 9F 07 20 FF FF",
    "send-key-twice": "86 06 07 A3 61 'a' 01 61 'b' 02 61 'a' 03 04 01 F6",
    "send-not-shortest": "86 18 06 19 0007 B8 01 78 01 'a' 1B 0000000000000001 18 04 18 01 98 01 18 07",
    "send-nested": "86 06 07" + "A1 61 'k'" * 31 + "01 04 01 F6",
    "send-nested-too-deep": "86 06 07" + "A1 61 'k'" * 32 + "01 04 01 F6",
    "send-null-within": "86 06 07 A1 61 'a' F6 04 01 F6",
    "send-undefined-within": "86 06 07 A1 61 'a' F7 04 01 F6",
    "send-simple-within": "86 06 07 A1 61 'a' F8 FF 04 01 F6",
    "send-tag-within": "86 06 07 A1 61 'a' C0 60 04 01 F6",
    "send-date-nan": "86 06 07 A1 61 'a' C1 F97E00 04 01 F6",
    "send-key-no-text": "86 06 07 A1 01 01 04 01 F6",
    "send-bad-utf8": "86 06 07 A1 61 'a' 62 C328 04 01 F6",
    "send-utf8": "86 06 07 A1 63 E282AC 64 F09F8EB5 04 01 F6",
    "send-negative-too-small": "86 06 07 A1 61 'a' 3B FFFFFFFFFFFFFFFF 04 01 F6",
    "send-category-too-large": "86 06 07 A0 1B 0000000100000000 01 F6",
    "send-huge-map": "86 06 07 BB FFFFFFFFFFFFFFFF",
    "send-huge-array": "86 06 07 A1 61 'a' 9B 0000000100000000",
    "send-huge-text": "86 06 07 A1 7B FFFFFFFFFFFFFFFF 61",
    "stop": "83 07 08 07",
    "destroy": "83 08 09 07",
    "validate": "83 09 0A 07",
    "get-all": "82 0A 0B",
    "kill": "82 0B 0C",
    "unknown-operation": "83 18 63 0D D8 20 60",
    "unknown-operation-nested-tags": "83 0C 0D" + "C2" * 40 + "60",
    "no-reply-wanted": "83 01 00 07",
    "operation-text": "82 61 'x' 07",
    "call-missing": "81 0A",
    "trailing-byte": "82 0A 0B 00",
    "too-few-arguments": "82 01 02",
    "too-many-arguments": "84 01 02 07 07",
    "never-ending": "9F 0A 0B",
    "not-an-array": "A0",
    "reserved": "1C",
    "break": "FF",
}

# Whole streams: the lengths too are by hand.
STREAMS = {
    "length-0": "00000000",
    "length-over-limit": "01100000 80",
    "length-huge": "FFFFFFFF",
    "frame-cut": "05000000 820A",
    "header-cut": "0500",
}

READ_SIZES = (1, 7, 256)

# Protocol-buffers fields, well-formed and not.
RECORDS = {
    "default": "10 00 1A 00 22 00 2A 00",
    "full": "08 01 10 FFFFFFFFFFFFFFFFFF01 1A 08 'overload' 22 05 'mixer' 2A 12 'org.example.player'",
    "unknown-fields": "30 9601 31 1122334455667788 3A 02 0810 3B 0801 13 14 3C 35 10101010 10 05",
    "known-of-another-type": "0A 01 05 0D 01020304 15 01020304 1805 33 1009 34 10 05",
    "end-of-group": "10 05 0C 10 07",
    "length-beyond-the-end": "1A 05 'four'",
    "huge-length": "1A FFFFFFFFFFFFFFFFFF01 'x'",
    "endless-varint": "10 FFFFFFFFFFFFFFFFFFFFFFFF01",
    "cut-fixed": "31 01020304050607",
    "field-zero": "00 00",
    "no-such-type": "36 00",
    "groups-deep": "33" * 101 + "34" * 101,
}


def from_hex(text):
    """The bytes of a text like "82 01 'abc' F6"."""
    parts = text.split("'")
    return b"".join(part.encode() if quoted else bytes.fromhex(part)
                    for part, quoted in zip(parts, [False, True] * len(parts)))


def frame(content):
    return struct.pack("<I", len(content)) + content


def corpus_directory(fuzzer):
    directory = pathlib.Path(__file__).parent / "corpus" / fuzzer
    directory.mkdir(parents=True, exist_ok=True)
    return directory


def write_frame_decoding():
    directory = corpus_directory("frame_decoding")
    streams = {name: frame(from_hex(text)) for name, text in REQUESTS.items()}
    streams["all-requests"] = b"".join(streams.values())
    streams["same-message-thrice"] = 3 * streams["send-vocabulary"]
    streams |= {name: from_hex(text) for name, text in STREAMS.items()}
    for number, (name, stream) in enumerate(streams.items()):
        read_size = READ_SIZES[number % len(READ_SIZES)]
        (directory / name).write_bytes(bytes([read_size - 1]) + stream)


def write_metric_records():
    directory = corpus_directory("metric_record")
    for name, text in RECORDS.items():
        (directory / name).write_bytes(from_hex(text))


write_frame_decoding()
write_metric_records()
