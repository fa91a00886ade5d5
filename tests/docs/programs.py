# SPDX-License-Identifier: Apache-2.0
"""Reads the --help of the built programs, and defines the paths of the tree."""

import os
import pathlib
import re
import subprocess

SOURCE = pathlib.Path(__file__).resolve().parents[2]
PROGRAMS = pathlib.Path(os.environ.get("TONEWERK_PROGRAMS", SOURCE / "build/dev/src"))
NAMES = ["twreportingd", "twctl", "tw-pipewire", "tw-memory-usage"]


def run(arguments, **options):
    return subprocess.run(arguments, text=True, stdin=subprocess.DEVNULL, capture_output=True, timeout=60, **options)


class Help:
    """One help text, of a program or of one of its commands."""

    def __init__(self, program, command):
        self.program = program
        self.command = command  # the words after the program's name
        answer = run([PROGRAMS / program, *command, "--help"])
        if answer.returncode != 0:
            raise AssertionError(f"{self}: --help ended with {answer.returncode}: {answer.stderr}")
        if program == "twreportingd":  # which prints its help without a library
            lines = [line for line in answer.stdout.splitlines() if line.startswith("Usage:")]
        else:
            lines = self._table(answer.stdout, "Options")
        self.options = set(re.findall(r"--[a-z][a-z-]*", " ".join(lines)))
        self.short_options = set(re.findall(r"(?<![\w-])-[a-z](?![\w-])", " ".join(lines)))
        self.commands = [line.split()[0] for line in self._table(answer.stdout, "Subcommands")]
        self.arguments = [line.split()[0] for line in self._table(answer.stdout, "Positionals")]

    def __str__(self):
        return " ".join([self.program, *self.command])

    @staticmethod
    def _table(text, title):
        """Returns the first column of one of the tables: the words indented by two spaces."""
        found = re.search(rf"^{title}:\n((?:  .*\n)*)", text, re.MULTILINE)
        rows = found.group(1).splitlines() if found else []
        return [re.split(r"  +", row.strip())[0] for row in rows if not row.startswith("   ")]


_pages = {}


def help_pages(program):
    """Returns all help texts of a program: its own first, then those of its commands and their commands."""
    if program not in _pages:
        pages = [Help(program, [])]
        for page in pages:  # the list grows during the loop
            pages.extend(Help(program, [*page.command, command]) for command in page.commands)
        _pages[program] = pages
    return _pages[program]
