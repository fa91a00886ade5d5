# SPDX-License-Identifier: Apache-2.0
"""Checks that the commands of the guide find the files that they use."""

import re
import signal
import socket
import subprocess
import sys
import unittest

from programs import SOURCE

PAGES = [SOURCE / "README.md", *sorted((SOURCE / "docs").rglob("*.md")), *sorted((SOURCE / "docs/man").iterdir())]


def blocks(page, language):
    return re.findall(rf"^```{language}\n(.*?)^```", page.read_text(), re.DOTALL | re.MULTILINE)


class GuideTest(unittest.TestCase):
    def test_sql_asks_twctl_where_the_store_is(self):
        count = 0
        for page in PAGES:
            for command in re.findall(r"^ *sqlite3 .*", page.read_text(), re.MULTILINE):
                count += 1
                with self.subTest(page=page.name, command=command):
                    self.assertIn("$(twctl paths store)", command)
        self.assertGreater(count, 8)

    def test_programs_ask_twctl_where_the_socket_is(self):
        programs = [block for page in PAGES for block in blocks(page, "python") if "AF_UNIX" in block]
        self.assertTrue(programs)
        for program in programs:
            self.assertIn('["twctl", "paths", "socket"]', program)
            self.assertNotRegex(program, r"connect\(\"")

    def test_the_receiver_says_when_it_listens(self):
        (program,) = [block for block in blocks(SOURCE / "docs/guide/forward.md", "python") if "receiver.py" in block]
        with socket.socket() as probe:
            probe.bind(("localhost", 0))
            port = probe.getsockname()[1]
        with subprocess.Popen(
            [sys.executable, "-c", program.replace("4318", str(port))], stdout=subprocess.PIPE, text=True
        ) as receiver:
            try:
                self.assertEqual(receiver.stdout.readline(), f"listening on http://localhost:{port}\n")
                socket.create_connection(("localhost", port)).close()
            finally:
                receiver.send_signal(signal.SIGKILL)


if __name__ == "__main__":
    unittest.main()
