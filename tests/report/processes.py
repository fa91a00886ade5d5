# SPDX-License-Identifier: Apache-2.0
"""Runs the daemon, `twctl serve` and a PipeWire graph without hardware, in directories of their own."""

import contextlib
import json
import math
import os
import pathlib
import shutil
import signal
import struct
import subprocess
import tempfile
import time

SOURCE = pathlib.Path(__file__).resolve().parents[2]
PROGRAMS = pathlib.Path(os.environ.get("TONEWERK_PROGRAMS", SOURCE / "build/dev/src"))
PATIENCE = 100.0  # seconds; only a failing test waits so long


def wait_until(condition, what, problem=lambda: ""):
    """Returns the first result of `condition` that counts as true."""
    deadline = time.monotonic() + PATIENCE
    while True:
        found = condition()
        if found:
            return found
        if time.monotonic() > deadline:
            raise TimeoutError(f"{what} does not happen. {problem()}")
        time.sleep(0.05)


class Machine:
    """Processes of one test, which end with it."""

    def __init__(self, test):
        scratch = tempfile.TemporaryDirectory()
        test.addCleanup(scratch.cleanup)
        self.directory = pathlib.Path(scratch.name)
        self.processes = []
        test.addCleanup(self.end)
        for name in ("runtime", "state", "logs", "configuration"):
            (self.directory / name).mkdir()
        (self.directory / "configuration/device-facts.toml").write_text("InternalBuild = true\n")
        self.socket = self.directory / "runtime/reporting.sock"
        self.store = self.directory / "state/reports.db"
        self.environment = {"PATH": os.environ["PATH"], "LSAN_OPTIONS": os.environ.get("LSAN_OPTIONS", ""), "HOME": str(self.directory),
                            "RUNTIME_DIRECTORY": str(self.directory / "runtime"), "STATE_DIRECTORY": str(self.directory / "state"),
                            "LOGS_DIRECTORY": str(self.directory / "logs"), "CONFIGURATION_DIRECTORY": str(self.directory / "configuration"),
                            "TONEWERK_REPORTING_SOCKET": str(self.socket), "TZ": "UTC"}

    def start(self, name, *command, **environment):
        with open(self.directory / f"{name}.log", "ab") as log:
            process = subprocess.Popen(command, stdin=subprocess.DEVNULL, stdout=log, stderr=log, env={**self.environment, **environment}, start_new_session=True)
        self.processes.append(process)
        return process

    def log(self, name):
        return (self.directory / f"{name}.log").read_text()

    def end(self):
        for process in reversed(self.processes):
            self.stop(process)

    @staticmethod
    def stop(process, with_signal=signal.SIGTERM):
        """Ends a process and returns its exit status."""
        if process.poll() is None:
            process.send_signal(with_signal)
        try:
            return process.wait(PATIENCE)
        except subprocess.TimeoutExpired:
            with contextlib.suppress(ProcessLookupError):
                os.killpg(process.pid, signal.SIGKILL)
            process.wait()
            raise

    def start_daemon(self):
        daemon = self.start("daemon", PROGRAMS / "twreportingd")
        wait_until(lambda: self.run_twctl("status").returncode == 0, "the daemon's answer", lambda: self.log("daemon"))
        return daemon

    def run_twctl(self, *arguments):
        return subprocess.run([PROGRAMS / "twctl", *map(str, arguments)], env=self.environment, capture_output=True, text=True, check=False, timeout=PATIENCE)

    def make_store(self, sessions=30):
        """Makes a store with so many sessions that have played, one after the other, on five devices."""
        lines = []
        for number in range(sessions):
            begin = 600.0 * number
            calls = [(0, "createReportingSession", [900 + number]), (0, "setServiceType", [7, 900 + number]),
                     (0, "setConfiguration", [{"HostApplicationDisplayID": f"org.example.Player{number % 3}"}, 900 + number]), (1, "startReportingSessionForID", [900 + number])]
            for after, payload in ((2, {"session_output_running": True, "QMSessionVolume": 0.5, "active_devices": f"Room {number % 5}"}), (400, {"session_output_running": False})):
                calls.append((after, "sendMessage", [{**payload, "twreporting_timestamp": {"now": 0}}, 5, 0, [900 + number]]))
            calls += [(500, "stopReportingSessionForID", [900 + number]), (501, "destroyReportingSession", [900 + number])]
            lines += [json.dumps({"at": begin + after, "call": call, "params": parameters}) for after, call, parameters in calls]
        file = self.directory / "past.jsonl"
        file.write_text("\n".join(lines) + "\n")
        made = self.run_twctl("replay", "--offline", file, "-o", self.store)
        if made.returncode != 0:
            raise RuntimeError(made.stderr)

    def serve(self, *arguments):
        """Starts `twctl serve` and returns it with its address."""
        name = f"serve{len(self.processes)}"
        server = self.start(name, PROGRAMS / "twctl", "serve", *map(str, arguments))
        wait_until(lambda: "\n" in self.log(name) or server.poll() is not None, "the address")
        return server, self.log(name).strip()

    def open_session(self, reporter, application, *messages):
        """Has a client open a session and keep it, with these payloads. Returns the client, whose end is that of the session."""
        calls = [{"call": "createReportingSession", "params": [reporter]}, {"call": "setServiceType", "params": [7, reporter]},
                 {"call": "setConfiguration", "params": [{"HostApplicationDisplayID": application}, reporter]},
                 {"call": "startReportingSessionForID", "params": [reporter]}]
        calls += [{"call": "sendMessage", "params": [{**payload, "twreporting_timestamp": {"now": 0}}, 5, 0, [reporter]]} for payload in messages]
        lines = [{"at": 0.0, **call} for call in calls] + [{"at": 36000.0, "call": "stopReportingSessionForID", "params": [reporter]}]
        file = self.directory / f"session{reporter}-{len(self.processes)}.jsonl"
        file.write_text("".join(json.dumps(line) + "\n" for line in lines))
        client = self.start(f"client{reporter}", PROGRAMS / "twctl", "replay", file)
        wait_until(lambda: str(reporter) in self.run_twctl("list", "--json").stdout, "the session", lambda: self.log(f"client{reporter}"))
        return client

    def say(self, reporter, **payload):
        """Sends the session a message."""
        sent = self.run_twctl("send", "--id", reporter, "--category", "Output", "--type", "Generic", "--payload", json.dumps(payload))
        if sent.returncode != 0:
            raise RuntimeError(sent.stderr)


