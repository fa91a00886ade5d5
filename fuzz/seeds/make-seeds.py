#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Writes the seeds of the targets whose inputs are no texts, except those that have a script of their own."""
import pathlib
import runpy
import sqlite3
import struct
import tempfile

HERE = pathlib.Path(__file__).parent


def write(target, seeds):
    directory = HERE / target
    directory.mkdir(exist_ok=True)
    for name, data in seeds.items():
        (directory / name).write_bytes(data)


def short(text):
    data = text if isinstance(text, bytes) else text.encode()
    return bytes([len(data)]) + data


def long(text):
    data = text.encode()
    return struct.pack("<H", len(data)) + data


# ---- what endpoints answer

write("OtlpAnswer", {
    "seconds": short("120") + b"{}",
    "date": short("Mon, 23 Nov 2026 05:30:00 GMT") + b'{"partialSuccess":{}}',
    "obsolete-dates": short("Monday, 23-Nov-26 05:30:00 GMT") + b"",
    "c-date": short("Mon Nov 23 05:30:00 2026") + b'{"partialSuccess":{"rejectedLogRecords":3}}',
    "too-great": short("99999999999999999999") + b'{"partialSuccess":{"rejectedLogRecords":"-9223372036854775808"}}',
    "message": short("") + b'{"partialSuccess":{"rejectedLogRecords":"2","errorMessage":"full \\u00fc\\n"}}',
    "html": short("soon") + b"<html><body>502 Bad Gateway</body></html>",
})

# ---- what the kernel says

STAT = "1 (a) b (c) S 0 1 1 0 -1 4194560 1000 0 10 0 250 125 0 0 20 0 3 0 100 1000000 200 18446744073709551615\n"
STATUS = ("Name:\tplayer\nUid:\t1000\t1000\t1000\t1000\nVmLck:\t      16 kB\nVmPin:\t       0 kB\nVmRSS:\t    3000 kB\n"
          "RssAnon:\t    1000 kB\nRssFile:\t    2000 kB\nRssShmem:\t       0 kB\nVmSwap:\t       8 kB\n")
MEMINFO = ("MemTotal:        8000000 kB\nMemFree:         4000000 kB\nAnonPages:       1000000 kB\nMlocked:  16 kB\n"
           "SwapTotal: 100 kB\nSwapFree: 90 kB\nSUnreclaim: 5 kB\nKernelStack: 6 kB\nPageTables: 7 kB\n")
CPU = "cpu  100 2 30 4000 5 0 6 0 0 0\ncpu0 100 2 30 4000 5 0 6 0 0 0\n"
PCM = ("state: RUNNING\nowner_pid   : 1234\ntrigger_time: 100.500000000\ntstamp      : 103.250000000\ndelay       : 480\n"
       "avail       : 100\nhw_ptr      : 144000\nappl_ptr    : 144480\n")
PARAMETERS = "access: RW_INTERLEAVED\nformat: S16_LE\nrate: 48000 (48000/1)\n"
POWER = ["active\n", "61234\n", "5321000\n"]
THERMAL = ["enabled\n", "65000\n", "60000\n", "passive\n"]
OWN = ["player\n", STATUS, "0.10 0.20 0.30 1/100 4711\n"]
USUAL = [STAT, STATUS, MEMINFO, CPU, "PCH\n", PCM, PARAMETERS, *POWER, *THERMAL, *OWN]


def thread(milliseconds):
    zeros = " 0" * 26
    return [f"1 (data-loop.0) S 1 1 1 0 -1 64 7 0 {milliseconds}{zeros} 1 20 1\n", f"{milliseconds}000000 5000000 9\n",
            f"some avg10=0.00 avg60=0.00 avg300=0.00 total={milliseconds}000\n", "4000000\n", "3000000\n", f"{milliseconds}\n"]


