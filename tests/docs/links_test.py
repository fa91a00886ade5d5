# SPDX-License-Identifier: Apache-2.0
"""Checks that the links of README.md, CONTRIBUTING.md and docs exist."""

import re
import unittest

from programs import SOURCE

PAGES = [SOURCE / "README.md", SOURCE / "CONTRIBUTING.md", *sorted((SOURCE / "docs").rglob("*.md"))]
ROOMS = "src|include|tests|benchmarks|fuzz|docs|examples|packaging|scripts"


def prose(page):
    """Returns the page without its code blocks."""
    return re.sub(r"^```.*?^```", "", page.read_text(), flags=re.DOTALL | re.MULTILINE)


def anchors(page):
    """Returns the anchors of the headings: lower case, without punctuation, a dash for a space."""
    headings = re.findall(r"^#+ (.*)", prose(page), re.MULTILINE)
    return {re.sub(r"[^\w\- ]", "", heading.lower()).replace(" ", "-") for heading in headings}


def links(page):
    return re.findall(r"\]\(([^)\s]+)\)", prose(page))


class LinksTest(unittest.TestCase):
    def test_relative_links_lead_to_files_and_headings(self):
        count = 0
        for page in PAGES:
            for link in links(page):
                if re.match(r"[a-z]+:", link):
                    continue
                count += 1
                with self.subTest(page=page.name, link=link):
                    path, _, anchor = link.partition("#")
                    target = (page.parent / path).resolve() if path else page
                    self.assertTrue(target.exists(), "no such file")
                    self.assertTrue(target.is_relative_to(SOURCE), "outside of the tree")
                    if anchor:
                        self.assertIn(anchor, anchors(target))
        self.assertGreater(count, 20)

    def test_paths_in_backquotes_exist(self):
        count = 0
        for page in PAGES:
            for path in re.findall(rf"`((?:{ROOMS})/[^`\s]*)`", prose(page)):
                count += 1
                with self.subTest(page=page.name, path=path):
                    self.assertTrue(any(True for _ in SOURCE.glob(path.rstrip("/"))), "no such file")
        self.assertGreater(count, 20)

    def test_every_page_of_docs_is_linked(self):
        linked = {(page.parent / link.partition("#")[0]).resolve() for page in PAGES for link in links(page)}
        for page in PAGES[2:]:
            with self.subTest(page=page.name):
                self.assertIn(page, linked)


if __name__ == "__main__":
    unittest.main()
