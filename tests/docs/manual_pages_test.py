# SPDX-License-Identifier: Apache-2.0
"""Checks that the manual pages are clean for groff, and explain everything that the programs accept."""

import re
import unittest

from programs import NAMES, SOURCE, help_pages, run

MANUAL = SOURCE / "docs/man"
PAGES = sorted(MANUAL.iterdir())
SECTIONS = ["NAME", "SYNOPSIS", "DESCRIPTION"]
SECTIONS_OF_PROGRAMS = ["OPTIONS", "EXIT STATUS", "ENVIRONMENT", "FILES", "EXAMPLES", "SEE ALSO"]


def parts(text, macro):
    """Returns the text below each heading, beginning with the heading's own line."""
    return re.findall(rf"^\.{macro} .*\n(?:(?!\.{macro} ).*\n)*", text, re.MULTILINE)


def section(page, heading):
    return next(part for part in parts(page.read_text(), "Sh") if part.startswith(f".Sh {heading}\n"))


def explained_options(text):
    """Returns the options that list items explain, such as ".It Fl v , -verbose"."""
    items = re.findall(r"^\.It .*", text, re.MULTILINE)
    lists = [options for item in items for options in re.findall(r"Fl (-?[a-z][a-z-]*(?: , -?[a-z][a-z-]*)*)", item)]
    return {"-" + option for options in lists for option in options.split(" , ")}


def words(text):
    return set(re.findall(r"[\w=-]+", text))


class ManualPagesTest(unittest.TestCase):
    def test_are_clean_for_groff(self):
        for page in PAGES:
            with self.subTest(page=page.name):
                answer = run(
                    ["man", "--warnings=w", "-E", "UTF-8", "--local-file", "-Tutf8", "-Z", page],
                    env={"MANWIDTH": "80", "LC_ALL": "C.UTF-8", "PATH": "/usr/bin:/bin"},
                )
                self.assertEqual((answer.returncode, answer.stderr), (0, ""))
                self.assertGreater(len(answer.stdout), 1000)

    def test_have_the_usual_sections_in_the_usual_order(self):
        for page in PAGES:
            with self.subTest(page=page.name):
                headings = re.findall(r"^\.Sh (.*)", page.read_text(), re.MULTILINE)
                wanted = SECTIONS + (SECTIONS_OF_PROGRAMS if page.suffix in (".1", ".8") else ["SEE ALSO"])
                self.assertEqual([heading for heading in headings if heading in wanted], wanted)

    def test_are_named_as_their_files(self):
        for page in PAGES:
            with self.subTest(page=page.name):
                text = page.read_text()
                self.assertIn(f".Dt {page.stem.upper()} {page.suffix[1:]}\n", text)
                self.assertIn(f".Sh NAME\n.Nm {page.stem}\n.Nd ", text)

    def test_each_program_has_a_page(self):
        self.assertLessEqual(set(NAMES), {page.stem for page in PAGES if page.suffix in (".1", ".8")})

    def test_explain_the_options_that_each_program_has(self):
        for name in NAMES:
            with self.subTest(program=name):
                page = next(page for page in PAGES if page.stem == name)
                own = help_pages(name)[0]
                self.assertEqual(explained_options(section(page, "OPTIONS")), own.options | own.short_options)

    def test_explain_the_commands_of_twctl_with_their_options_and_arguments(self):
        own, *commands = help_pages("twctl")
        sections = parts(section(MANUAL / "twctl.1", "COMMANDS"), "Ss")
        wanted = {text: set() for text in sections}
        for page in commands:
            with self.subTest(command=str(page)):
                # A command has a heading of its own, or shares those with the same first word.
                headings = {text: words(text.splitlines()[0]) for text in sections}
                below = [text for text in sections if set(page.command) <= headings[text]]
                below = below or [text for text in sections if page.command[0] in headings[text]]
                self.assertLessEqual({*page.command, *page.arguments}, words("".join(below)))
                for text in below:
                    wanted[text] |= page.options - own.options
        for text, options in wanted.items():
            with self.subTest(section=text.splitlines()[0]):
                self.assertEqual(explained_options(text), options)

    def test_explain_every_function_of_the_library(self):
        header = (SOURCE / "include/tonewerk/reporting.h").read_text()
        declarations = header + (SOURCE / "include/tonewerk/reporting_audio.h").read_text()
        declared = set(re.findall(r"^TWR_API [^;(]*?(twr_\w+)\(", declarations, re.MULTILINE))
        self.assertGreater(len(declared), 50)
        page = MANUAL / "libtwreporting.3"
        functions = r"^\.F[no] (twr_\w+)"
        self.assertEqual(set(re.findall(functions, section(page, "SYNOPSIS"), re.MULTILINE)), declared)
        statuses = re.search(r"typedef enum twr_status {(.*?)}", header, re.DOTALL).group(1)
        explained = re.findall(r"^\.It Dv (\w+)", section(page, "RETURN VALUES"), re.MULTILINE)
        self.assertEqual(explained, re.findall(r"(TWR_\w+) =", statuses))

    def test_explain_every_method_of_the_protocol(self):
        methods = set(re.findall(r'\.name = "([a-z][\w.]+)"', (SOURCE / "src/protocol/Requests.h").read_text()))
        self.assertGreater(len(methods), 12)
        page = (MANUAL / "tonewerk-reporting-protocol.7").read_text()
        self.assertEqual(methods - set(re.findall(r"^\.It Li ([\w.]+)", page, re.MULTILINE)), set())

    def test_refer_to_pages_that_exist(self):
        names = {page.name for page in PAGES}
        for page in PAGES:
            references = re.findall(r"\bXr ((?:tw|tonewerk|libtw)\S*) (\d)", page.read_text())
            self.assertNotEqual(references, [], page.name)
            for name, number in references:
                self.assertIn(f"{name}.{number}", names, page.name)

    def test_mention_every_variable_that_the_sources_read(self):
        sources = [path.read_text() for room in ("src", "include") for path in (SOURCE / room).rglob("*.[hc]*")]
        pattern = r'(?:getenv|[vV]ariable|serviceDirectory|userDirectory|choose)\((?:environment, )?"([A-Z_]+)"(?:, "([A-Z_]+)")?'
        variables = {name for text in sources for match in re.findall(pattern, text) for name in match if name}
        variables |= {name for text in sources for name in re.findall(r'k\w*Variable = "([A-Z_]+)"', text)}
        self.assertGreater(len(variables), 8)
        text = "\n".join(page.read_text() for page in PAGES)
        self.assertEqual({name for name in variables if name not in text}, set())


if __name__ == "__main__":
    unittest.main()