write("ProcFiles", {
    "usual": b"".join(map(long, USUAL)),
    "sampled": b"".join(map(long, [*USUAL, *thread(20), *USUAL, *thread(90)])),
    "closed": b"".join(map(long, [STAT, "Name:\tkthreadd\n", MEMINFO, "cpu\n", "USB\n", "closed\n", "closed\n", "suspended\n"])),
    "no-stamps": b"".join(map(long, ["1 (a", STATUS, "", CPU, "\n", "state: RUNNING\ndelay : -1\nhw_ptr : 9223372036854775807\n",
                                     "rate: 1\n", "error\n", "-1\n", "x\n", "disabled\n", "-1\n", "9999999999\n", "hot\n"])),
})

# ---- the trace reader's output

LIST = '[{"type": "interval", "signpost": "render"}, {"signpost": "mix"}]'
write("TraceReaderOutput", {
    "intervals": long('{"probes": ' + LIST + "}") + b"name render\nname a\\nb\n0 1500\n1 18446744073709551615\n0 7\nend\n",
    "problem": long(LIST) + b"problem no trace in \\\\tmp\nend\n",
    "cut-off": long("{") + b"name render\n0 15",
    "no-such-name": long('{"signpost": "x"}') + b"name a\n1 5\nend\n",
})

# ---- pods

BOOL, ID, INT, LONG, FLOAT, TEXT, FRACTION, ARRAY, STRUCT, OBJECT, CHOICE = 2, 3, 4, 5, 6, 8, 11, 13, 14, 15, 19


def pod(kind, body):
    return struct.pack("<II", len(body), kind) + body + b"\0" * (-len(body) % 8)


def structure(*parts):
    return pod(STRUCT, b"".join(parts))


def integer(number):
    return pod(INT, struct.pack("<i", number))


def wide(number):
    return pod(LONG, struct.pack("<q", number))


def real(number):
    return pod(FLOAT, struct.pack("<f", number))


def text(value):
    return pod(TEXT, value.encode() + b"\0")


def fraction(top, bottom):
    return pod(FRACTION, struct.pack("<II", top, bottom))


def thing(kind, parameter, properties):
    body = struct.pack("<II", kind, parameter)
    return pod(OBJECT, body + b"".join(struct.pack("<II", key, 0) + value for key, value in properties))


def choice(kind, child, *values):
    return pod(CHOICE, struct.pack("<IIII", kind, 0, 4, child) + b"".join(values))


def node(number, xruns, signal=1000, awake=1100, finish=3000, status=3):
    return structure(integer(number), text("node"), wide(900), wide(signal), wide(awake), wide(finish), integer(status),
                     fraction(1024, 48000), *([] if xruns is None else [integer(xruns)]))


# A node that finishes, does not wake, does not finish and finishes two cycles at once, in cycles of 10 ms.
def glitch(cycle, status, awake, finish):
    begin = 10_000_000 * cycle
    clock = structure(integer(0), integer(7), text("clock"), wide(begin), fraction(1, 48000), wide(480 * cycle), wide(480))
    ends = 20_000_000 if status < 3 else 500_000
    return thing(0x4000A, 0, [
        (0x10001, INFO), (0x10002, clock), (0x10003, node(36, None, begin, begin, begin + ends)),
        (0x20001, node(40, None, begin + 1000, begin + 2000, begin + 3000)),
        (0x20001, node(41, None, begin + 4000, begin + awake, begin + finish, status))])


