# SPDX-License-Identifier: Apache-2.0
"""Holds the page on troubles and `twctl doctor` together: each row of the page is found, and each finding has a row."""

import json
import re
import unittest

from programs import PROGRAMS, SOURCE, run

PAGE = SOURCE / "docs/guide/troubleshoot.md"

# Tables that explain words, and no troubles. Their first headings.
EXPLANATIONS = {"category", "sink"}


def findings():
    answer = run([PROGRAMS / "twctl", "doctor", "--list", "--json"])
    if answer.returncode != 0:
        raise AssertionError(answer.stderr)
    return [json.loads(line) for line in answer.stdout.splitlines()]


def tables():
    """Returns the cells of each row of each table of the page, without the line below the heading."""
    found = []
    for text in re.findall(r"^(?:\|.*\n)+", PAGE.read_text(), re.MULTILINE):
        rows = [[cell.strip() for cell in re.split(r"(?<!\\)\|", line)[1:-1]] for line in text.splitlines()]
        found.append([rows[0], *rows[2:]])
    return found


class TroubleshootTest(unittest.TestCase):
    def test_each_row_of_the_page_is_a_finding_and_each_finding_has_a_row(self):
        known = {row["finding"]: row for row in findings()}
        self.assertGreater(len(known), 30)
        described = []
        for heading, *rows in tables():
            if heading[0] in EXPLANATIONS:
                continue
            self.assertEqual(heading, ["finding", "what is wrong", "why it matters", "remedy"])
            for name, cause, why, remedy in rows:
                with self.subTest(finding=name):
                    self.assertIn(name.strip("`"), known)
                    kind = known[name.strip("`")]
                    described.append(kind["finding"])
                    self.assertEqual((cause, why), (kind["cause"], kind["why"]))
                    self.assertIn(kind["remedy"], remedy)
        self.assertEqual(sorted(described), sorted(known))

    def test_every_finding_is_added_by_a_check(self):
        room = SOURCE / "src/tools/twctl/health"
        checks = "\n".join(path.read_text() for path in sorted(room.glob("*Checks.cpp")))
        for row in findings():
            with self.subTest(finding=row["finding"]):
                self.assertIn(f'"{row["finding"]}"', checks)

    def test_every_finding_has_a_test_in_which_it_is_found(self):
        room = SOURCE / "tests/tools/twctl/health"
        tests = "\n".join(path.read_text() for path in sorted(room.glob("*Checks_test.cpp")))
        for row in findings():
            with self.subTest(finding=row["finding"]):
                found = re.search(rf'"{row["finding"]}: |{row["finding"]}: ', tests)
                self.assertTrue(found, "no test expects it")


if __name__ == "__main__":
    unittest.main()
