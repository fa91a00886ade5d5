#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Writes the seeds of JournalSegment_fuzz: a segment of the journal, whole and with the damage that disks do."""

import pathlib
import struct

DIRECTORY = pathlib.Path(__file__).parent / "JournalSegment"
MARKER = b"\x78\x56\x34\x12"


def crc32c(data, before=0):
    crc = before ^ 0xFFFFFFFF
    for byte in data:
        crc ^= byte
        for _ in range(8):
            crc = crc >> 1 ^ (0x82F63B78 if crc & 1 else 0)
    return crc ^ 0xFFFFFFFF


def head(version=1):
    fields = b"TWJourn\n" + struct.pack("<I", version) + MARKER
    return fields + struct.pack("<I", crc32c(fields))


def record(sequence, data, kind=2, length=None, marker=MARKER):
    fields = struct.pack("<IIQdQIB3x", crc32c(data), len(data) if length is None else length, sequence, 1763633880.25, 7, 1001, kind)
    return marker + struct.pack("<I", crc32c(fields, crc32c(marker))) + fields + data


FIRST = record(1, b"4711 player", kind=1)
SECOND = record(2, b"\x93\x02\xabsendMessage\x90")
THIRD = record(3, b"", kind=3)
SEGMENT = head() + FIRST + SECOND + THIRD


def without(begin, end):
    return SEGMENT[:begin] + bytes(end - begin) + SEGMENT[end:]


SEEDS = {
    "whole": SEGMENT,
    "head-only": head(),
    "newer": head(version=2) + FIRST,
    "torn": SEGMENT[:-10],
    "torn-bytes": SEGMENT[: len(head() + FIRST) + 50],
    "damaged-head": without(0, 20),
    "damaged-first": without(8, 60),
    "damaged-bytes": without(70, 72),
    "missing-bytes": SEGMENT[:70] + SEGMENT[72:],
    "too-long": head() + FIRST + record(2, b"x", length=1 << 30) + THIRD,
    "going-back": head() + SECOND + FIRST + SECOND + THIRD,
    "other-marker": head() + FIRST + record(2, b"x", marker=b"abcd") + THIRD,
    "unknown-kind": head() + FIRST + record(2, b"x", kind=9) + THIRD,
    "nested": head() + record(1, SEGMENT) + THIRD,
}

DIRECTORY.mkdir(exist_ok=True)
for name, data in SEEDS.items():
    (DIRECTORY / name).write_bytes(data)