INFO = structure(wide(12), real(0.25), real(0.25), real(0.25), integer(2))
CLOCK = structure(integer(0), integer(7), text("clock"), wide(1000), fraction(1, 48000), wide(4800), wide(480))
CYCLE = thing(0x4000A, 0, [(0x10001, INFO), (0x10002, CLOCK), (0x10003, node(36, None)), (0x20001, node(40, 3))])
CHANNELS = pod(ARRAY, struct.pack("<IIff", 4, FLOAT, 0.5, 0.25))
FORMAT = [(1, pod(ID, struct.pack("<I", 1))), (2, pod(ID, struct.pack("<I", 1)))]
write("PipeWirePod", {
    "profile": structure(CYCLE, CYCLE),
    "glitch": structure(*(glitch(*cycle) for cycle in [
        (1, 3, 5000, 6000), (2, 3, 5000, 6000), (3, 2, 5000, -9000), (4, 1, 0, -9000), (5, 3, -9000, 2_000_000),
        (6, 3, 5000, 6000)])),
    "no-clock": structure(thing(0x4000A, 0, [(0x10001, INFO), (0x10003, node(36, 1))])),
    "volume": thing(0x40002, 2, [(0x10004, pod(BOOL, struct.pack("<i", 1))), (0x10003, real(0.5)), (0x10008, CHANNELS)]),
    "format": thing(0x40003, 4, FORMAT + [(0x10001, pod(ID, struct.pack("<I", 0x11B))), (0x10003, integer(48000)),
                                          (0x10004, integer(2))]),
    "choices": thing(0x40003, 4, FORMAT + [
        (0x10001, choice(0, ID, struct.pack("<I", 0x11B))),
        (0x10003, choice(1, INT, struct.pack("<iii", 44100, 8000, 96000)))]),
    "no-value": thing(0x40003, 4, FORMAT + [(0x10003, choice(0, INT))]),
    "large-elements": thing(0x40002, 2, [(0x10008, pod(ARRAY, struct.pack("<II", 200, FLOAT) + b"\1" * 600))]),
})

# ---- frames on the socket

FRAMES = runpy.run_path(str(HERE / "make-RpcFrameReader-seeds.py"))["SEEDS"]
write("RpcFrameScanner", {name: bytes([bytes.fromhex(digits)[0]]) + bytes.fromhex(digits)[2:] for name, digits in FRAMES.items()})

# ---- calls on the bus


def entry(key, signature, value):
    return (struct.pack("<I", len(key)) + key.encode() + b"\0" + bytes([len(signature)]) + signature.encode() + b"\0", value)


def aligned(parts, to=8):
    data = b""
    for part in parts:
        data += b"\0" * (-len(data) % to) + part
    return data


def call(member, order, signature, body):
    return bytes([member, order]) + short(signature) + body


def dictionary(*entries):
    content = b""
    for head, value in entries:
        content += b"\0" * (-len(content) % 8) + head
        content += b"\0" * (-len(content) % (8 if len(value) >= 8 else 4)) + value
    return struct.pack("<II", len(content), 0) + content


MAP = dictionary(entry("volume", "d", struct.pack("<d", 0.5)), entry("number", "i", struct.pack("<i", -3)),
                 entry("at", "(d)", struct.pack("<d", 1763634000.5)), entry("name", "s", struct.pack("<I", 3) + b"abc\0"),
                 entry("list", "an", struct.pack("<Ihh", 4, 1, 2)))
REST = struct.pack("<IHHI4xqq", 4, 1, 0, 16, 7, 8)
write("DbusArguments", {
    "create": call(0, 0, "x", struct.pack("<q", 77)),
    "create-big": call(0, 1, "x", struct.pack(">q", 77)),
    "type": call(1, 0, "qx", struct.pack("<H6xq", 7, 77)),
    "configuration": call(2, 0, "a{sv}x", aligned([MAP, struct.pack("<q", 77)])),
    "message": call(3, 0, "a{sv}uqax", aligned([MAP, REST], 4)),
    "wrong-type": call(0, 0, "s", struct.pack("<I", 1) + b"a\0"),
    "nothing": call(4, 0, "", b""),
    "too-many": call(4, 0, "vas", b"\1i\0\0\5\0\0\0" + struct.pack("<I", 0)),
    "nested": call(2, 0, "a{sv}x", dictionary(entry("a", "a{sv}", dictionary(entry("b", "v", b"\1y\0\5")))) + b"\0" * 16),
    "cut-off": call(2, 0, "a{sv}x", MAP[:30]),
})

# ---- a client of the library: 0 session, 1 change, 2 destroy, 3 request, 4 send, 5 connect, 6 and 7 sent, 8 bytes, 9 disconnect

