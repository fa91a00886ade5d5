# SPDX-License-Identifier: Apache-2.0
"""Runs the queries of docs/guide/analyse.md as they stand, with twctl on a small store, and those for DuckDB where there is one."""

import json
import os
import pathlib
import re
import shutil
import subprocess
import tempfile
import unittest

from programs import PROGRAMS, SOURCE, run
from store_fixture import COLUMNS, begin_of_last_hour, make_store

PAGE = SOURCE / "docs/guide/analyse.md"
DUCKDB_READS = ("read_csv(", "read_json(")
DUCKDB_DOWNLOADS = "INSTALL "
# Makes one run of DuckDB in Node of the statements in the environment.
NODE = """
const { DuckDBInstance } = require('@duckdb/node-api');
(async () => {
  const connection = await (await DuckDBInstance.create(':memory:')).connect();
  const answer = await connection.runAndReadAll(process.env.STATEMENT);
  console.log(JSON.stringify(answer.getRowObjectsJson()));
})().catch((error) => { console.error(String(error)); process.exit(1); });
"""


def blocks(language):
    return re.findall(rf"^```{language}\n(.*?)^```", PAGE.read_text(), re.DOTALL | re.MULTILINE)


def is_for_duckdb(query):
    return any(word in query for word in (*DUCKDB_READS, DUCKDB_DOWNLOADS))


def is_for_grafana(query):
    return "$__" in query


def grafana_queries():
    """The queries with the plugin's macros, on their own and in the panels."""
    panels = [json.loads(block) for block in blocks("json")]
    return [query for query in blocks("sql") if is_for_grafana(query)] + [
        target["queryText"] for panel in panels for target in panel["targets"]
    ]


def without_macros(query, begin, end):
    """Does what the plugin does before it runs a query."""
    query = re.sub(r"\$__unixEpochGroupSeconds\((\w+), (\d+)\)", r"cast((\1 / \2) as int) * \2", query)
    return query.replace("$__from", str(int(begin * 1000))).replace("$__to", str(int(end * 1000)))


def duckdb():
    """How to run DuckDB here: returns a function from a query and a directory to rows; None when it is not there."""
    if command := shutil.which("duckdb"):
        return lambda query, directory: answer_of([command, "-json", "-c", query], directory, {})
    modules = os.pathsep.join([os.environ.get("NODE_PATH", ""), str(SOURCE / "build/duckdb/node_modules")])
    node = shutil.which("node")
    if node is None or run([node, "-e", "require('@duckdb/node-api')"], env={"NODE_PATH": modules}).returncode != 0:
        return None
    return lambda query, directory: answer_of([node, "-e", NODE], directory, {"NODE_PATH": modules, "STATEMENT": query})


def answer_of(command, directory, environment):
    answer = run(command, cwd=directory, env={"PATH": "/usr/bin:/bin", **environment})
    if answer.returncode != 0:
        raise AssertionError(answer.stderr)
    return json.loads(answer.stdout)


