#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Writes the seeds in RpcFrameReader/. Each is a piece length, a method's number and the bytes of a client."""
import pathlib

REQUEST_OF_M = "94 00 01 A1 6D "
SEEDS = {
    "request": "00 00 " + REQUEST_OF_M + "91 05",
    "request-bytewise": "01 00 " + REQUEST_OF_M + "91 D3 8000000000000000",
    "notification": "00 03 93 02 A1 6D 90",
    "response": "00 03 94 01 07 82 A6 646F6D61696E A1 64 A4 636F6465 01 C0",
    "message": "00 02 " + REQUEST_OF_M + "94 83 A6 766F6C756D65 CB 3FE0000000000000 A4 6E616D65 A7 737065616B6572"
               "A2 6174 D6 FF 691F0000 CE 00000001 CD 0002 92 01 02",
    "message-to-all": "03 02 " + REQUEST_OF_M + "94 80 00 00 C0",
    "dates": "00 02 " + REQUEST_OF_M + "93 D6 FF 0000000A D7 FF 77359400 00000001 C7 0C FF 1DCD6500 FFFFFFFFFFFFFFFF",
    "nested": "02 02 " + REQUEST_OF_M + "91 82 A1 61 93 C2 80 90 A1 62 81 A1 63 CA 3F800000",
    "deep": "00 02 " + REQUEST_OF_M + "91 " * 29 + "90",
    "refused": "00 02 " + REQUEST_OF_M + "96 C4 02 0102 D4 05 00 D4 FF 00 A1 FF 81 C0 C0 81 91 01 01",
    "too-many": "00 02 " + REQUEST_OF_M + "DC 0014 " + "05 " * 20,
    "long-forms": "00 00 DD 00000004 D3 0000000000000000 CF 0000000000000001 DB 00000001 6D DC 0001 D9 01 78",
    "claims": "00 00 " + REQUEST_OF_M + "DD FFFFFFFF DF FFFFFFFF DB FFFFFFFF",
    "several": "00 00 " + ("93 02 A1 6D 91 01 " + REQUEST_OF_M + "90 ") * 3,
    "nonsense": "00 00 474554202F20",
}

for name, digits in SEEDS.items():
    (pathlib.Path(__file__).parent / "RpcFrameReader" / name).write_bytes(bytes.fromhex(digits))
