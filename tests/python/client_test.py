# SPDX-License-Identifier: Apache-2.0
"""Tests the Python module with the real daemon."""

import datetime
import os
import re
import signal
import subprocess
import sys
import threading
import unittest
import unittest.mock

from daemon_fixture import PATIENCE, PROGRAMS, SOURCE, DaemonTestCase

from tonewerk import reporting
from tonewerk.reporting import Category, Client, Domain, Service, State, Type


class Clock:
    """Moves the times of messages and the lengths of activities."""

    def __init__(self, case):
        self.now = 1_800_000_000.0
        for name in ("tonewerk.reporting.client.time.time", "tonewerk.reporting.session._monotonic"):
            patch = unittest.mock.patch(name, lambda: self.now)
            patch.start()
            case.addCleanup(patch.stop)

    def pass_by(self, seconds):
        self.now += seconds


class ClientTest(DaemonTestCase):
    def client(self, **options):
        client = Client(self.socket_path, **options)
        self.addCleanup(client.close, 0)
        return client

    def player(self, client, **options):
        return client.session(Service.LONG_FORM_AUDIO, "org.example.Player", **options)

    def test_makes_the_summaries_of_what_is_said_without_a_key(self):
        clock = Clock(self)
        self.start_daemon()
        with self.client() as client, self.player(client) as session:
            session.device("Speaker")
            session.format(48000, 2, "lpcm")
            with session.playing(0.5) as playing:
                clock.pass_by(4)
                session.overload()
                session.overload("mixer", 0.25, 512, 7)
                playing.volume(0.3)
                clock.pass_by(2)
                session.route("Headphones", "plugged")
                clock.pass_by(1)
            clock.pass_by(5)
            # The same again, which must not be redundant.
            with session.playing(0.3), session.recording():
                clock.pass_by(3)
        self.end_daemon()
        stretches = self.rows("SELECT * FROM volume_stretch ORDER BY id")
        self.assertEqual(
            [(row["seconds"], row["volume"], row["device"]) for row in stretches],
            [(4, 0.5, "Speaker"), (2, 0.3, "Speaker"), (1, 0.3, "Headphones"), (3, 0.3, "Headphones")],
        )
        for row in stretches:
            self.assertEqual((row["sample_rate"], row["channels"], row["format"]), (48000, 2, "lpcm"))
            self.assertEqual((row["application"], row["service"]), ("org.example.Player", "longformaudio"))
        (recorded,) = self.rows("SELECT * FROM input_stretch")
        self.assertEqual((recorded["seconds"], recorded["device"]), (3, "Headphones"))
        (session,) = self.rows("SELECT * FROM session")
        self.assertEqual((session["overloads"], session["active_seconds"], session["ending"]), (2, 10, "stopped"))
        issues = self.rows("SELECT * FROM issue ORDER BY id")
        self.assertEqual(
            [(row["kind"], row["node"], row["duration_seconds"], row["buffer_frames"], row["io_cycle"]) for row in issues],
            [("overload", None, None, None, None), ("overload", "mixer", 0.25, 512, 7)],
        )

    def test_stops_what_plays_when_its_session_ends(self):
        clock = Clock(self)
        self.start_daemon()
        client = self.client()
        session = self.player(client)
        run = session.start()
        session.playing(1)
        clock.pass_by(2)
        session.close()
        session.close()
        self.assertIs(run.result(PATIENCE), True)
        client.close(PATIENCE)
        self.end_daemon()
        self.assertEqual([row["seconds"] for row in self.rows("SELECT seconds FROM volume_stretch")], [2])

    def test_ends_without_an_error_after_its_client(self):
        with self.client() as client, self.player(client) as session, session.playing(1) as playing, session.recording():
            client.close(0)
            self.assertFalse(playing.stop())
            with self.assertRaises(reporting.ClosedError):
                session.stop()

    def test_counts_what_plays_through_a_restart_for_the_later_life(self):
        clock = Clock(self)
        self.start_daemon()
        client = self.client()
        session = self.player(client)
        session.start()
        playing = session.playing(1)
        self.assertEqual(client.get_all_reporters().result(PATIENCE), [session.id])  # so the daemon knows what is before it
        clock.pass_by(4)
        self.kill_daemon()
        self.start_daemon()
        self.wait_until(lambda: client.info().connections == 2)
        clock.pass_by(2)
        playing.stop()
        session.close()
        client.close(PATIENCE)
        self.end_daemon()
        lives = self.rows("SELECT active_seconds FROM session ORDER BY id")
        self.assertEqual([life["active_seconds"] for life in lives], [0, 6])

    def test_asks_what_can_be_asked(self):
        self.start_daemon()
        client = self.client()
        session = self.player(client, reporter_id=77)
        self.assertEqual(client.get_service(77).result(PATIENCE), Service.LONG_FORM_AUDIO)
        self.assertEqual(client.validate(77).result(PATIENCE), {"reporterID": 77, "serviceType": 7})
        self.assertEqual(client.validate(78).result(PATIENCE), {"reporterID": 0, "serviceType": 65535})
        self.assertEqual(client.get_all_reporters().result(PATIENCE), [77])
        session.set_service(Service.ALARMS)
        self.assertEqual(client.get_service(77).result(PATIENCE), Service.ALARMS)
        with self.assertRaisesRegex(reporting.RefusedError, "unknown method") as refused:
            client.request("noSuchMethod", [None, 1]).result(PATIENCE)
        self.assertEqual((refused.exception.domain, refused.exception.code), ("com.orvane.tonewerk.messaging", 1))

    def test_sends_every_kind_of_value(self):
        self.start_daemon()
        client = self.client()
        at = datetime.datetime(2026, 11, 20, 12, tzinfo=datetime.timezone.utc)
        payload = {"bool": True, "int": -5, "large": 2**64 - 1, "real": 0.5, "text": "Kopfhörer", "at": at, "list": [1, ["a"]], "map": {"a": 1}}
        with self.player(client) as session:
            self.assertTrue(session.send(Category.IO | Domain.HAL, Type.STATE, payload))
        client.close(PATIENCE)
        self.end_daemon()
        (sent,) = self.payloads("HAL_IO", "State")
        sent.pop("at")
        payload.pop("at")
        self.assertLessEqual(payload.items(), sent.items())

    def test_refuses_what_is_wrong_and_sends_nothing(self):
        client = self.client()
        session = self.player(client)
        queued = client.info().queued_bytes
        wrong = [
            (ValueError, lambda: session.volume(1.01)),
            (ValueError, lambda: session.playing(float("nan"))),
            (TypeError, lambda: session.volume("1")),
            (TypeError, lambda: session.volume(True)),
            (ValueError, lambda: session.device("")),
            (ValueError, lambda: session.device("a" * 257)),
            (ValueError, lambda: session.route("Speaker", "\ud800")),
            (TypeError, lambda: session.device(None)),
            (ValueError, lambda: session.format(0, 2, "lpcm")),
            (TypeError, lambda: session.format(48000, 2.0, "lpcm")),
            (ValueError, lambda: session.overload(silence_seconds=-1)),
            (ValueError, lambda: session.overload(io_cycle=-1)),
            (TypeError, lambda: session.send(4, 1, [])),
            (TypeError, lambda: session.send(4, 1, {1: 2})),
            (TypeError, lambda: session.send(4, 1, {"a": None})),
            (TypeError, lambda: session.send(4, 1, {"a": b"b"})),
            (ValueError, lambda: session.send(4, 1, {"a": 2**64})),
            (ValueError, lambda: session.send(4, 1, {"a\uffff": 1})),
            (ValueError, lambda: session.send(4, 1, {"a": datetime.datetime(2026, 1, 1)})),
            (ValueError, lambda: session.send(4, 65536, {})),
            (ValueError, lambda: session.send(4, 1, {"a": "b" * 2**20})),
            (ValueError, lambda: session.configure({"a": "b" * 2**20})),
            (ValueError, lambda: client.session(65536)),
            (ValueError, lambda: client.session(7, reporter_id=session.id)),
            (ValueError, lambda: client.session(7, reporter_id=2**63)),
        ]
        deep = {}
        for _ in range(40):
            deep = {"a": deep}
        wrong.append((ValueError, lambda: session.send(4, 1, deep)))
        for problem, call in wrong:
            with self.subTest(problem=problem), self.assertRaises(problem):
                call()
        self.assertEqual((client.info().queued_bytes, client.info().messages_dropped), (queued, 0))

    def test_names_the_argument_that_is_wrong(self):
        session = self.player(self.client())
        with self.assertRaisesRegex(ValueError, "^volume must be from 0 to 1$"):
            session.volume(2)
        with self.assertRaisesRegex(TypeError, r"^payload\['a'\]\[1\] must not be a bytes$"):
            session.send(4, 1, {"a": [1, b""]})

    def test_keeps_no_more_than_its_limit_and_says_what_was_dropped(self):
        client = self.client(queue_bytes=8192)
        session = self.player(client)
        session.start()
        kept = 0
        while session.send(Category.PLAYBACK, Type.ACTIVATE, {"number": kept}):
            kept += 1
        self.assertFalse(session.send(Category.PLAYBACK, Type.ACTIVATE, {"number": -1}))
        self.assertGreater(kept, 3)
        self.assertLessEqual(client.info().queued_bytes, 8192)
        self.assertEqual(client.info().messages_dropped, 2)
        self.start_daemon()
        self.wait_until(lambda: client.flush(PATIENCE))
        self.assertTrue(session.send(Category.PLAYBACK, Type.ACTIVATE, {"number": kept}))
        session.close()
        client.close(PATIENCE)
        self.end_daemon()
        sent = self.payloads("Playback", "Activate")
        self.assertEqual([payload["number"] for payload in sent], list(range(kept + 1)))
        self.assertEqual([payload.get("twreporting_dropped") for payload in sent], [None] * kept + [2])
        self.assertEqual(sent[0]["HostApplicationDisplayID"], "org.example.Player")

    def test_makes_sessions_without_room_in_the_queue(self):
        client = self.client(queue_bytes=1)
        sessions = [self.player(client) for _ in range(100)]
        runs = [session.start() for session in sessions]
        for session in sessions[50:]:
            session.close()
        self.assertLessEqual(client.info().queued_bytes, 256 * 4)
        self.start_daemon()
        self.wait_until(lambda: client.flush(PATIENCE))
        with Client(self.socket_path) as other:
            reporters = other.get_all_reporters().result(PATIENCE)
        self.assertEqual(sorted(reporters), sorted(session.id for session in sessions[:50]))
        for session in sessions[:50]:
            session.stop()
        for run in runs[:50]:
            self.assertIs(run.result(PATIENCE), True)

    def test_makes_its_sessions_again_after_the_daemons_death(self):
        self.start_daemon()
        client = self.client()
        session = self.player(client, reporter_id=77)
        run = session.start()
        session.send(Category.PLAYBACK, Type.ACTIVATE, {"number": 1})
        self.assertTrue(client.flush(PATIENCE))
        self.kill_daemon()
        self.wait_until(lambda: client.info().state == State.WAITING)
        session.send(Category.PLAYBACK, Type.ACTIVATE, {"number": 2})
        self.assertFalse(run.done())
        self.start_daemon()
        self.wait_until(lambda: client.flush(PATIENCE))
        self.assertEqual(client.get_service(77).result(PATIENCE), Service.LONG_FORM_AUDIO)
        session.stop()
        self.assertIs(run.result(PATIENCE), True)
        self.assertEqual(client.info().connections, 2)
        client.close(PATIENCE)
        self.end_daemon()
        self.assertIn((2, "org.example.Player"), [(sent["number"], sent["HostApplicationDisplayID"]) for sent in self.payloads("Playback", "Activate")])

    def test_says_that_there_is_no_daemon(self):
        client = self.client()
        self.assertFalse(client.connect(PATIENCE))
        asked = client.get_all_reporters()
        self.assertFalse(client.flush(PATIENCE))
        client.close(PATIENCE)
        with self.assertRaises(reporting.ClosedError):
            asked.result(PATIENCE)
        self.assertEqual(client.info().state, State.ENDED)
        with self.assertRaises(reporting.ClosedError):
            client.send(4, 1, {})

    def test_tries_only_once_when_told_so(self):
        client = self.client(once=True)
        self.assertFalse(client.connect(PATIENCE))
        self.assertEqual(client.info().state, State.ENDED)
        self.assertFalse(client.send(4, 1, {}))
        self.assertEqual(client.info().messages_dropped, 1)
        with self.assertRaises(reporting.NotConnectedError):
            client.get_all_reporters()
        with self.assertRaises(reporting.NotConnectedError):
            self.player(client).start().result(PATIENCE)

    def test_fails_a_request_whose_connection_ends(self):
        self.start_daemon()
        client = self.client()
        held = client.request("watch.nextMessages")
        self.assertTrue(client.flush(PATIENCE))
        self.kill_daemon()
        with self.assertRaises(reporting.NotConnectedError):
            held.result(PATIENCE)

    def test_tells_its_states_on_its_own_thread(self):
        seen = []
        problems = []
        told = threading.Event()

        def note(state):
            seen.append(state)
            if state == State.CONNECTED:
                for wait in (client.close, lambda: client.flush(1), lambda: client.connect(1)):
                    try:
                        wait()
                    except reporting.WouldWaitError as problem:
                        problems.append(problem)
                told.set()
                raise ValueError("the caller's own problem")

        self.start_daemon()
        client = self.client(state_changed=note)
        with self.assertLogs("tonewerk.reporting", "ERROR"):
            self.assertTrue(client.connect(PATIENCE))
            self.assertTrue(told.wait(PATIENCE))
            client.close(PATIENCE)
        self.assertEqual(len(problems), 3)
        self.assertEqual(seen, [State.CONNECTING, State.CONNECTED, State.ENDED])

    def test_is_of_no_use_in_a_forked_child(self):
        client = self.client()
        session = self.player(client)
        held, forked = threading.Event(), threading.Event()

        def hold():  # as the client's thread may at the time of the fork
            with client._changed:
                held.set()
                forked.wait(PATIENCE)

        holder = threading.Thread(target=hold)
        holder.start()
        self.assertTrue(held.wait(PATIENCE))
        child = os.fork()
        if child == 0:
            signal.alarm(PATIENCE)
            refused = 0
            for call in (client.info, client.close, lambda: session.volume(1), lambda: client.send(4, 1, {}), session.stop):
                try:
                    call()
                except reporting.ForkedError:
                    refused += 1
            session.close()  # does nothing
            os._exit(refused)
        forked.set()
        holder.join()
        self.assertEqual(os.waitstatus_to_exitcode(os.waitpid(child, 0)[1]), 5)

    def test_a_forked_child_may_leave_the_blocks_of_its_parent(self):
        program = (
            "import os, sys\n"
            "from tonewerk.reporting import Client\n"
            "with Client() as client, client.session(7, 'org.example.Player') as session, session.playing(1):\n"
            "    child = os.fork()\n"
            "    if child == 0:\n"
            "        sys.exit(5)\n"
            "sys.exit(os.waitstatus_to_exitcode(os.waitpid(child, 0)[1]))\n"
        )
        environment = {**self.environment, "PYTHONPATH": str(SOURCE / "python")}
        done = subprocess.run([sys.executable, "-B", "-c", program], env=environment, timeout=PATIENCE, check=False)
        self.assertEqual(done.returncode, 5)

    def test_sends_what_is_queued_when_the_program_ends(self):
        self.start_daemon()
        program = (
            "from tonewerk.reporting import Client\n"
            "session = Client().session(7, 'org.example.Player')\n"
            "session.start()\n"
            "session.device('Speaker')\n"
        )
        environment = {**self.environment, "PYTHONPATH": str(SOURCE / "python")}
        subprocess.run([sys.executable, "-B", "-c", program], env=environment, check=True, timeout=PATIENCE)
        self.end_daemon()
        self.assertEqual([sent["active_devices"] for sent in self.payloads("RouteChange", "State")], ["Speaker"])

    def test_has_the_numbers_of_the_c_header(self):
        header = (SOURCE / "include/tonewerk/reporting.h").read_text()
        for prefix, numbers in (("CATEGORY", Category), ("DOMAIN", Domain), ("TYPE", Type), ("SERVICE", Service)):
            declared = re.findall(rf"#define TWR_{prefix}_(\w+) \(\(\w+\)(\w+?)u?\)", header)
            self.assertGreater(len(declared), 5)
            self.assertEqual({name: int(number, 0) for name, number in declared}, {entry.name: entry.value for entry in numbers})

    def test_has_a_function_for_each_of_the_c_library(self):
        headers = "".join((SOURCE / f"include/tonewerk/{name}").read_text() for name in ("reporting.h", "reporting_audio.h"))
        declared = re.findall(r"^TWR_API [^;(]*?twr_(client|session)_(\w+)\(", headers, re.MULTILINE)
        self.assertGreater(len(declared), 20)
        # What Python does by other means.
        others = {
            "client_create", "client_destroy", "client_get_info", "client_get_service_type", "client_kill_service",
            "session_create", "session_destroy", "session_set_service_type", "session_set_configuration",
            "session_application", "session_playing_stopped", "session_recording_stopped",
        }  # fmt: skip
        for kind, name in declared:
            if f"{kind}_{name}" not in others:
                self.assertTrue(hasattr({"client": Client, "session": reporting.Session}[kind], name), name)

    def test_has_types_that_agree(self):
        try:
            subprocess.run(["mypy", "--version"], capture_output=True, check=True)
        except FileNotFoundError:
            self.skipTest("there is no mypy")
        done = subprocess.run(
            ["mypy", "--cache-dir", os.devnull, "-p", "tonewerk.reporting"], cwd=SOURCE / "python", capture_output=True, text=True
        )
        self.assertEqual((done.returncode, done.stdout.splitlines()[-1:]), (0, ["Success: no issues found in 5 source files"]), done.stdout)

    def test_is_used_in_the_guide_as_it_is(self):
        self.start_daemon()
        (program,) = re.findall(r"^```python\n(.*?)^```", (SOURCE / "docs/guide/python.md").read_text(), re.DOTALL | re.MULTILINE)
        environment = {**self.environment, "PYTHONPATH": str(SOURCE / "python")}
        subprocess.run([sys.executable, "-B", "-c", program], env=environment, check=True, timeout=PATIENCE)
        self.end_daemon()
        (session,) = self.rows("SELECT * FROM session")
        self.assertEqual((session["application"], session["overloads"], session["ending"]), ("org.example.Player", 1, "stopped"))

    def test_runs_the_example(self):
        self.start_daemon()
        environment = {**self.environment, "PYTHONPATH": str(SOURCE / "python"), "PATH": f"{PROGRAMS}:{os.environ['PATH']}"}
        done = subprocess.run(
            [sys.executable, "-B", SOURCE / "examples/player.py"], env=environment, capture_output=True, text=True, timeout=PATIENCE
        )
        self.assertEqual((done.stdout, done.stderr), ("player: sent\n", ""))
        self.end_daemon()
        stretches = self.rows("SELECT volume, device FROM volume_stretch ORDER BY id")
        self.assertEqual([(row["volume"], row["device"]) for row in stretches], [(0.5, "Speaker"), (0.3, "Speaker")])


if __name__ == "__main__":
    unittest.main()
