# SPDX-License-Identifier: Apache-2.0
"""Runs the built daemon with directories of its own, and reads its store."""

import contextlib
import json
import os
import pathlib
import signal
import socket
import sqlite3
import subprocess
import sys
import tempfile
import time
import unittest

SOURCE = pathlib.Path(__file__).resolve().parents[2]
PROGRAMS = pathlib.Path(os.environ.get("TONEWERK_PROGRAMS", SOURCE / "build/dev/src"))
sys.path.insert(0, str(SOURCE / "python"))

PATIENCE = 60  # seconds, which only a failing test waits


class DaemonTestCase(unittest.TestCase):
    """Has a place for a daemon, which each test starts when it wants it."""

    def setUp(self):
        scratch = tempfile.TemporaryDirectory()
        self.addCleanup(scratch.cleanup)
        self.root = pathlib.Path(scratch.name)
        self.environment = dict(os.environ)
        for name in ("RUNTIME", "STATE", "LOGS", "CONFIGURATION"):
            (self.root / name.lower()).mkdir()
            self.environment[f"{name}_DIRECTORY"] = str(self.root / name.lower())
        self.socket_path = str(self.root / "runtime/reporting.sock")
        self.environment["TONEWERK_REPORTING_SOCKET"] = self.socket_path
        self.daemon = None
        self.addCleanup(self.kill_daemon)

    def start_daemon(self):
        self.daemon = subprocess.Popen(
            [PROGRAMS / "twreportingd"], env=self.environment, stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL
        )
        self.wait_until(self.is_listening)

    def is_listening(self):
        self.assertIsNone(self.daemon.poll(), "the daemon has ended")
        with socket.socket(socket.AF_UNIX) as probe:
            return probe.connect_ex(self.socket_path) == 0

    def kill_daemon(self):
        if self.daemon is not None:
            self.daemon.kill()
            self.daemon.wait()
            self.daemon = None

    def end_daemon(self):
        """Ends the daemon in order: then everything is in the store."""
        self.daemon.send_signal(signal.SIGTERM)
        self.daemon.wait(PATIENCE)
        self.daemon = None

    def wait_until(self, condition):
        until = time.monotonic() + PATIENCE
        while not condition():
            self.assertLess(time.monotonic(), until, "waited in vain")
            time.sleep(0.02)

    def rows(self, query):
        with contextlib.closing(sqlite3.connect(self.root / "state/reports.db")) as store:
            store.row_factory = sqlite3.Row
            return [dict(row) for row in store.execute(query)]

    def payloads(self, category, kind):
        """Returns the messages of the client."""
        rows = self.rows(f"SELECT payload FROM event WHERE category = '{category}' AND type = '{kind}' AND source = 'client' ORDER BY id")
        return [json.loads(row["payload"]) for row in rows]
