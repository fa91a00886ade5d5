# SPDX-License-Identifier: Apache-2.0
"""Checks that bash completion offers exactly what the programs accept."""

import pathlib
import re
import tempfile
import unittest

from programs import NAMES, PROGRAMS, SOURCE, help_pages, run
from store_fixture import begin_of_last_hour, make_store

SCRIPTS = SOURCE / "packaging/completion"

# Calls the completion as readline does, with the words so far. The last word is the one to complete.
DRIVER = """
set -euo pipefail
compopt() { :; } # which works inside readline only
source "$1"
_twctl_patience=30s # a busy machine is no reason to fail
shift
COMP_WORDS=("$@")
COMP_CWORD=$(($# - 1))
function=$(complete -p "$1" | sed 's/.*-F \\([^ ]*\\) .*/\\1/')
COMPREPLY=()
"$function" "$1" "${COMP_WORDS[COMP_CWORD]}" "${COMP_WORDS[COMP_CWORD - 1]}"
[ ${#COMPREPLY[@]} -eq 0 ] || printf '%s\\n' "${COMPREPLY[@]}"
"""


class CompletionTest(unittest.TestCase):
    def setUp(self):
        scratch = tempfile.TemporaryDirectory()
        self.addCleanup(scratch.cleanup)
        self.scratch = pathlib.Path(scratch.name)

    def offers(self, *words):
        environment = {
            "PATH": f"{PROGRAMS}:/usr/bin:/bin",
            "HOME": str(self.scratch),
            "XDG_RUNTIME_DIR": str(self.scratch),
            "XDG_STATE_HOME": str(self.scratch),
        }
        answer = run(
            ["bash", "--norc", "--noprofile", "-c", DRIVER, "bash", SCRIPTS / words[0], *words],
            env=environment,
            cwd=self.scratch,
        )
        self.assertEqual((answer.returncode, answer.stderr), (0, ""), f"completing {' '.join(words)}")
        return answer.stdout.splitlines()

    def test_offers_the_options_that_each_command_has(self):
        for page in [page for name in NAMES for page in help_pages(name)]:
            with self.subTest(command=str(page)):
                self.assertNotEqual(page.options, set())
                self.assertEqual(set(self.offers(page.program, *page.command, "-")), page.options)

    def test_offers_the_commands_that_there_are(self):
        pages = [page for page in help_pages("twctl") if page.commands]
        self.assertGreater(len(pages), 1)
        for page in pages:
            with self.subTest(command=str(page)):
                self.assertEqual(self.offers("twctl", *page.command, ""), page.commands)

    def test_offers_only_what_begins_as_the_word_does(self):
        self.assertEqual(self.offers("twctl", "val"), ["validate"])
        self.assertEqual(self.offers("twctl", "events", "--fol"), ["--follow"])
        self.assertEqual(self.offers("twctl", "nonsense-that-nobody-knows", ""), [])

    def test_knows_options_before_the_command_and_values_behind_an_equals_sign(self):
        self.assertEqual(self.offers("twctl", "--json", "--system", "def"), ["defaults"])
        self.assertEqual(self.offers("twctl", "send", "--type", "=", "Pel"), ["Pellix"])
        self.assertIn("Pellix", self.offers("twctl", "send", "--type", "="))
        self.assertEqual(self.offers("tw-memory-usage", "--sort", "=", "c"), ["cpu"])

    def test_does_not_take_an_options_value_for_a_command(self):
        self.assertEqual(self.offers("twctl", "channels", "--group", "list", "--dr"), ["--driver"])
        self.assertEqual(self.offers("twctl", "captures", "show", "--lat"), ["--latest"])

    def refusal(self, *arguments):
        """Returns what twctl reports as wrong with a message; empty when it only finds no daemon."""
        answer = run(
            [PROGRAMS / "twctl", "send", *arguments, "key=1"],
            env={"TONEWERK_REPORTING_SOCKET": str(self.scratch / "none")},
        )
        return "" if answer.returncode == 3 else answer.stderr

    def test_offers_categories_and_types_that_twctl_takes(self):
        for category in [*self.offers("twctl", "send", "--category", ""), "HAL_Playback"]:
            self.assertEqual(self.refusal("--category", category, "--type", "Start"), "")
        for kind in self.offers("twctl", "send", "--type", ""):
            self.assertEqual(self.refusal("--category", "Playback", "--type", kind), "")
        self.assertIn("no category", self.refusal("--category", "Nonsense", "--type", "Start"))
        self.assertIn("HAL_Playback", self.offers("twctl", "send", "--category", "HAL_P"))

    def names_in_source(self, array):
        text = (SOURCE / "src/protocol/EventTexts.cpp").read_text()
        found = re.search(rf"{array}{{(.*?)}};", text, re.DOTALL)
        return re.findall(r'"(\w+)"', found.group(1))

    def test_offers_all_categories_types_and_services(self):
        self.assertEqual(self.offers("twctl", "send", "--category", ""), self.names_in_source("kBaseTexts")[1:])
        self.assertEqual(self.offers("twctl", "send", "--type", ""), self.names_in_source("kTypeTexts"))
        services = [name + "_session" for name in self.names_in_source("kServiceNames")]
        self.assertEqual(self.offers("twctl", "rtc", "--name", ""), services)
        domains = {text.split("_")[0] for letter in "MSDHRT" for text in self.offers("twctl", "send", "--category", letter)
                   if "_" in text}
        self.assertEqual(domains, set(self.names_in_source("kDomains{")))

    def test_offers_event_names_a_part_at_a_time(self):
        self.assertIn("com.orvane.tonewerk.", self.offers("twctl", "events", "--name", "com"))
        self.assertEqual(self.offers("twctl", "events", "--name", "com.orvane.alerts.Vol"), ["com.orvane.alerts.Volume."])
        self.assertEqual(
            self.offers("twctl", "events", "--name", "com.orvane.alerts.Volume.Summ"), ["com.orvane.alerts.Volume.Summary"]
        )

    def test_offers_the_preference_domains_of_the_source(self):
        source = "\n".join(path.read_text() for path in (SOURCE / "src").rglob("*.[hc]*"))
        domains = re.findall(r'\bk(?:PreferenceDomain|Domain|ReportingSuite) = "([^"]+)"', source)
        domains += re.findall(r'{kFeatureDefaultsDomain, "([^"]+)"}', source)
        self.assertGreater(len(domains), 5)
        self.assertEqual(set(self.offers("twctl", "defaults", "write", "")), set(domains))
        self.assertEqual(set(self.offers("twctl", "defaults", "read", "")), {*domains, "device-facts"})
        self.assertEqual(self.offers("twctl", "defaults", "write", "com.orvane.linkreport", "event_name_attribute", ""),
                         ["true", "false"])
        self.assertEqual(self.offers("twctl", "defaults", "write", "com.orvane.linkreport", "device_id", ""), [])

    def test_offers_the_preference_keys_of_the_manual_page(self):
        page = (SOURCE / "docs/man/tonewerk-reporting-preferences.5").read_text()
        sections = re.findall(r"^\.Ss (com\.\S+)\n(.*?)(?=^\.S[sh] )", page, re.DOTALL | re.MULTILINE)
        self.assertEqual({domain for domain, _ in sections}, set(self.offers("twctl", "defaults", "write", "")))
        for domain, text in sections:
            keys = re.findall(r"^\.It Li (\S+)", text, re.MULTILINE)
            self.assertEqual(self.offers("twctl", "defaults", "write", domain, ""), keys, domain)

    def test_offers_the_notifications_of_the_source_and_those_that_were_posted(self):
        notifications = self.scratch / "tonewerk/notifications"
        notifications.mkdir(parents=True)
        (notifications / "org.example.posted").write_text("1\n")
        (notifications / "org.example.$(touch hit)").write_text("1\n")
        source = "\n".join(path.read_text() for path in (SOURCE / "src").rglob("*.[hc]*"))
        names = set(re.findall(r'Notification(?:Name)?(?: =|,) "(com\.[^"]+)"', source))
        self.assertGreater(len(names), 3)
        offered = self.offers("twctl", "notify", "post", "")
        self.assertEqual({name for name in offered if name.startswith("com.")}, names)
        self.assertEqual(self.offers("twctl", "notify", "get", "org.example.p"), ["org.example.posted"])
        self.assertIn("org.example.\\$\\(touch\\ hit\\)", offered)
        self.assertFalse((self.scratch / "hit").exists())

    def test_offers_recordings_and_folders_for_replay(self):
        (self.scratch / "player.jsonl").touch()
        (self.scratch / "notes.txt").touch()
        (self.scratch / "more").mkdir()
        self.assertEqual(sorted(self.offers("twctl", "replay", "")), ["more", "player.jsonl"])
        self.assertEqual(self.offers("twctl", "replay", "no"), ["notes.txt"])

    def test_offers_the_diagnostics_on_the_disk(self):
        capture = self.scratch / "tonewerk/captures/01ABC"
        capture.mkdir(parents=True)
        (capture / "request.json").write_text("{}")
        self.assertEqual(self.offers("twctl", "captures", "show", ""), ["01ABC"])
        self.assertEqual(self.offers("twctl", "captures", "delete", "01ABC", ""), ["01ABC"])
        self.assertEqual(self.offers("twctl", "drafts", "show", ""), [])

    def test_offers_published_drivers(self):
        channels = self.scratch / "tonewerk/channels"
        channels.mkdir(parents=True)
        example = (SOURCE / "examples/driver-channels.json").read_text()
        (channels / "amp.json").write_text(example)
        driver = re.search(r'"driver": "([^"]+)"', example).group(1)
        offered = self.offers("twctl", "channels", "--driver", driver[0])
        self.assertEqual([name.replace("\\", "") for name in offered], [driver])

    def test_offers_the_views_of_the_store(self):
        self.assertEqual(self.offers("twctl", "export", ""), [])
        (self.scratch / "tonewerk").mkdir()
        make_store(self.scratch / "tonewerk/reports.db", begin_of_last_hour())
        self.assertEqual(self.offers("twctl", "export", "channel_"), ["channel_bucket", "channel_state", "channel_value"])
        self.assertEqual(self.offers("twctl", "export", "--format", ""), ["csv", "jsonl"])

    def test_each_program_has_a_file_of_its_name(self):
        self.assertEqual({path.name for path in SCRIPTS.iterdir()}, set(NAMES))


if __name__ == "__main__":
    unittest.main()
