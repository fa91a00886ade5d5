# SPDX-License-Identifier: Apache-2.0
"""Checks that the examples send the keys from which reports are made."""

import re
import unittest

from programs import SOURCE

PAGES = [
    SOURCE / "README.md",
    *sorted((SOURCE / "docs").rglob("*.md")),
    *sorted((SOURCE / "docs/man").iterdir()),
    *sorted((SOURCE / "include").rglob("*.h*")),
    *sorted((SOURCE / "examples").iterdir()),
]


class ExamplesTest(unittest.TestCase):
    def test_name_the_volume_by_the_key_that_makes_a_summary(self):
        count = 0
        for page in PAGES:
            for key in re.findall(r"[\"'](\w*[vV]olume\w*)[\"'](?=\s*[:,])", page.read_text()):
                count += 1
                with self.subTest(page=page.name):
                    self.assertIn(key, ("QMSessionVolume", "QMSessionVolumeBucketed"))
        self.assertGreater(count, 10)


if __name__ == "__main__":
    unittest.main()
