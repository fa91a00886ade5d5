#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Writes the seeds in PackedMapReader/. Each is the bytes of one map."""
import pathlib

SEEDS = {
    "message": "83 A6 766F6C756D65 CB 3FE0000000000000 A4 6E616D65 A7 737065616B6572 A2 6174 D6 FF 691F0000",
    "numbers": "89 A1 61 7F A1 62 E0 A1 63 CC FF A1 64 D0 80 A1 65 CA 3F800000 A1 66 CF FFFFFFFFFFFFFFFF "
               "A1 67 D3 8000000000000000 A1 68 C3 A1 69 CB 7FF8000000000000",
    "dates": "83 A1 61 D6 FF 0000000A A1 62 D7 FF 77359400 00000001 A1 63 C7 0C FF 1DCD6500 FFFFFFFFFFFFFFFF",
    "nested": "82 A1 61 93 01 80 90 A1 62 81 A1 63 82 A0 01 A1 78 A1 79",
    "doubled": "82 A1 61 01 A1 61 02",
    "doubled-inside": "81 A1 61 82 A1 62 01 A1 62 02",
    "long-forms": "DF 00000002 DB 00000001 61 DC 0001 D9 01 78 DA 0001 62 DD 00000000",
    "refused": "84 A1 61 C0 A1 62 C4 01 00 A1 63 D4 05 00 01 02",
    "text": "82 A1 61 A3 EFBFBF A1 62 A2 C328",
    "claims": "81 A1 61 DD FFFFFFFF",
    "empty": "80",
}

for name, digits in SEEDS.items():
    (pathlib.Path(__file__).parent / "PackedMapReader" / name).write_bytes(bytes.fromhex(digits))