ANSWER = b"\x94\x01"
CREATE = b"\x00\x4d"
START = b"\x01\x00\x02\x05\x00"
write("ClientAnswers", {
    "answers": b"\x05" + CREATE + b"\x03\x00\x03\x03" + b"\x07" * 3 + b"\x08" + short(
        ANSWER + b"\x01\xc0\xc3" + ANSWER + b"\x02\xc0\x93\x01\x02\xd3\x80\0\0\0\0\0\0\0") + b"\x09",
    "started": CREATE + START + b"\x05" + b"\x07" * 4 + b"\x04\x00\x07\x00" + b"\x02\x01" + b"\x07" * 4 + b"\x08" + short(
        ANSWER + b"\x03\xc0\xc3" + ANSWER + b"\x01\xc0\xc3" + ANSWER + b"\x02\xc0\xc3"),
    "refused": b"\x05\x03\x02\x07\x07\x08" + short(
        ANSWER + b"\x01\x83\xa6domain\xa1d\xa4code\x03\xa7message\xa4full\xc0") + b"\x03\x01\x09\x05\x07",
    "validity": b"\x05\x03\x02\x07\x07\x08" + short(ANSWER + b"\x01\xc0\x82\xaareporterID\x4d\xabserviceType\x07"),
    "nonsense": b"\x05\x03\x00\x07\x08" + short(b"HTTP/1.1 400"),
    "lost": CREATE + START + b"\x05\x06\x10\x09\x05\x07\x07\x09\x01\x00\x03\x00\x01\x05\x07\x07",
})

# ---- users of the service core: 0 connect, 1 disconnect, 2 run, 3 wait, 4 jump, 5 reporting on or off, 6 and more request

METHODS = ["create", "type", "name", "configure", "start", "send", "stop", "destroy", "valid", "reporters", "kill", "observe",
           "sessions", "open", "next", "accounts"]
RUN = b"\x02"


def connect(user):
    return bytes([0, user])


def ask(client, method, arguments=b""):
    return bytes([6, client, METHODS.index(method)]) + arguments + b"\x01"


def message(key, value, category, kind, identifiers):
    listed = b"\x04" if identifiers is None else bytes([len(identifiers), *identifiers])
    return bytes([1, key]) + value + bytes([category, 1, kind]) + listed


HALF = b"\x00" + struct.pack("<d", 0.5)
write("Sessions", {
    "one": b"\0\0" + connect(0) + ask(0, "create", b"\1") + ask(0, "type", b"\7\1") + ask(0, "start", b"\1") + RUN
           + ask(0, "send", message(0, HALF, 14, 0, [1])) * 2 + b"\x03\x20" + ask(0, "send", message(7, b"\3\0", 5, 1, [1]))
           + ask(0, "stop", b"\1") + ask(0, "destroy", b"\1") + RUN + ask(0, "reporters"),
    "users": b"\0\0" + connect(2) + connect(3) + connect(1) + b"".join(
        ask(client, "create", b"\1") + ask(client, "start", b"\1") for client in range(3))
        + ask(0, "send", message(0, HALF, 4, 3, None)) + ask(2, "send", message(1, b"\2\5", 4, 3, None)) + RUN
        + ask(1, "sessions", b"\0") + ask(2, "sessions", b"\0") + ask(2, "accounts") + b"\x01\x00" + RUN + ask(0, "valid", b"\1"),
    "single": b"\1\0" + connect(2) + ask(0, "send", message(9, b"\3\0", 4, 1, None)) + RUN + b"\x03\x40" + RUN
              + ask(0, "send", message(9, b"\3\0", 7, 6, None)) + b"\x03\xff" + RUN,
    "watching": b"\0\0" + connect(0) + connect(1) + ask(0, "observe") + ask(0, "open", b"\4\4\4") + ask(0, "next")
                + ask(1, "create", b"\2") + ask(1, "start", b"\2") + ask(1, "send", message(2, b"\2\x10", 1, 1, [2])) + RUN
                + ask(0, "next") + b"\x03\x10" + RUN + b"\x01\x00" + RUN,
    "internal": b"\1\0" + connect(0) + ask(0, "create", b"\3") + ask(0, "type", b"\x0b\3") + ask(0, "start", b"\3") + RUN
                + ask(0, "send", message(4, b"\2\5", 11, 7, [3])) + ask(0, "send", message(4, b"\1\5", 1, 19, [3])) + RUN,
    "full": b"\0\1" + connect(2) + ask(0, "create", b"\1") + ask(0, "start", b"\1")
            + ask(0, "configure", b"\1\x0f\2\xff\1") * 3 + ask(0, "send", message(22, b"\2\xff", 4, 1, [1])) * 9
            + b"\4\0\x80" + ask(0, "stop", b"\1") + RUN,
    "journal": b"\2\0" + connect(2) + ask(0, "create", b"\1") + ask(0, "start", b"\1") + ask(0, "send", message(0, HALF, 14, 0, [1]))
               + ask(0, "create", b"\2") + ask(0, "send", message(9, b"\3\0", 4, 1, None)) + RUN + ask(0, "destroy", b"\1") + RUN
               + connect(3) + ask(1, "send", message(9, b"\3\0", 4, 1, None)) + RUN + b"\x03\xff" + b"\x01\x00" + RUN,
    "disabled": b"\0\0" + connect(3) + ask(0, "create", b"\1") + b"\5\1" + ask(0, "start", b"\1") + ask(0, "kill")
                + ask(0, "name", b"\1") + RUN + b"\5\0" + ask(0, "name", b"\1") + RUN,
    "refused": b"\0\0" + connect(2) + ask(0, "observe") + ask(0, "reporters") + ask(0, "create", b"\1") + ask(0, "name", b"\1"),
})

