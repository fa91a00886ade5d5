# SPDX-License-Identifier: Apache-2.0
"""Checks that the commands on the pages exist in the programs."""

import re
import shlex
import unittest

from programs import NAMES, SOURCE, help_pages

PAGES = [SOURCE / "README.md", *sorted((SOURCE / "docs").rglob("*.md")), *sorted((SOURCE / "docs/man").iterdir())]


def blocks(page):
    """Returns the commands to type: shell blocks of Markdown, displays of manual pages."""
    text = page.read_text()
    if page.suffix == ".md":
        return re.findall(r"^```sh\n(.*?)^```", text, re.DOTALL | re.MULTILINE)
    return [block.replace("\\e", "\\") for block in re.findall(r"^\.Bd -literal.*?\n(.*?)^\.Ed", text, re.DOTALL | re.MULTILINE)]


def commands(page):
    """Returns the words of each call of one of the project's programs."""
    calls = []
    for block in blocks(page):
        if "#include" in block or "import " in block:
            continue
        text = re.sub(r"(^|\s)#.*", r"\1", block.replace("\\\n", " "))
        words = shlex.shlex(text, posix=True, punctuation_chars="();<>|&\n")
        words.whitespace = " \t"
        words.commenters = ""
        call = None
        for word in words:
            if re.fullmatch(r"[();<>|&\n]+", word):
                call = None
            elif call is not None:
                call.append(word)
            elif word in NAMES:
                call = [word]
                calls.append(call)
    return calls


def options_of(call):
    """Returns the help page of the command in a call, or that of the program when the call names no command."""
    pages = {tuple(page.command): page for page in help_pages(call[0])}
    path = ()
    for word in call[1:]:
        if (*path, word) in pages:
            path = (*path, word)
    return pages[path]


class CommandsTest(unittest.TestCase):
    def test_use_commands_and_options_that_exist(self):
        count = 0
        for page in PAGES:
            for call in commands(page):
                count += 1
                with self.subTest(page=page.name, command=" ".join(call)):
                    known = options_of(call)
                    used = {word.split("=")[0] for word in call[1:] if re.match(r"--?[a-z]", word)}
                    self.assertLessEqual(used, known.options | known.short_options)
                    for word in call[1:]:
                        self.assertTrue(not word.startswith("examples/") or (SOURCE / word).exists(), word)
                    if call[0] == "twctl" and used != {"--help"}:
                        self.assertTrue(known.command, "no such command")
        self.assertGreater(count, 60)


if __name__ == "__main__":
    unittest.main()
