# SPDX-License-Identifier: Apache-2.0
"""Compares the schema of the preferences with their manual page, the shipped files and the sources that read them."""

import json
import pathlib
import re
import tempfile
import tomllib
import unittest

from programs import PROGRAMS, SOURCE, run

SHIPPED = sorted((SOURCE / "packaging/etc/preferences").iterdir())


def schema():
    answer = run([PROGRAMS / "twctl", "defaults", "describe", "--json"])
    if answer.returncode != 0:
        raise AssertionError(answer.stderr)
    return [json.loads(line) for line in answer.stdout.splitlines()]


def explained():
    """Returns of each key in the manual page, as texts, what it may be, its default, and since when a change counts."""
    page = (SOURCE / "docs/man/tonewerk-reporting-preferences.5").read_text().replace(r"\(dq", '"')
    found = {}
    page = page.replace(".Sh DEVICE FACTS", ".Ss device-facts")
    for domain, text in re.findall(r"^\.Ss (com\.\S+|device-facts)\n(.*?)(?=^\.S[sh] )", page, re.DOTALL | re.MULTILINE):
        for key, words in re.findall(r"^\.It Li (\S+) Pq (.*)", text, re.MULTILINE):
            kind, rest = words.split(", default ", 1)
            found[domain, key] = [kind, *rest.rsplit("; ", 1)]
    return found


def as_toml(value):
    """Returns a value as a person would write it in a file, and "none" without one."""
    if value is None:
        return "none"
    if isinstance(value, list):
        return "[" + ", ".join(map(as_toml, value)) + "]"
    if isinstance(value, dict):
        return "{" + ", ".join(f"{key} = {as_toml(entry)}" for key, entry in value.items()) + "}"
    return json.dumps(value)


def without_comment_marks(path):
    """Returns the file with all its settings enabled."""
    return "".join(line[1:] if re.match(r"#\[|#\w+ =", line) else line for line in path.read_text().splitlines(True))


class PreferencesTest(unittest.TestCase):
    def test_the_manual_page_says_what_the_schema_says(self):
        page = explained()
        rows = schema()
        self.assertGreater(len(rows), 15)
        self.assertEqual([(row["domain"], row["key"]) for row in rows if row["keeper"] == "daemon"],
                         [("com.orvane.tonewerk.twreporting", "VidroInvalidXyIDRlastRun"),
                          ("com.orvane.tonewerk.captures", "accepted")])
        self.assertEqual({(row["domain"], row["key"]) for row in rows}, set(page))
        for row in rows:
            with self.subTest(key=row["key"]):
                kind, default, counts = page[row["domain"], row["key"]]
                self.assertEqual(kind, row["type"] + (f", in {row['unit']}" if row["unit"] else ""))
                self.assertEqual(counts, row["counts"])
                told = None if default == "none" else tomllib.loads(f"value = {default}")["value"]
                self.assertEqual(told, row["default"])

    def test_the_table_of_the_configuration_page_says_what_the_schema_says(self):
        page = (SOURCE / "docs/configuration.md").read_text()
        table = re.search(r"^## All preferences and facts\n.*?(?=^## )", page, re.DOTALL | re.MULTILINE).group(0)
        wanted = []
        for row in schema():
            default = as_toml(row["default"])
            cells = [
                f"`{row['domain']}`",
                f"`{row['key']}`",
                row["type"] + (f", {row['unit']}" if row["unit"] else ""),
                default if default == "none" else f"`{default}`",
                row["counts"],
                row["meaning"],
            ]
            wanted.append("| " + " | ".join(cells) + " |")
        self.assertEqual([line for line in table.splitlines() if line.startswith("| `")], wanted)

    def test_shipped_files_hold_what_their_keys_may_be(self):
        self.assertGreater(len(SHIPPED), 3)
        for path in SHIPPED:
            with self.subTest(file=path.name), tempfile.TemporaryDirectory() as scratch:
                preferences = pathlib.Path(scratch) / "preferences"
                preferences.mkdir()
                text = without_comment_marks(path)
                (preferences / path.name).write_text(text)
                answer = run(
                    [PROGRAMS / "twctl", "defaults", "read", "--json", path.stem],
                    env={"CONFIGURATION_DIRECTORY": scratch, "STATE_DIRECTORY": scratch + "/state"},
                )
                self.assertEqual((answer.returncode, answer.stderr), (0, ""))
                rows = {row["key"]: row for row in map(json.loads, answer.stdout.splitlines())}
                known = {row["key"] for row in schema() if row["domain"] == path.stem}
                set_keys = set(tomllib.loads(text))
                self.assertNotEqual(set_keys, set())
                self.assertLessEqual(set_keys, known)
                self.assertEqual({key for key in rows if rows[key]["from"] == "configuration"}, set_keys)

    def test_every_preference_that_the_sources_read_is_in_the_schema(self):
        rooms = [SOURCE / "src" / room for room in ("session", "monitor", "workers", "driver", "service", "platform/linux")]
        text = "\n".join(path.read_text() for room in rooms for path in sorted(room.rglob("*.[hc]*")))
        reading = r"(?:read|bound|booleanPreference|getEnableFlag|getRunTimeDefaults|getDoubleRunTimeDefaults|hasRunInTimeframe)"
        arguments = " ".join(re.findall(rf"\b{reading}\(([^()]*)\)", text))
        names = set(re.findall(r"\bk[A-Z]\w+", arguments))
        read = {word for name in names for word in re.findall(rf'\b{name} = "([^"]+)"', text)}
        self.assertGreater(len(read), 15)
        self.assertEqual(read - {row[column] for row in schema() for column in ("domain", "key")}, set())

    def test_every_preference_of_the_schema_is_in_the_sources(self):
        text = "\n".join(
            path.read_text()
            for path in (SOURCE / "src").rglob("*.[hc]*")
            if not path.name.startswith("PreferenceSchema") and "tools" not in path.parts
        )
        for row in schema():
            with self.subTest(key=row["key"]):
                self.assertIn(f'"{row["key"]}"', text)
                domain = "/device-facts.toml" if row["domain"] == "device-facts" else f'"{row["domain"]}"'
                self.assertIn(domain, text)


if __name__ == "__main__":
    unittest.main()