# ---- damaged stores


def database(*statements):
    """A file with small pages, so that it is short."""
    with tempfile.TemporaryDirectory() as directory:
        path = pathlib.Path(directory) / "store.db"
        with sqlite3.connect(path) as connection:
            for statement in ("PRAGMA page_size = 512", *statements):
                connection.execute(statement)
        connection.close()
        return path.read_bytes()


VERSION_1 = (
    "CREATE TABLE analytics_row (id INTEGER PRIMARY KEY, recorded_at REAL, name_set INTEGER, payload TEXT)",
    "CREATE TABLE analytics_name (name_set INTEGER, position INTEGER, name TEXT, PRIMARY KEY (name_set, position)) WITHOUT ROWID",
    "CREATE TABLE metric (id INTEGER PRIMARY KEY, posted_at REAL, identifier INTEGER, record BLOB)",
    "CREATE TABLE power_event (id INTEGER PRIMARY KEY, recorded_at REAL, event_group INTEGER, name TEXT, payload TEXT)",
    "CREATE TABLE rtc_session (id INTEGER PRIMARY KEY, started_at REAL, session_info TEXT, user_info TEXT)",
    "CREATE TABLE rtc_message (id INTEGER PRIMARY KEY, sent_at REAL, rtc_session INTEGER, category INTEGER, type INTEGER, payload TEXT)",
    "INSERT INTO analytics_name VALUES (1, 0, 'first')",
    "INSERT INTO analytics_row VALUES (10, 1.5, 1, '{\"n\":1}')",
    "INSERT INTO rtc_message VALUES (10, 1.5, 5, 4, 1, '{\"m\":1}')",
    "PRAGMA user_version = 1",
)


def patch(is_log, place, data):
    return bytes([is_log]) + struct.pack("<I", place) + b"\2" + short(data)


write("StoreFile", {
    "whole": b"\0",
    "header": b"\0" + patch(0, 16, b"\2\0"),
    "schema-cookie": b"\0" + patch(0, 40, b"\0\0\0\7") + patch(0, 60, b"\0\0\0\1"),
    "newer": b"\0" + patch(0, 60, b"\0\0\0\x63") + b"\1" + struct.pack("<I", 0) + b"\0",
    "page": b"\0" + patch(0, 8192, b"\xff" * 16),
    "log": b"\0" + patch(1, 40, b"\xff" * 4),
    "log-cut-off": b"\0" + b"\1" + struct.pack("<I", 9000) + b"\0",
    "cut-off": b"\0" + b"\0" + struct.pack("<I", 20000) + b"\0",
    "hole": b"\0" + b"\0" + struct.pack("<I", 16384) + b"\1",
    "no-database": b"\1" + b"x" * 600,
    "version-1": b"\1" + database(*VERSION_1),
    "other": b"\1" + database("CREATE TABLE t (a)", "INSERT INTO t VALUES (1)", "PRAGMA user_version = 2"),
})

