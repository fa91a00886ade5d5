# SPDX-License-Identifier: Apache-2.0
"""Runs the commands of docs/guide/glitches.md as they stand, with twctl on a small store, and compares what the pages show with what
is printed."""

import json
import os
import pathlib
import re
import shutil
import sqlite3
import sys
import tempfile
import unittest

from programs import PROGRAMS, SOURCE, run

sys.path.insert(0, str(SOURCE / "tests/support/reports"))
from store_views import schema, schema_version  # pylint: disable=wrong-import-position

PAGE = SOURCE / "docs/guide/glitches.md"
OTHERS = ("status", "sandbox")  # these ask for more than a store
BEGIN = 1795132800.0  # 2026-11-20 00:00 UTC


def cycle(begin, effects, player, finished):
    nodes = [{"name": "effects", "process": "effects", "signal": 5, "awake": 15, "finish": effects},
             {"name": "player", "process": "player", "signal": effects, "awake": player, "finish": finished}]
    return {"begin": begin, "period": 5333.3, "nodes": nodes}


CYCLES = json.dumps([cycle(-5333.3, 2100, 2130, 2900), cycle(0, 8400, 8430, 9600)])
PLAYER = ("longformaudio", "org.example.Player")
GLITCHES = [
    (11, BEGIN + 60, BEGIN + 60, "1795132860000-7", 41, *PLAYER, "waiting for another", "late", 0.95, "org.example.Effects", "effects", 930, "effects",
     "player", "speaker", "effects > player > speaker", 3.0667, 5.3333, 256, 48000, 5.3333, 1, "effects took 8.4 ms of 5.3 ms.", CYCLES),
    (13, BEGIN + 130, BEGIN + 130, "1795132930000-9", 41, *PLAYER, "not scheduled", "not scheduled", 0.8, None, "backup", 990, None,
     "player", "speaker", None, 1.4, 5.3333, 256, 48000, 5.3333, 4, "player was ready at 0.0 ms and woke at 6.7 ms.", None),
]


def blocks(page, language):
    found = re.findall(r"^```(\w*)\n(.*?)^```$", page.read_text(), re.DOTALL | re.MULTILINE)
    return [text for name, text in found if name == language]


class GlitchesTest(unittest.TestCase):
    def setUp(self):
        scratch = tempfile.TemporaryDirectory()
        self.addCleanup(scratch.cleanup)
        self.scratch = pathlib.Path(scratch.name)
        with sqlite3.connect(self.scratch / "reports.db") as store:
            store.executescript(schema() + f"PRAGMA user_version = {schema_version()};")
            store.execute(f"INSERT INTO session VALUES (41, 7, 'longformaudio', 'org.example.Player', 'player', 1000, {BEGIN}, {BEGIN + 600}, 'stopped', 9, 9, 0, 600, 5)")
            for row in GLITCHES:
                store.execute(f"INSERT INTO glitch VALUES ({', '.join('?' * len(row))})", row)
                store.execute("INSERT INTO issue SELECT id, at, session, service, application, 'overload', NULL, NULL, quantum, 7 FROM glitch WHERE id = ?", row[:1])
        store.close()

    def sh(self, command):
        environment = {"PATH": f"{PROGRAMS}:{os.environ['PATH']}", "STATE_DIRECTORY": str(self.scratch), "LC_ALL": "C.UTF-8", "TZ": "UTC", "LSAN_OPTIONS": os.environ.get("LSAN_OPTIONS", ""),
                       "TONEWERK_REPORTING_SOCKET": str(self.scratch / "none.sock")}
        return run(["sh", "-c", command], cwd=self.scratch, env=environment)

    def test_the_commands_work(self):
        count = 0
        for command in "".join(blocks(PAGE, "sh")).splitlines():
            words = command.split()
            if words[0] != "twctl" or words[1] in OTHERS or ("| jq" in command and not shutil.which("jq")):
                continue
            count += 1
            with self.subTest(command=command):
                answer = self.sh(command)
                self.assertEqual((answer.returncode, answer.stderr), (0, ""))
        self.assertGreater(count, 10)

    def test_the_pages_show_what_is_printed(self):
        known = {"id": self.sh("twctl glitches").stdout, "the": self.sh("twctl glitches --why 11").stdout}
        for page in (PAGE, SOURCE / "docs/twctl.md"):
            shown = [block for block in blocks(page, "") if re.match(r"id  at +cause|the cycle ", block)]
            self.assertEqual(len(shown), 2, page.name)
            for block in shown:
                with self.subTest(page=page.name):
                    self.assertIn(block, known[block.split(maxsplit=1)[0]])


if __name__ == "__main__":
    unittest.main()
