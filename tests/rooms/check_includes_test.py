# SPDX-License-Identifier: Apache-2.0
"""Tests scripts/check-includes with copies of src/ that each contain one error."""

import pathlib
import shutil
import subprocess
import tempfile
import unittest

ROOT = pathlib.Path(__file__).resolve().parents[2]


class CheckIncludesTest(unittest.TestCase):
    def setUp(self):
        self.directory = tempfile.TemporaryDirectory()
        self.addCleanup(self.directory.cleanup)
        self.copy = pathlib.Path(self.directory.name)
        shutil.copytree(ROOT / "src", self.copy / "src")
        (self.copy / "docs").mkdir()
        shutil.copy(ROOT / "docs/architecture.md", self.copy / "docs")

    def check(self):
        done = subprocess.run([ROOT / "scripts/check-includes", self.copy], capture_output=True, text=True)
        return done.returncode, done.stdout + done.stderr

    def plant(self, file, line):
        path = self.copy / "src" / file
        path.write_text(line + "\n" + (path.read_text() if path.exists() else ""))

    def refuses(self, problem):
        status, output = self.check()
        self.assertIn(problem, output)
        self.assertNotEqual(status, 0)

    def test_accepts_the_present_sources(self):
        self.assertEqual(self.check(), (0, ""))

    def test_refuses_a_room_above(self):
        self.plant("session/LocalTime.cpp", '#include "service/TWReportingService.h"')
        self.refuses("src/session/LocalTime.cpp:1: session may not include service/TWReportingService.h")

    def test_refuses_a_neighbour_that_the_table_does_not_name(self):
        self.plant("platform/linux/store/StoreQueue.cpp", '#include "platform/linux/otlp/OtlpExporter.h"')
        self.refuses("platform/linux/store may not include platform/linux/otlp/OtlpExporter.h")

    def test_refuses_the_daemon_in_the_tool_the_client_and_the_bridge(self):
        for room in ("tools/twctl/commands/ListCommand.cpp", "client/ClientEngine.cpp",
                     "bridges/pipewire/sessions/StreamReporter.cpp"):
            for above in ("service", "session", "monitor", "driver", "workers"):
                self.plant(room, f'#include "{above}/Anything.h"')
                self.refuses(f"may not include {above}/Anything.h")

    def test_refuses_a_library_of_another_room(self):
        self.plant("platform/linux/json/JsonTree.cpp", "#include <sqlite3.h>")
        self.refuses("platform/linux/json may not use sqlite: <sqlite3.h>")

    def test_refuses_the_operating_system_in_the_core(self):
        self.plant("values/Value.cpp", "#include <unistd.h>")
        self.refuses("values has the standard library alone: <unistd.h>")

    def test_refuses_a_room_that_the_table_does_not_name(self):
        (self.copy / "src/attic").mkdir()
        self.plant("attic/Old.cpp", "")
        self.refuses("src/attic/Old.cpp: its room attic is not in src/rooms.txt")

    def test_refuses_an_unused_dependency(self):
        table = self.copy / "src/rooms.txt"
        table.write_text(table.read_text().replace("\nprotocol: values\n", "\nprotocol: values\nsession2: values\n"))
        self.refuses("src/rooms.txt: there is no room session2")
        self.refuses("src/rooms.txt: session2 does not use values")

    def test_refuses_an_upward_dependency(self):
        table = self.copy / "src/rooms.txt"
        table.write_text(table.read_text().replace("\nprotocol: values\n", "\nprotocol: values session\n"))
        self.refuses("src/rooms.txt: protocol names session, which does not stand above it in the table")

    def test_refuses_a_different_table_in_the_architecture(self):
        page = self.copy / "docs/architecture.md"
        page.write_text(page.read_text().replace("\nprotocol: values\n", "\nprotocol: values session\n"))
        self.refuses("docs/architecture.md: its table of rooms is not that of src/rooms.txt")


if __name__ == "__main__":
    unittest.main()