class Graph:
    """A PipeWire graph of its own, with a sink and with the bridge to the daemon."""

    PROGRAMS = ("pipewire", "wireplumber", "pw-cli", "pw-dump", "pw-play", "wpctl", "dbus-daemon")

    @classmethod
    def missing(cls):
        return [program for program in cls.PROGRAMS if not shutil.which(program)]

    def __init__(self, machine):
        self.machine = machine
        runtime = machine.directory / "graph"
        runtime.mkdir(mode=0o700)
        self.environment = {"XDG_RUNTIME_DIR": str(runtime), "DBUS_SESSION_BUS_ADDRESS": f"unix:path={runtime}/bus"}
        self.start("dbus-daemon", "--session", "--nofork", "--nopidfile", f"--address=unix:path={runtime}/bus")
        wait_until((runtime / "bus").exists, "the bus")
        self.start("pipewire")
        wait_until(lambda: self.run("pw-cli", "info", "0").returncode == 0, "PipeWire", lambda: machine.log("graph"))
        self.start("wireplumber")
        wait_until(lambda: any(properties.get("application.name") == "WirePlumber" for _, _, properties, _ in self.objects()), "the session manager", lambda: machine.log("graph"))
        self.run("pw-cli", "create-node", "adapter", '{ factory.name=support.null-audio-sink node.name=speaker node.description="Test Speaker" '
                 "media.class=Audio/Sink object.linger=true audio.position=[FL FR] audio.rate=48000 }")
        wait_until(lambda: any(properties.get("node.name") == "speaker" for _, _, properties, _ in self.objects()), "the sink")
        machine.start("bridge", PROGRAMS / "tw-pipewire", "--verbose", **self.environment)
        wait_until(lambda: all(text in machine.log("bridge") for text in ("connected to PipeWire", "connected to the reporting daemon")), "the bridge", lambda: machine.log("bridge"))

    def start(self, *command):
        return self.machine.start("graph", *command, **self.environment)

    def run(self, *command):
        return subprocess.run(command, env={**self.machine.environment, **self.environment}, capture_output=True, text=True, check=False, timeout=PATIENCE)

    def objects(self):
        """(identifier, kind, properties, state) of each object."""
        try:
            dump = json.loads(self.run("pw-dump").stdout)
        except json.JSONDecodeError:
            return []
        return [(one["id"], one["type"], (one.get("info") or {}).get("props") or {}, (one.get("info") or {}).get("state")) for one in dump]

    def play(self, seconds=600):
        """Plays a tone. Returns the process, and the node's identifier when it runs."""
        tone = self.machine.directory / "tone.wav"
        rate = 8000
        samples = b"".join(struct.pack("<h", round(8000 * math.sin(2 * math.pi * 440 * i / rate))) for i in range(rate)) * seconds
        tone.write_bytes(b"RIFF" + struct.pack("<I", 36 + len(samples)) + b"WAVEfmt " + struct.pack("<IHHIIHH", 16, 1, 1, rate, 2 * rate, 2, 16) + b"data" + struct.pack("<I", len(samples)) + samples)
        player = self.start("pw-play", tone)
        node = wait_until(lambda: next((identifier for identifier, _, properties, state in self.objects() if properties.get("node.name") == "pw-play" and state == "running"), None), "playback")
        return player, node
