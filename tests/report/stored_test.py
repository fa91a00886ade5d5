# SPDX-License-Identifier: Apache-2.0
"""Compares the numbers of `twctl report` with those of the store's views, on stores that the daemon's own code has made."""

import json
import os
import pathlib
import sqlite3
import subprocess
import tempfile
import time
import unittest

SOURCE = pathlib.Path(__file__).resolve().parents[2]
PROGRAMS = pathlib.Path(os.environ.get("TONEWERK_PROGRAMS", SOURCE / "build/dev/src"))


class StoredTest(unittest.TestCase):
    def setUp(self):
        scratch = tempfile.TemporaryDirectory()
        self.addCleanup(scratch.cleanup)
        self.state = pathlib.Path(scratch.name)

    def twctl(self, *arguments, zone="UTC"):
        environment = {"PATH": os.environ["PATH"], "STATE_DIRECTORY": str(self.state), "CONFIGURATION_DIRECTORY": str(self.state / "none"), "TZ": zone,
                       "TONEWERK_REPORTING_SOCKET": str(self.state / "none.sock"), "LSAN_OPTIONS": os.environ.get("LSAN_OPTIONS", "")}
        made = subprocess.run([PROGRAMS / "twctl", *arguments], env=environment, capture_output=True, text=True, check=False)
        self.assertEqual(made.returncode, 0, made.stderr)
        return made.stdout

    def store(self, recording):
        (self.state / "reports.db").unlink(missing_ok=True)
        self.twctl("replay", "--offline", SOURCE / "examples" / recording, "-o", self.state / "reports.db")
        database = sqlite3.connect(self.state / "reports.db")
        self.addCleanup(database.close)
        return database

    def report(self, *options, **more):
        return json.loads(self.twctl("report", "--json", *options, **more))

    def test_has_the_numbers_of_the_views(self):
        for recording in ("music-session.jsonl", "every-sink.jsonl", "no-session.jsonl"):
            with self.subTest(recording=recording):
                views = self.store(recording)
                report = self.report(zone="Europe/Berlin")
                totals = report["totals"]
                for key, sql in (("sessions", "SELECT count(*) FROM session"), ("messages", "SELECT total(messages) FROM session"),
                                 ("playSeconds", "SELECT total(seconds) FROM volume_stretch"), ("inputSeconds", "SELECT total(seconds) FROM input_stretch"),
                                 ("overloads", "SELECT count(*) FROM issue WHERE kind = 'overload'"), ("otherIssues", "SELECT count(*) FROM issue WHERE kind IS NOT 'overload'")):
                    self.assertAlmostEqual(totals[key], views.execute(sql).fetchone()[0], delta=0.001, msg=key)
                self.assertEqual(sum(number for _, _, number in report["issues"]["overTime"]), totals["overloads"])
                self.assertEqual(report["timeline"]["leftOut"]["misplaced"], 0)
                formats = views.execute("SELECT device, sample_rate, channels, format, sum(seconds) FROM volume_stretch WHERE coalesce(sample_rate, channels, format) IS NOT NULL GROUP BY 1, 2, 3, 4 ORDER BY 5 DESC").fetchall()
                self.assertEqual([tuple(row[:4]) for row in report["playing"]["formats"]["rows"]], [row[:4] for row in formats])

    def test_the_example_of_music_has_stretches_and_a_format(self):
        self.store("music-session.jsonl")
        report = self.report()
        self.assertGreater(report["totals"]["playSeconds"], 0)
        self.assertEqual(report["playing"]["formats"]["rows"][0][1:4], [48000, 2, "lpcm"])

    # What an earlier version stored has no times, only that of its recording.
    def test_a_range_has_no_stretch_that_was_recorded_before_it(self):
        views = self.store("music-session.jsonl")
        views.execute("UPDATE analytics_row SET began_at = NULL, ended_at = NULL")
        views.commit()
        (newest,) = views.execute("SELECT max(at) FROM event").fetchone()
        for seconds, all_of_it in ((-3600, 1), (60, 0)):
            since = time.strftime("%Y-%m-%dT%H:%M:%SZ", time.gmtime(newest + seconds))
            expected = all_of_it * views.execute("SELECT total(seconds) FROM volume_stretch").fetchone()[0]
            self.assertAlmostEqual(self.report("--since", since)["totals"]["playSeconds"], expected, delta=0.001)


if __name__ == "__main__":
    unittest.main()
