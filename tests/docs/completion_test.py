# SPDX-License-Identifier: Apache-2.0
"""Checks that bash, zsh and fish offer exactly what the programs accept."""

import pathlib
import re
import sqlite3
import tempfile
import unittest

from programs import NAMES, PROGRAMS, SOURCE, help_pages, run
from shells import SHELLS, missing_shells
from store_fixture import begin_of_last_hour, make_store

SCRIPTS = SOURCE / "packaging/completion"
TWCTL = PROGRAMS / "twctl"

# Calls the completion of the other programs as readline does, with the words so far. The last word is the one to complete.
DRIVER = """
set -euo pipefail
compopt() { :; } # which works inside readline only
source "$1"
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
        if missing_shells():
            self.fail(f"scripts/bootstrap installs what is missing: {' '.join(missing_shells())}")
        scratch = tempfile.TemporaryDirectory()
        self.addCleanup(scratch.cleanup)
        self.scratch = pathlib.Path(scratch.name)
        self.home = self.scratch / "home"
        self.home.mkdir()
        self.environment = {
            "PATH": f"{PROGRAMS}:/usr/bin:/bin",
            "HOME": str(self.home),
            "TERM": "dumb",
            "LC_ALL": "C.UTF-8",
            "XDG_RUNTIME_DIR": str(self.scratch),
            "XDG_STATE_HOME": str(self.scratch),
        }
        self.started = {}

    def shell(self, name):
        if name not in self.started:
            # The shells' own files are not in the directory whose files are completed.
            self.started[name] = SHELLS[name](self.home, self.environment, TWCTL)
            self.addCleanup(self.started[name].close)
        return self.started[name]

    def asked(self, *words, shell="fish", seconds="100"):
        """Returns the lines with which twctl itself answers a shell."""
        answer = run([TWCTL, "__complete", shell, seconds, *words], env=self.environment, cwd=self.home)
        self.assertEqual((answer.returncode, answer.stderr), (0, ""), f"completing {words}")
        return answer.stdout.splitlines()

    def offers(self, *words):
        """Returns what twctl offers, without descriptions."""
        return [line.split("\t")[0] for line in self.asked(*words)[1:]]

    def assert_all_offer(self, line, expected):
        for name in SHELLS:
            with self.subTest(shell=name, line=line):
                self.assertEqual(sorted(self.shell(name).offers(line)), sorted(expected))

    def test_all_shells_offer_the_options_that_each_command_has(self):
        for page in help_pages("twctl"):
            self.assertNotEqual(page.options, set())
            self.assert_all_offer(f"{page} -", page.options)

    def test_all_shells_offer_the_commands_that_there_are(self):
        pages = [page for page in help_pages("twctl") if page.commands]
        self.assertGreater(len(pages), 1)
        for page in pages:
            self.assert_all_offer(f"{page} ", page.commands)

    def test_all_shells_offer_choices_and_values_behind_an_equals_sign(self):
        self.assert_all_offer("twctl export --format ", ["csv", "jsonl"])
        self.assert_all_offer("twctl --json --system def", ["defaults"])
        self.assert_all_offer("twctl send --type=Pel", ["--type=Pellix"])
        self.assert_all_offer("twctl nonsense-that-nobody-knows ", [])

    def test_all_shells_offer_files_where_files_are_taken(self):
        (self.home / "player.jsonl").touch()
        self.assert_all_offer("twctl replay pl", ["player.jsonl"])
        self.assert_all_offer("twctl report -o pl", ["player.jsonl"])
        self.assert_all_offer("twctl report --output=pl", ["--output=player.jsonl"])

    def test_all_shells_complete_the_command_line_of_a_sandboxed_program(self):
        program = self.home / "my-own-player"
        program.write_text("#!/bin/sh\n")
        program.chmod(0o755)
        self.assert_all_offer("twctl sandbox --keep ./my-o", ["./my-own-player"])
        self.assert_all_offer("twctl sandbox cat my-o", ["my-own-player"])

    def test_nasty_names_stay_harmless_in_all_shells(self):
        names = ["org.example.$(touch hit)", "org.example.`touch hit`", "org.example.;touch hit", "org.example.'\"\\ *"]
        notifications = self.scratch / "tonewerk/notifications"
        notifications.mkdir(parents=True)
        for name in [*names, "org.example.\x1b[2J", "org.example.a\nb", "org.example.a\tb", "-x", "--system"]:
            (notifications / name).write_text("1\n")
        self.assert_all_offer("twctl notify get org.ex", names)
        self.assertEqual([path for path in self.scratch.rglob("hit")], [])
        self.assertEqual(self.offers("notify", "get", "-"), self.offers("paths", "-"))  # only options

    def test_descriptions_cannot_control_the_terminal(self):
        store = self.scratch / "tonewerk"
        store.mkdir()
        make_store(store / "reports.db", begin_of_last_hour())
        database = sqlite3.connect(store / "reports.db")
        database.execute("DELETE FROM session")
        database.execute("INSERT INTO session (id, reporter_id, user_id, service, application, started_at) VALUES (7, 1, 0, 'test', ?, 1)",
                         ["a\x1b[2J\nb"])
        database.commit()
        database.close()
        lines = self.asked("session", "")
        self.assertEqual(len(lines), 2, lines)
        self.assertRegex(lines[1], r"^7\ttest, a\\u001b\[2J\\nb, ")
        self.assertEqual(self.shell("fish").lines("twctl session "), [lines[1]])

    def test_descriptions_reach_the_shells(self):
        self.assertIn("events\tThe messages in the store, a line each, newest last", self.shell("fish").lines("twctl ev"))

    def test_words_in_quotes_are_completed(self):
        for name in SHELLS:
            with self.subTest(shell=name):
                self.assertEqual(self.shell(name).offers("twctl defaults read 'com.orvane.metr"), ["com.orvane.metricon"])

    def test_bash_words_are_taken_without_their_quotes(self):
        self.assertEqual(self.asked("defaults", "read", "'com.orvane.metr", shell="bash"), ["words", "com.orvane.metricon"])
        self.assertEqual(self.asked("def\\aults", "\"re\"a", shell="bash"), ["words", "read\tThe preferences of a domain"][:1]
                         + self.asked("defaults", "rea")[1:])

    def test_each_shell_has_its_script_and_others_are_refused(self):
        for name in SHELLS:
            text = run([TWCTL, "completion", name]).stdout
            self.assertEqual(text, (SOURCE / f"src/tools/twctl/completion/twctl.{name}").read_text())
        answer = run([TWCTL, "completion", "bas"])
        self.assertEqual((answer.returncode, answer.stdout), (2, ""))
        self.assertIn("did you mean 'bash'", answer.stderr)

    def test_the_question_of_the_shells_is_no_command_of_people(self):
        self.assertNotIn("__complete", run([TWCTL, "--help"]).stdout)
        for wrong in [["__complete"], ["__complete", "bash"], ["__complete", "bash", "soon", "x"], ["__complete", "bash", "0", "x"]]:
            self.assertEqual(run([TWCTL, *wrong]).returncode, 2)

    def test_a_daemon_that_does_not_answer_holds_up_nobody(self):
        import socket
        with socket.socket(socket.AF_UNIX) as listener:
            listener.bind(str(self.scratch / "silent"))
            listener.listen()
            self.environment["TONEWERK_REPORTING_SOCKET"] = str(self.scratch / "silent")
            # It ends, with what is known without the daemon; run() would fail after a minute.
            self.assertEqual(self.asked("send", "--id", "", seconds="0.1"), ["words"])

    def test_offers_only_what_begins_as_the_word_does(self):
        self.assertEqual(self.offers("val"), ["validate"])
        self.assertEqual(self.offers("events", "--fol"), ["--follow"])

    def test_does_not_take_an_options_value_for_a_command(self):
        self.assertEqual(self.offers("channels", "--group", "list", "--dr"), ["--driver"])
        self.assertEqual(self.offers("captures", "show", "--lat"), ["--latest"])
        self.assertEqual(self.offers("channels", "--watch", "--dr"), ["--driver"])

    def test_options_of_a_sandboxed_program_are_its_own(self):
        self.assertEqual(self.asked("sandbox", "./player", "--"), ["command 2"])
        self.assertEqual(self.asked("--json", "sandbox", "--keep", "--", "./player", "--"), ["command 5"])

    def refusal(self, *arguments):
        """Returns what twctl reports as wrong with a message; empty when it only finds no daemon."""
        answer = run([TWCTL, "send", *arguments, "key=1"], env={"TONEWERK_REPORTING_SOCKET": str(self.scratch / "none")})
        return "" if answer.returncode == 3 else answer.stderr

    def test_offers_categories_and_types_that_twctl_takes(self):
        for category in [*self.offers("send", "--category", ""), "HAL_Playback"]:
            self.assertEqual(self.refusal("--category", category, "--type", "Start"), "")
        for kind in self.offers("send", "--type", ""):
            self.assertEqual(self.refusal("--category", "Playback", "--type", kind), "")
        self.assertIn("no category", self.refusal("--category", "Nonsense", "--type", "Start"))
        self.assertIn("HAL_Playback", self.offers("send", "--category", "HAL_P"))

    def names_in_source(self, array):
        text = (SOURCE / "src/protocol/EventTexts.cpp").read_text()
        found = re.search(rf"{array}{{(.*?)}};", text, re.DOTALL)
        return re.findall(r'"(\w+)"', found.group(1))

    def test_offers_all_categories_types_and_services(self):
        self.assertEqual(self.offers("send", "--category", ""), self.names_in_source("kBaseTexts")[1:])
        self.assertEqual(self.offers("send", "--type", ""), self.names_in_source("kTypeTexts"))
        services = self.names_in_source("kServiceNames")
        self.assertEqual(self.offers("rtc", "--name", ""), [name + "_session" for name in services])
        self.assertEqual(self.offers("sessions", "--service", ""), services)
        domains = {text.split("_")[0] for letter in "MSDHRT" for text in self.offers("send", "--category", letter) if "_" in text}
        self.assertEqual(domains, set(self.names_in_source("kDomains{")))

    def test_offers_event_names_a_part_at_a_time(self):
        self.assertIn("com.orvane.tonewerk.", self.offers("events", "--name", "com"))
        self.assertEqual(self.asked("events", "--name", "com.orvane.alerts.Vol"), ["words nospace", "com.orvane.alerts.Volume."])
        self.assertEqual(self.asked("events", "--name", "com.orvane.alerts.Volume.Summ"), ["words", "com.orvane.alerts.Volume.Summary"])
        for name in ["bash", "zsh"]:
            self.assertEqual(self.shell(name).offers("twctl events --name com.orvane.al"), ["com.orvane.alarms.", "com.orvane.alerts."])
            line = self.shell(name).line_after("twctl events --name com.orvane.alerts.Vol")
            self.assertEqual(line.rstrip(), "twctl events --name com.orvane.alerts.Volume.")

    def test_offers_the_preference_domains_of_the_source(self):
        source = "\n".join(path.read_text() for path in (SOURCE / "src").rglob("*.[hc]*"))
        domains = re.findall(r'\bk(?:PreferenceDomain|Domain|ReportingSuite) = "([^"]+)"', source)
        domains += re.findall(r'{kFeatureDefaultsDomain, "([^"]+)"}', source)
        self.assertGreater(len(domains), 5)
        self.assertEqual(set(self.offers("defaults", "write", "")), set(domains))
        self.assertEqual(set(self.offers("defaults", "read", "")), {*domains, "device-facts"})
        self.assertEqual(self.offers("defaults", "write", "com.orvane.linkreport", "event_name_attribute", ""), ["true", "false"])
        self.assertEqual(self.offers("defaults", "write", "com.orvane.linkreport", "device_id", ""), [])

    def test_offers_the_preference_keys_of_the_manual_page(self):
        page = (SOURCE / "docs/man/tonewerk-reporting-preferences.5").read_text()
        sections = re.findall(r"^\.Ss (com\.\S+)\n(.*?)(?=^\.S[sh] )", page, re.DOTALL | re.MULTILINE)
        self.assertEqual({domain for domain, _ in sections}, set(self.offers("defaults", "write", "")))
        for domain, text in sections:
            keys = re.findall(r"^\.It Li (\S+)", text, re.MULTILINE)
            self.assertEqual(self.offers("defaults", "write", domain, ""), keys, domain)

    def test_offers_the_notifications_of_the_source_and_those_that_were_posted(self):
        notifications = self.scratch / "tonewerk/notifications"
        notifications.mkdir(parents=True)
        (notifications / "org.example.posted").write_text("1\n")
        source = "\n".join(path.read_text() for path in (SOURCE / "src").rglob("*.[hc]*"))
        names = set(re.findall(r'Notification(?:Name)?(?: =|,) "(com\.[^"]+)"', source))
        self.assertGreater(len(names), 3)
        offered = self.offers("notify", "post", "")
        self.assertEqual({name for name in offered if name.startswith("com.")}, names)
        self.assertEqual(self.offers("notify", "get", "org.example.p"), ["org.example.posted"])

    def test_offers_recordings_and_folders_for_replay(self):
        (self.home / "player.jsonl").touch()
        (self.home / "notes.txt").touch()
        (self.home / "more").mkdir()
        bash = self.shell("bash")
        self.assertEqual([name for name in bash.offers("twctl replay ") if name in ["more", "notes.txt", "player.jsonl"]],
                         ["more", "player.jsonl"])
        self.assert_all_offer("twctl replay no", ["notes.txt"])

    def test_offers_the_diagnostics_on_the_disk(self):
        capture = self.scratch / "tonewerk/captures/01ABC"
        capture.mkdir(parents=True)
        (capture / "request.json").write_text("{}")
        self.assertEqual(self.offers("captures", "show", ""), ["01ABC"])
        self.assertEqual(self.offers("captures", "delete", "01ABC", ""), ["01ABC"])
        self.assertEqual(self.offers("drafts", "show", ""), [])

    def test_offers_published_drivers(self):
        channels = self.scratch / "tonewerk/channels"
        channels.mkdir(parents=True)
        example = (SOURCE / "examples/driver-channels.json").read_text()
        (channels / "amp.json").write_text(example)
        driver = re.search(r'"driver": "([^"]+)"', example).group(1)
        self.assertIn(" ", driver)
        self.assert_all_offer(f"twctl channels --driver {driver[0]}", [driver])

    def test_offers_what_the_store_has(self):
        self.assertEqual(self.offers("export", ""), [])
        (self.scratch / "tonewerk").mkdir()
        make_store(self.scratch / "tonewerk/reports.db", begin_of_last_hour())
        self.assertEqual(self.offers("export", "channel_"), ["channel_bucket", "channel_state", "channel_value"])

        def column(sql):
            return [str(row[0]) for row in sqlite3.connect(self.scratch / "tonewerk/reports.db").execute(sql)]
        sessions = column("SELECT id FROM session")
        self.assertGreater(len(sessions), 0)
        self.assertEqual(sorted(self.offers("session", "")), sorted(sessions)[:20])
        self.assertEqual(sorted(self.offers("trace", "--session", "")), sorted(sessions)[:20])
        self.assertEqual(set(self.offers("sessions", "--app", "")), set(column("SELECT DISTINCT application FROM session")))
        self.assertEqual(set(self.offers("sessions", "--device", "")),
                         set(column("SELECT device FROM volume_stretch UNION SELECT device FROM input_stretch")) - {"None"})

    def test_the_other_programs_have_bash_completion(self):
        others = [name for name in NAMES if name != "twctl"]
        self.assertEqual({path.name for path in SCRIPTS.iterdir()}, set(others))

        def offers(*words):
            answer = run(["bash", "--norc", "--noprofile", "-c", DRIVER, "bash", SCRIPTS / words[0], *words],
                         env=self.environment, cwd=self.home)
            self.assertEqual((answer.returncode, answer.stderr), (0, ""), f"completing {' '.join(words)}")
            return answer.stdout.splitlines()
        for page in [page for name in others for page in help_pages(name)]:
            self.assertEqual(set(offers(page.program, *page.command, "-")), page.options)
        self.assertEqual(offers("tw-memory-usage", "--sort", "=", "c"), ["cpu"])


if __name__ == "__main__":
    unittest.main()
