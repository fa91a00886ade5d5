# SPDX-License-Identifier: Apache-2.0
"""Checks that the tests that docs/reliability.md names for its promises exist."""

import fnmatch
import re
import unittest

from programs import SOURCE

TEST = re.compile(r"TEST(?:_F|_P)?\(\s*(\w+),\s*(\w+)\)|TYPED_TEST\(\s*(\w+),\s*(\w+)\)")
NAMED = re.compile(r"`(\w+(?:Test|Faults|Contract))(?:\.([\w*]+))?`")


def tests():
    """All tests of the project, as "Suite.Name"."""
    names = set()
    for source in (SOURCE / "tests").rglob("*_test.cpp"):
        for found in TEST.findall(source.read_text()):
            suite, name = found[:2] if found[0] else found[2:]
            names.add(f"{suite}.{name}")
    return names


class ReliabilityTest(unittest.TestCase):
    def test_every_promise_names_a_test_that_exists(self):
        known = tests()
        rows = [
            line
            for line in (SOURCE / "docs/reliability.md").read_text().splitlines()
            if line.startswith("| ") and not line.startswith("| promise") and not line.startswith("|---")
        ]
        self.assertGreater(len(rows), 15)
        for row in rows:
            named = NAMED.findall(row.rsplit("|", 2)[1])
            self.assertTrue(named, f"no test in: {row}")
            for suite, name in named:
                pattern = f"{suite}.{name or '*'}"
                self.assertTrue(fnmatch.filter(known, pattern), f"no such test: {pattern}")


if __name__ == "__main__":
    unittest.main()