class AnalysisTest(unittest.TestCase):
    maxDiff = None

    def setUp(self):
        scratch = tempfile.TemporaryDirectory()
        self.addCleanup(scratch.cleanup)
        self.state = pathlib.Path(scratch.name)
        self.hour = begin_of_last_hour()
        make_store(self.state / "reports.db", self.hour)

    def twctl(self, *arguments, state=None):
        return run([PROGRAMS / "twctl", *arguments], env={"STATE_DIRECTORY": str(state or self.state), "TZ": "UTC"})

    def ask(self, query, state=None):
        answer = self.twctl("sql", "--json", query, state=state)
        self.assertEqual((answer.returncode, answer.stderr), (0, ""), query)
        return [json.loads(line) for line in answer.stdout.splitlines()]

    def query_with(self, words):
        (query,) = [query for query in blocks("sql") if words in query]
        return query

    def answer(self, words):
        """The rows of the one query of the page that has these words, as tuples."""
        return [tuple(row.values()) for row in self.ask(self.query_with(words))]

    def test_every_query_for_sqlite_finds_rows(self):
        queries = [query for query in blocks("sql") if not is_for_duckdb(query) and not is_for_grafana(query)]
        self.assertGreater(len(queries), 12)
        for query in queries:
            with self.subTest(query=query):
                rows = self.ask(query)
                self.assertNotEqual(rows, [])
                for column in rows[0]:
                    self.assertTrue(any(row[column] is not None for row in rows), f"{column} is never known")

    def test_queries_give_the_right_answers(self):
        player, phone = "com.example.player", "com.example.phone"
        self.assertEqual([row[0] for row in self.answer("ORDER BY started_at DESC LIMIT 20")], [4, 3, 2, 1])
        self.assertEqual([row[4] for row in self.answer("SELECT max(id) FROM session")], [{}])
        self.assertEqual(self.answer("payload ->> 'QMSessionVolume' AS volume, count"), [(0.5, 2)])
        self.assertEqual(
            self.answer("volume_bucket, round(sum(seconds)"),
            [(phone, None, 10), (phone, 0.75, 30), (player, 0.25, 120), (player, 0.5, 120)],
        )
        ((_, seconds, volume),) = self.answer("'%Y-%m-%d %H:00'")
        self.assertEqual((seconds, volume), (270, round((0.5 * 120 + 0.25 * 120 + 0.75 * 30) / 270, 2)))
        self.assertEqual(self.answer("max(volume) AS loudest"), [(player, 0.5, 1, 5)])
        self.assertEqual(self.answer("'recorded', device")[-1], ("recorded", "Microphone", 0.01))
        self.assertEqual(self.answer("FROM gather_stretch"), [(phone, 20, 50)])
        self.assertEqual([row[:2] + row[3:] for row in self.answer("JOIN issue AS i")], [(2, player, 2, 128), (3, phone, 1, 256)])
        self.assertEqual(self.answer("GROUP BY buffer_frames"), [(128, player, 2, 0.5), (256, phone, 1, 0.1)])
        self.assertEqual(
            sorted(self.answer("coalesce(ending, 'running')")),
            [("interrupted", 1, 10, 0), ("running", 1, None, None), ("stopped", 2, 40, 30)],
        )
        self.assertEqual(
            self.answer("FROM channel_bucket"),
            [("amp", "latency", "ms", 0, 10, 6, 75), ("amp", "latency", "ms", 10, 100, 2, 25)],
        )
        self.assertEqual(self.answer("FROM channel_value"), [("amp", "Tx", "underruns", 7)])
        self.assertEqual(self.answer("FROM channel_state"), [("amp", "power", "on", 3, 0.375)])
        self.assertEqual(
            self.answer("FROM haptics"),
            [("not known", "LeakedHapticsSessionInfo", 1, 1), ("com.example.keyboard", "EngineOnDuration", 2, 0.375)],
        )

    def test_names_views_and_columns_that_there_are(self):
        table = re.findall(r"^\| `(\w+)` \|.*\|(.*)\|$", PAGE.read_text(), re.MULTILINE)
        self.assertEqual(sorted(view for view, _ in table), sorted(COLUMNS))
        for view, columns in table:
            named = set(re.findall(r"`(\w+)`", columns))
            self.assertGreater(len(named), 2)
            self.assertLessEqual(named, {column.split()[0] for column in COLUMNS[view].split(",")}, view)

    def test_queries_for_grafana_find_rows_in_the_range(self):
        queries = grafana_queries()
        self.assertGreaterEqual(len(queries), 4)
        for query in queries:
            with self.subTest(query=query):
                rows = self.ask(without_macros(query, self.hour, self.hour + 3600))
                self.assertNotEqual(rows, [])
                for row in rows:
                    if "time" in row:
                        self.assertGreaterEqual(row["time"], self.hour)
                self.assertEqual(self.ask(without_macros(query, self.hour - 7200, self.hour)), [])

    def test_panels_are_whole(self):
        panels = [json.loads(block) for block in blocks("json")]
        self.assertGreaterEqual(len(panels), 2)
        for panel in panels:
            self.assertEqual(panel["datasource"]["type"], "frser-sqlite-datasource")
            for target in panel["targets"]:
                self.assertEqual(target["datasource"], panel["datasource"])
                self.assertEqual(target["rawQueryText"], target["queryText"])
                self.assertIn(target["queryType"], ("table", "time series"))
                if target["queryType"] == "time series":
                    self.assertEqual(target["timeColumns"], ["time"])
                    self.assertIn(" AS time,", target["queryText"])

    def test_exports_of_the_page_are_made(self):
        commands = [line for block in blocks("sh") for line in block.splitlines() if line.startswith("twctl export")]
        self.assertGreaterEqual(len(commands), 3)
        for command in commands:
            with self.subTest(command=command):
                answer = subprocess.run(
                    ["bash", "-euo", "pipefail", "-c", command],
                    cwd=self.state,
                    env={"PATH": f"{PROGRAMS}:/usr/bin:/bin", "STATE_DIRECTORY": str(self.state)},
                    capture_output=True,
                    text=True,
                    timeout=60,
                )
                self.assertEqual((answer.returncode, answer.stderr), (0, ""))
        self.assertIn("com.example.phone", (self.state / "volume_stretch.csv").read_text())
        self.assertEqual(json.loads((self.state / "event.jsonl").read_text().splitlines()[0])["payload"], {"QMSessionVolume": 0.5})

    def test_queries_for_duckdb_find_the_rows_of_all_devices(self):
        ask = duckdb()
        if ask is None:
            self.skipTest("there is no duckdb")
        for device in ("kitchen", "hall"):
            (self.state / device).mkdir()
            for view, file in (("volume_stretch", "csv"), ("session", "csv"), ("event", "jsonl")):
                answer = self.twctl("export", "--format", file, view, "-o", str(self.state / device / f"{view}.{file}"))
                self.assertEqual(answer.returncode, 0, answer.stderr)
        queries = [query for query in blocks("sql") if is_for_duckdb(query) and DUCKDB_DOWNLOADS not in query]
        self.assertGreaterEqual(len(queries), 3)
        for query in queries:
            with self.subTest(query=query):
                rows = ask(query, self.state)
                self.assertNotEqual(rows, [])
                if "AS device" in query:
                    self.assertEqual({row["device"] for row in rows}, {"kitchen", "hall"})
        (messages,) = [query for query in queries if "read_json(" in query]
        volumes = {(row["category"], row["type"]): row["average_volume"] for row in ask(messages, self.state)}
        self.assertEqual(volumes, {("Volume", "Generic"): 0.5, ("Volume", "Summary"): None, ("Playback", "Start"): None})

    def test_queries_run_on_a_store_of_the_daemon(self):
        state = self.state / "replayed"
        state.mkdir()
        recording = SOURCE / "examples/music-session.jsonl"
        answer = self.twctl("replay", "--offline", str(recording), "-o", str(state / "reports.db"))
        self.assertEqual(answer.returncode, 0, answer.stderr)
        for view, columns in COLUMNS.items():
            wanted = [column.split()[0] for column in columns.split(",")]
            found = [row["name"] for row in self.ask(f"SELECT name FROM pragma_table_xinfo('{view}')", state)]
            self.assertEqual(found, wanted, view)
        queries = [query for query in blocks("sql") if not is_for_duckdb(query)] + grafana_queries()
        for query in queries:
            with self.subTest(query=query):
                self.ask(without_macros(query, 0, 2e9), state)
        self.assertNotEqual(self.ask("SELECT * FROM volume_stretch", state), [])


if __name__ == "__main__":
    unittest.main()