# ---- a graph of PipeWire: an object, what happens to it (0 node, 1 description, 2 volume, 3 format, 4 client, 5 link, 6 complete,
# 7 removed, 8 overload, 9 time, 10 resend or restart, 11 clear or a jump of the clock), and its values

KEYS = ["media.class", "media.role", "node.name", "node.description", "node.nick", "node.driver", "application.id",
        "application.process.binary", "application.name", "client.id", "link.output.node", "link.input.node"]
TEXTS = ["Stream/Output/Audio", "", "Audio/Sink", "Audio/Source/Virtual", "true", "1", "2", "Music"]


def properties(**values):
    data = bytes([len(values)])
    for key, value in values.items():
        data += bytes([KEYS.index(key.replace("_", "."))])
        data += bytes([TEXTS.index(value)]) if value in TEXTS else b"\x08" + short(value)
    return data


STREAM = b"\1\0" + properties(media_class="Stream/Output/Audio", client_id="2", media_role="Music")
DEVICE = b"\3\0" + properties(media_class="Audio/Sink", node_driver="true", node_name="speaker", node_description="Speaker \xe4\n")
PLAYER = b"\2\4" + properties(application_name="player")
RUNNING = b"\1\1\1\0"
VOLUME = b"\1\2\1\0" + struct.pack("<f", 0.25) + b"\0"
LOUDER = b"\1\2\0\1\1\2" + struct.pack("<ff", 3.0, 0.1)
AUDIO = b"\1\3" + struct.pack("<I", 48000) + b"\2"
LINK = b"\4\5\1\3"
COMPLETE = b"\0\6"


def passes(time):
    return b"\0\x09" + bytes([time])


write("PipeWireGraph", {
    "playing": STREAM + DEVICE + PLAYER + b"\3\1\1\0" + LINK + VOLUME + AUDIO + RUNNING + COMPLETE + passes(30) + LOUDER + passes(5)
               + b"\1\1\0\0" + passes(200) + b"\1\7",
    "restarted": COMPLETE + STREAM + RUNNING + passes(20) + b"\0\x0a\1" + passes(20) + b"\0\x0a\0" + passes(1) + b"\0\x0b\0",
    "overloads": COMPLETE + STREAM + RUNNING + b"\1\x08\7\7" * 3 + passes(40) + b"\1\x08\7\7" + b"\0\x0b\1\x85" + b"\1\7",
    "long-names": COMPLETE + b"\3\0" + b"\2\0\2\3\x09" + short("\xc3\xa9".encode() * 9) + STREAM + b"\2\4\1\x06\x09" + short(b"\xff" * 5)
                  + LINK + b"\4\7\3\7" + passes(60),
})

# ---- records of the journal, and damage to it

CONNECTED, REQUEST, DISCONNECTED, SINGLE_ENDED = range(4)


def record(kind, client, user, data, is_written=True):
    return bytes([kind, 1, 2, client, user]) + data + bytes([0 if is_written else 1])


def request(client, user, method, arguments=b"", is_written=True):
    return record(REQUEST, client, user, bytes([1, METHODS.index(method)]) + arguments + b"\1", is_written)


def journal(*records, damage=b""):
    return bytes([len(records)]) + b"".join(records) + damage


PROCESS = record(CONNECTED, 0, 2, b"\1\x4d" + short("player"))
OPEN = [PROCESS, request(1, 2, "create", b"\7"), request(1, 2, "type", b"\7\7"),
        request(1, 2, "configure", b"\1" + short("a") + b"\1\7"), request(1, 2, "start", b"\7"),
        request(1, 2, "send", b"\1" + short("volume") + b"\1\4\1\3", False)]
