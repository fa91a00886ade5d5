#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Makes a report store that looks like 30 days of one device: music, calls, alarms, a game with haptics, a studio program whose
small buffers overload, on several devices. The file has the store's views as tables, and nothing else.

The same arguments always give the same rows."""

import argparse
import json
import pathlib
import random
import re
import sqlite3

from store_views import schema, schema_version

DAY = 86400
END = 1795176000  # 2026-11-20 12:00 UTC
DRIVER = "SpeakerAmp"


class Device:
    """Writes what happened on one device."""

    def __init__(self, path, seed):
        path.unlink(missing_ok=True)
        self.database = sqlite3.connect(path)
        self.database.executescript("PRAGMA journal_mode = OFF; PRAGMA synchronous = OFF;" + schema() + f"PRAGMA user_version = {schema_version()};")
        self.random = random.Random(seed)
        self.verdicts = random.Random(seed)  # of its own, so that the rest stays as it is
        self.sessions = 0
        self.rows = {}

    def add(self, table, *values):
        rows = self.rows.setdefault(table, [])
        rows.append(values)
        if len(rows) == 5000:
            self.write(table)

    def write(self, table):
        rows = self.rows.pop(table)
        self.database.executemany(f"INSERT INTO {table} VALUES ({','.join('?' * len(rows[0]))})", rows)

    def close(self):
        for table in list(self.rows):
            self.write(table)
        self.database.commit()
        self.database.close()

    def message(self, at, session, category, type_, source="client", **payload):
        self.ids = getattr(self, "ids", 0) + 1
        self.add("event", self.ids, at, session, category, type_, source, json.dumps(payload))

    def session(self, at, service, application, stretches, ending="stopped", input_device=None, buffer=None, overload_rate=0.0):
        """stretches: (seconds, device, volume, ringer); without a device it is a pause."""
        self.sessions += 1
        session, now, overloads, active = self.sessions, at, 0, 0.0
        process = re.sub(r"\W", "", application or "unknown").lower()[:15]
        self.message(at, session, "Playback", "Start")
        for seconds, device, volume, ringer in stretches:
            if device:
                self.add("volume_stretch", session * 100 + overloads, session, service, application, now, now + seconds, seconds, device,
                         volume, max(1, round(volume * 16)) / 16, 48000, 2, "S32LE", ringer, 0)
                self.message(now, session, "Volume", "Generic", QMSessionVolume=volume)
                active += seconds
                count = int(self.random.expovariate(1) * overload_rate * seconds / 600)
                for _ in range(count):
                    overloads += 1
                    when = now + self.random.random() * seconds
                    duration = round(self.random.expovariate(1 / 0.02), 4)
                    self.add("issue", session * 100 + overloads, when, session, service, application, "overload", "mixer", duration, buffer,
                             int(buffer * 1e6 / 48000))
                    self.message(when, session, "HAL_Performance", "IssueDetector")
                    self.glitch(session * 100 + overloads, when, session, service, application, process, buffer)
            now += seconds
        if input_device:
            self.add("input_stretch", session, session, service, application, at, now, now - at, input_device, "voice",
                     input_device + " port", "EVS:16000")
        if active > 300 and self.random.random() < 0.02:
            self.add("issue", session * 100 + 99, at + active / 2, session, service, application, "silence", None, 1.5, None, None)
        if active:
            self.add("gather_stretch", session, session, service, application, at, now, active, stretches[0][1], 48000, 2, "S32LE")
            self.message(now, session, "Volume", "Summary", "derived")
        runs = ending is None
        messages = len(stretches) * 3 + overloads + 2
        self.message(now, session, "Playback", "Stop")
        self.add("session", session, 1000 + session % 7, service, application, process, 1000, at, None if runs else now, ending,
                 *((None,) * 5 if runs else (messages, messages - len(stretches), len(stretches), active, overloads)))
        if not runs and active > 60:
            self.drivers(session, now, active)
        return now

    def glitch(self, event, at, session, service, application, process, buffer):
        """The verdict on an overload. Nobody has judged some of them."""
        period = buffer / 48
        over = round(min(500.0, self.verdicts.expovariate(1 / 2.5)) + 0.1, 3)
        kind = self.verdicts.choices(("late", "effect", "hog", "device", "stuck", "unknown", "unjudged"), (40, 22, 14, 9, 5, 4, 6))[0]
        name = None if kind == "unjudged" else f"{int(at * 1000)}-{int(at * 48000 / buffer) % 1000000}"
        node, device = process, "alsa_output.usb-interface"
        own, first, culprit = {
            "late": ("late", "late", (application, process, 2100, node)),
            "effect": ("waiting for another", "late", ("Room Equalizer", "equalizer", 1870, "room-eq")),
            "hog": ("not scheduled", "not scheduled", (None, "backup", 990, node)),
            "device": ("device", "device", (None, None, None, device)),
            "stuck": ("stuck", "stuck", ("Soft Synth", "synth", 3001, "synth")),
        }.get(kind, (None, None, (None, None, None, None)))
        chain = f"{culprit[3]} > {node} > {device}" if own == "waiting for another" else None
        reason = {
            "hog": f"{node} was ready and did not run for {over:.1f} ms: backup had its processor.",
            "device": f"{device} asked for the next cycle {over:.1f} ms late.",
            "stuck": "synth did not answer for 4 cycles.",
        }.get(kind, None if own is None else f"{culprit[3]} took {period + over:.1f} ms of {period:.1f} ms.")
        begin = [0.0] if culprit[3] is None else [-period * 1000, 0.0, period * 1000]
        cycles = [{"begin": round(time, 1), "period": round(period * 1000, 1), "nodes": [
            {"name": one, "process": one, "signal": 10.0, "awake": 15.0 + 50 * i, "finish": round(40.0 + 200 * i + (1000 * (period + over) if time == 0 else 0), 1)}
            for i, one in enumerate(sorted({culprit[3], node}))]} for time in begin if culprit[3]]
        self.add("glitch", event, at + 0.002, at, name, session, service, application, own, first, None if name is None else round(self.verdicts.uniform(0.5, 1), 2),
                 *culprit[:3], culprit[3], node if own else None, device if own else None, chain, over if own else None, period, buffer, 48000,
                 round(period, 3), self.verdicts.choice((1, 1, 1, 4)), reason, json.dumps(cycles) if cycles else None)

    def drivers(self, session, at, active):
        key = (session, at, DRIVER)
        for i, share in enumerate((30, 42, 16, 8, 3, 1)):
            hits = int(active / 60 * share * self.random.uniform(0.7, 1.3))
            self.add("channel_bucket", *key, "StateTransitionTimes_ms", "", "Wake time", "ms", 0 if i == 0 else 2 ** (i - 1), 2 ** i, hits)
        for i, share in enumerate((5, 20, 45, 22, 8)):
            hits = int(active * share * self.random.uniform(0.7, 1.3))
            self.add("channel_bucket", *key, "Speaker", "Left", "Temperature", "°C", 20 + i * 10, 30 + i * 10, hits)
        busy = int(active * self.random.uniform(0.6, 0.95) * 1000)
        for state, residency in (("on", busy), ("idle", int(active * 1000) - busy), ("limited", busy // 40)):
            self.add("channel_state", *key, "Speaker", "Left", "Amplifier", state, int(active / 30) + 1, residency, residency / (active * 1000))
        self.add("channel_value", *key, "Speaker", "Left", "Protection events", "", self.random.randrange(3))
        self.add("channel_value", *key, "Tx", "", "Underruns", "", self.random.randrange(2))

    def volume(self, hour, base):
        quiet = 0.4 if hour >= 22 or hour < 7 else 0.8 if hour < 9 else 1.0
        return round(min(1.0, max(0.06, self.random.gauss(base, 0.1))) * quiet * 16) / 16

    def music(self, at, hour, weekend):
        device = "Kitchen Bluetooth" if 17 <= hour < 20 else "Car" if hour in (8, 17) and not weekend else self.random.choice(["Headphones", "Speaker"])
        base = {"Kitchen Bluetooth": 0.62, "Car": 0.75, "Headphones": 0.45, "Speaker": 0.55}[device]
        stretches = []
        for _ in range(self.random.randrange(2, 8)):
            stretches.append((self.random.uniform(240, 1200), device, max(0.0625, self.volume(hour, base)), 0))
            if self.random.random() < 0.25:
                stretches.append((self.random.uniform(20, 400), None, 0, 0))
        return self.session(at, "longformaudio", "Melody Player", stretches, self.random.choice(["stopped"] * 9 + ["disconnected"]))

    def call(self, at, hour):
        ring = (self.random.uniform(4, 20), "Speaker", 0.8125, 1)
        talk = (self.random.expovariate(1 / 420) + 20, self.random.choice(["Earpiece", "Headphones", "Speaker"]), self.volume(hour, 0.6) or 0.0625, 0)
        return self.session(at, "telephony", "Phone", [ring, talk], input_device="Built-in Microphone")

    def studio(self, at, hour, rate):
        buffer = self.random.choice([32, 64, 64, 128, 128, 256, 512])
        stretches = [(self.random.uniform(200, 900), "Headphones", max(0.0625, self.volume(hour, 0.7)), 0) for _ in range(self.random.randrange(3, 7))]
        return self.session(at, "nonlongformaudio", "Pocket Studio", stretches, self.random.choice(["stopped"] * 4 + ["interrupted"]),
                            input_device="USB Microphone", buffer=buffer, overload_rate=rate * {32: 9, 64: 4, 128: 1.2, 256: 0.3, 512: 0.05}[buffer])

    def game(self, at, hour):
        length = self.random.uniform(300, 1800)
        for _ in range(int(length / 60)):
            self.add("haptics", self.sessions, at + self.random.random() * length, "Puzzle Garden", "Flumen_Haptics_EngineOnDuration",
                     round(self.random.expovariate(1 / 0.8), 3), None)
        return self.session(at, "nonlongformaudio", "Puzzle Garden", [(length, "Speaker", max(0.0625, self.volume(hour, 0.35)), 0)])

    def alarm(self, at):
        for i in range(3):
            self.add("haptics", self.sessions, at + i * 9, "Clock", "Flumen_Haptics_EngineOnDuration", 4.0, None)
        return self.session(at, "alarms", "Clock", [(self.random.uniform(20, 70), "Speaker", 0.6875, 1)])

    def day(self, start, weekend, rate):
        self.alarm(start + (8.5 if weekend else 6.75) * 3600)
        for hour in ([10, 14, 18, 21] if weekend else [8, 12, 17, 18, 21]):
            if self.random.random() < 0.75:
                self.music(start + (hour + self.random.random() * 0.8) * 3600, hour, weekend)
        for _ in range(self.random.randrange(1, 5)):
            hour = self.random.randrange(9, 21)
            self.call(start + (hour + self.random.random()) * 3600, hour)
        if self.random.random() < (0.8 if weekend else 0.35):
            self.studio(start + (19.5 + self.random.random() * 2) * 3600, 20, rate)
        if self.random.random() < 0.6:
            self.game(start + (13 + self.random.random() * 8) * 3600, 15)


def main():
    parser = argparse.ArgumentParser(description=__doc__.split("\n\n", maxsplit=1)[0])
    parser.add_argument("file", type=pathlib.Path)
    parser.add_argument("--days", type=int, default=30)
    parser.add_argument("--times", type=int, default=1, help="so many devices' sessions in one store, for a large one")
    parser.add_argument("--application", help="one more session, of an application with this name")
    parser.add_argument("--seed", type=int, default=7)
    arguments = parser.parse_args()
    arguments.file.parent.mkdir(parents=True, exist_ok=True)
    device = Device(arguments.file, arguments.seed)
    midnight = END - END % DAY
    for day in range(arguments.days):
        start = midnight - (arguments.days - day) * DAY
        for _ in range(arguments.times):
            device.day(start, (start // DAY + 3) % 7 >= 5, 1.0 if day < arguments.days * 2 / 3 else 2.5)
    if arguments.application is not None:
        device.session(END - 7200, arguments.application, arguments.application, [(600, arguments.application, 0.5, 0)],
                       input_device=arguments.application, buffer=64, overload_rate=50)
        device.add("haptics", 1, END - 7000, arguments.application, arguments.application, 2.0, None)
    device.session(END - 1500, "longformaudio", "Melody Player", [(700, "Headphones", 0.4375, 0), (600, "Headphones", 0.5, 0)], None)
    device.close()


if __name__ == "__main__":
    main()