write("JournalRecovery", {
    "open": journal(*OPEN),
    "ended": journal(*OPEN, request(1, 2, "stop", b"\7"), request(1, 2, "destroy", b"\7"), record(DISCONNECTED, 1, 2, short(""))),
    "others": journal(*OPEN, request(1, 2, "kill"), request(1, 2, "open", b"\1\1\1"), request(1, 2, "next"),
                      record(REQUEST, 1, 2, b"\0" + short("no frame")), record(SINGLE_ENDED, 0, 2, short(""))),
    "any-time": journal(PROCESS, bytes([REQUEST, 0]) + struct.pack("<d", -1e300) + b"\1\2\1\0\7\1\0",
                        bytes([REQUEST, 0]) + struct.pack("<d", 1e300) + b"\1\2\1\4\7\1\0"),
    "removed": journal(*OPEN, damage=b"\0\0\0\0"),
    "cut-off": journal(*OPEN, damage=b"\0\x80\0\1"),
    "missing-bytes": journal(*OPEN, damage=b"\0\x80\0\2\x10"),
    "damaged": journal(*OPEN, damage=b"\0\x08\0\3" + short(bytes(60))),
    "added": journal(*OPEN, damage=b"\0\x80\0\4" + short("added")),
    "head-alone": journal(*[request(1, 2, "create", b"\7")] * 14, damage=b"\1\x14\0\1"),  # in the second segment
})

# ---- what twctl shows: an answer of the daemon, or a request.json


def packed(value):
    """MessagePack of texts, small numbers, doubles, lists and dictionaries."""
    if isinstance(value, bool):
        return b"\xc3" if value else b"\xc2"
    if isinstance(value, int):
        return b"\xd3" + struct.pack(">q", value) if value > 127 or value < 0 else bytes([value])
    if isinstance(value, float):
        return b"\xcb" + struct.pack(">d", value)
    if isinstance(value, str):
        return b"\xd9" + short(value)
    if isinstance(value, list):
        return bytes([0x90 | len(value)]) + b"".join(map(packed, value))
    return bytes([0x80 | len(value)]) + b"".join(packed(key) + packed(held) for key, held in value.items())


write("ToolTexts", {
    "message": b"\0" + packed({"time": 1763633880.5, "reporterID": 77, "serviceType": 7, "category": 4, "type": 1, "redundant": True,
                               "payload": {"a\nb": "\u202e\x1b[2J", "n": [1, 2.5]}}),
    "sessions": b"\0" + packed([{"reporterID": 1, "messages": 100, "redundant": 7, "processName": "p\u00e4", "processIdentifier": 7,
                                 "seconds": 90000.5, "application": "a", "serviceName": "s"}, {"reporterID": 2}]),
    "accounts": b"\0" + packed([{"user": 0, "trusted": True, "linesHeldBack": 3,
                                 "resources": [{"name": "keptBytes", "held": 4096, "share": 1 << 40, "refused": 1}]}]),
    "sinks": b"\0" + packed([{"name": "store", "waiting": 3, "dropped": 1, "hangs": 12}]),
    "capture": b'\1{"requestedAt":"2026-11-20T10:18:00Z","signature":{"domain":"d","type":"t\\n","subType":"s","detectedProcess":"p"},'
               b'"duration":0.5,"payload":{"k":[1,null]},"problems":{"graph.json":"no \\u001b output"}}',
    "draft": b'\1{"title":"t","component":{"name":"n","version":"1"},"displayReason":"r"}',
    "no-json": b"\1{",
})

# ---- values of clients

write("ValueTexts", {
    "texts": packed({"a": "plain", "b\n": "\"\\\b\f\r\t\x7f\u2028\u061c", "c": "\U0001f600 12.5e3", "": " -7x"}),
    "numbers": packed({"a": 1, "b": -1, "c": 0.1, "d": 1e22, "e": 1763633880.123456, "f": 1e-5, "g": 0.0, "h": 1 << 62, "i": True}),
    "not-finite": packed({"a": float("nan"), "b": [float("inf"), {"c": float("-inf")}]}),
    "nested": packed({"a": {"b": [[], {}, [1.5, {"c": "d"}]]}, "b": 7}),
    "dates": b"\x82\xa1a\xd6\xff" + struct.pack(">I", 1763633880) + b"\xa1b\xd7\xff" + struct.pack(">Q", 999999999 << 34 | 1),
    "reserved": packed({"session.id": 1, "event.name": "x", "b": {"a": 2}, "a": 1, "c": 3}),
    "no-map": packed([1, "x", 2.5]),
})
