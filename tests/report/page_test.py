# SPDX-License-Identifier: Apache-2.0
"""Looks at the page of `twctl report` in a browser: the marks are where the data say, and names from programs do nothing."""

import json
import math
import os
import pathlib
import re
import sqlite3
import subprocess
import sys
import tempfile
import unittest

from browser import Browser

SOURCE = pathlib.Path(__file__).resolve().parents[2]
PROGRAMS = pathlib.Path(os.environ.get("TONEWERK_PROGRAMS", SOURCE / "build/dev/src"))
HOSTILE = "</script><img src=x onerror=\"document.title='taken'\"><svg onload=alert(1)>\u202e{{nonce}}" + "x" * 200

MARKS = """(kind) => [...document.querySelectorAll(`[data-mark=${kind}]`)].map((mark) => ({...mark.dataset,
  ...Object.fromEntries(["x", "y", "width", "height", "x1", "x2", "y1", "y2"].map((name) => ["_" + name, Number(mark.getAttribute(name))])),
  fill: mark.getAttribute("fill")}))"""
SCALE = "({...document.querySelector('#timeline .picture svg').dataset})"
# The visible texts of each picture that lie over another text or outside of the window.
CLASHES = """[...document.querySelectorAll('.picture svg')].flatMap((svg) => {
  const texts = [...svg.querySelectorAll('text')].flatMap((text) => {
    const box = text.getBoundingClientRect();
    return text.textContent && box.width ? [{text: text.textContent, box}] : [];
  });
  const found = texts.filter(({box}) => box.left < -1 || box.right > document.documentElement.clientWidth + 1).map(({text}) => `outside: ${text}`);
  texts.forEach((one, i) => texts.slice(i + 1).forEach((other) => {
    const wide = Math.min(one.box.right, other.box.right) - Math.max(one.box.left, other.box.left);
    const high = Math.min(one.box.bottom, other.box.bottom) - Math.max(one.box.top, other.box.top);
    if (wide > 1 && high > 4) found.push(`${one.text} / ${other.text}`);
  }));
  return found;
})"""

# The words of at most ten letters in the table of glitches that go on in the next line.
BROKEN_WORDS = """[...document.querySelectorAll('#glitches th, #glitches td')].flatMap((cell) => {
  const range = document.createRange();
  return [...cell.textContent.matchAll(/[a-z]{2,10}/gi)].flatMap((word) => {
    range.setStart(cell.firstChild, word.index);
    range.setEnd(cell.firstChild, word.index + word[0].length);
    return range.getClientRects().length > 1 && word[0].length === cell.textContent.match(/\\S+/g).find((whole) => whole.includes(word[0])).length ? [word[0]] : [];
  });
})"""

NOTHING = "".join(f"DELETE FROM {table};" for table in ("session", "event", "volume_stretch", "input_stretch", "gather_stretch", "issue", "glitch", "haptics", "channel_value", "channel_bucket", "channel_state"))


def played(session, begin, end, application="Melody", day=1795132800):
    """The SQL that inserts a session that played all the time, from and until so many seconds after `day`."""
    return (f"INSERT INTO session (id, application, started_at, ended_at, ending) VALUES ({session}, '{application}', {day + begin}, {day + end}, 'stopped');"
            f"INSERT INTO volume_stretch (id, session, application, started_at, ended_at, seconds, device, volume) VALUES ({session}, {session}, '{application}', {day + begin}, {day + end}, {end - begin}, 'Speaker', 0.5);")


class Page:
    """A store and the page of it."""

    def __init__(self, scratch, name, *arguments, options=(), zone="UTC", change=None):
        self.state = scratch / name
        subprocess.run([sys.executable, "-B", SOURCE / "tests/support/reports/make_demo_store.py", self.state / "reports.db", *arguments], check=True)
        self.database = sqlite3.connect(self.state / "reports.db")
        if change:
            self.database.executescript(change)
        self.path = self.state / "report.html"
        made = run_twctl(self.state, "report", "-o", self.path, *options, zone=zone)
        assert made.returncode == 0, made.stderr

    def query(self, sql):
        return self.database.execute(sql).fetchall()


def run_twctl(state, *arguments, zone="UTC"):
    environment = {"PATH": os.environ["PATH"], "STATE_DIRECTORY": str(state), "CONFIGURATION_DIRECTORY": str(state / "none"), "TZ": zone,
                   "TONEWERK_REPORTING_SOCKET": str(state / "none.sock"), "LSAN_OPTIONS": os.environ.get("LSAN_OPTIONS", "")}
    return subprocess.run([PROGRAMS / "twctl", *arguments], env=environment, capture_output=True, text=True, check=False)


class PageTest(unittest.TestCase):
    def setUp(self):
        scratch = tempfile.TemporaryDirectory()
        self.addCleanup(scratch.cleanup)
        self.scratch = pathlib.Path(scratch.name)
        self.browser = Browser()
        self.addCleanup(self.browser.close)

    def show(self, *arguments, width=1200, dark=False, **options):
        page = Page(self.scratch, f"state{len(list(self.scratch.iterdir()))}", *arguments, **options)
        self.browser.open(page.path, width=width, dark=dark, mobile=width < 500)
        self.assert_clean()
        return page

    def assert_clean(self):
        self.assertEqual(self.browser.problems, [])
        self.assertEqual(self.browser.evaluate("document.documentElement.dataset.ready"), "yes")

    def marks(self, kind):
        return self.browser.evaluate(f"({MARKS})('{kind}')")

    def text(self, selector="main"):
        return self.browser.evaluate(f"document.querySelector({json.dumps(selector)}).innerText")

    # Waits for the frame after a zoom, then compares all stretches with the scale.
    def assert_stretches_follow_the_scale(self):
        self.browser.evaluate("new Promise((done) => requestAnimationFrame(() => requestAnimationFrame(done)))")
        scale = {key: float(value) for key, value in self.browser.evaluate(SCALE).items()}
        per_second = (scale["right"] - scale["left"]) / (scale["until"] - scale["from"])
        marks = self.marks("stretch")
        for mark in marks:
            started, ended = float(mark["started"]), float(mark["ended"])
            # An edge may be rounded to a millisecond.
            self.assertAlmostEqual(mark["_x"], scale["left"] + (started - scale["from"]) * per_second, delta=0.1 + per_second / 500)
            self.assertAlmostEqual(mark["_width"], (ended - started) * per_second, delta=0.1 + per_second / 500)
            self.assertAlmostEqual(mark["_height"], 32 * float(mark["volume"]), delta=0.1)
        return scale, marks

    def test_draws_without_an_error_and_without_a_network(self):
        page = self.show()
        self.assertEqual(self.browser.requests, [f"file://{page.path}"])
        self.assertGreater(self.browser.evaluate("document.querySelectorAll('.picture svg').length"), 8)

    def test_puts_every_stretch_where_its_time_and_volume_say(self):
        page = self.show("--days", "3")
        _, marks = self.assert_stretches_follow_the_scale()
        expected = page.query("SELECT session, round(started_at, 1), volume FROM volume_stretch ORDER BY 1, 2")
        found = sorted((int(mark["session"]), round(float(mark["started"]), 1), float(mark["volume"])) for mark in marks)
        self.assertEqual(found, expected)

    def test_puts_overloads_at_their_times(self):
        page = self.show()
        scale = {key: float(value) for key, value in self.browser.evaluate(SCALE).items()}
        marks = self.marks("overload")
        expected = page.query("SELECT count(*) FROM issue WHERE kind = 'overload'")[0][0]
        self.assertEqual(len(marks), expected)
        self.assertGreater(expected, 5)
        for mark in marks:
            place = scale["left"] + (float(mark["at"]) - scale["from"]) / (scale["until"] - scale["from"]) * (scale["right"] - scale["left"])
            self.assertAlmostEqual(mark["_x1"], place, delta=0.2)

    def test_puts_glitches_at_their_times_with_whose_they_were(self):
        page = self.show(change="UPDATE glitch SET glitch_id = (SELECT glitch_id FROM glitch WHERE culprit_application = 'Soft Synth' ORDER BY id LIMIT 1) WHERE culprit_application = 'Soft Synth'")
        scale = {key: float(value) for key, value in self.browser.evaluate(SCALE).items()}
        marks = self.marks("glitch")
        expected = page.query("""SELECT min(began_at), coalesce(culprit_application, CASE first_cause WHEN 'device' THEN 'the device' END, culprit_process, 'not known'),
            coalesce(first_cause, 'not known') FROM glitch GROUP BY coalesce(glitch_id, id) ORDER BY 1""")
        found = sorted((float(mark["at"]), mark["culprit"], mark["cause"]) for mark in marks)
        self.assertEqual([row[1:] for row in found], [row[1:] for row in expected])
        for (at, _, _), (right, _, _) in zip(found, expected):
            self.assertAlmostEqual(at, right, delta=0.001)
        self.assertEqual(sum(culprit == "Soft Synth" for _, culprit, _ in expected), 1)  # many sessions heard it
        self.assertGreater(len(expected), 50)
        for mark in marks:
            place = scale["left"] + (float(mark["at"]) - scale["from"]) / (scale["until"] - scale["from"]) * (scale["right"] - scale["left"])
            self.assertAlmostEqual(mark["_x1"], place, delta=0.2)
        self.assertIn("Glitches, and whose they were", self.browser.evaluate("document.querySelector('#timeline svg').textContent"))
        titles = self.browser.evaluate("[...document.querySelectorAll('[data-mark=glitch] title')].map((title) => title.textContent)")
        self.assertTrue(any(re.match(r"backup: not scheduled at .*, [0-9.]+ ms beyond the deadline, [0-9.]+ ms lost(, 4 times within a second)?; heard by Pocket Studio$", title) for title in titles))

    def test_ranks_who_caused_how_many_glitches(self):
        who = "while backup ran for 80.0 ms at real-time priority 90."
        page = self.show(change=f"UPDATE glitch SET reason = 'pocketstudio woke 2.4 ms after its signal of 1.3 ms that it had; it waited for a processor for 2.38 ms, without a real-time priority, {who}'")
        expected = page.query("""SELECT coalesce(culprit_application, CASE first_cause WHEN 'device' THEN 'the device' END, culprit_process, 'not known') AS who, sum(overloads)
            FROM glitch GROUP BY who ORDER BY 2 DESC, sum(lost_ms) DESC""")
        bars = self.browser.evaluate("[...document.querySelectorAll('#culprits [data-mark=bar]')].map((bar) => [bar.dataset.name, Number(bar.dataset.seconds), Number(bar.getAttribute('width'))])")
        self.assertEqual([(name, number) for name, number, _ in bars], expected)
        for _, number, width in bars:
            self.assertAlmostEqual(width / bars[0][2], number / bars[0][1], delta=0.005)
        everything = sum(number for _, number in expected)
        self.assertIn(f"Of {everything} glitches, {expected[0][0]} caused {expected[0][1]} ({math.floor(100 * expected[0][1] / everything + 0.5)} %)", self.text(".findings"))
        self.assertEqual(self.browser.evaluate("document.querySelectorAll('#glitches tbody tr').length"), 100)
        newest = page.query("SELECT id, reason FROM glitch ORDER BY began_at DESC LIMIT 1")[0]
        row = self.browser.evaluate("[...document.querySelectorAll('#glitches tbody tr')][0].innerText")
        self.assertTrue(row.startswith(str(newest[0])) and newest[1] in row and who in row, row)

    def test_says_when_nobody_judged_the_overloads(self):
        self.show("--days", "10", change="UPDATE glitch SET glitch_id = NULL, cause = NULL, first_cause = NULL, culprit_application = NULL, culprit_process = NULL, culprit_node = NULL")
        self.assertIn("Nobody judged whose these overloads were", self.text("#culprits"))
        self.assertIn("not judged", self.text("#glitches"))
        self.assertNotIn("caused", self.text(".findings"))

    def test_gives_each_session_a_lane_of_its_own_on_request(self):
        self.show("--days", "3")
        both = "(kind) => { const lanes = document.getElementById('lanes'); lanes.value = kind; lanes.dispatchEvent(new Event('change')); }"
        places = {}
        for kind in ("application", "session"):
            self.browser.evaluate(f"({both})('{kind}')")
            _, marks = self.assert_stretches_follow_the_scale()
            places[kind] = {mark["session"]: round(mark["_y"] + mark["_height"]) for mark in marks}
        self.assertLess(len(set(places["application"].values())), len(places["application"]))
        self.assertEqual(len(set(places["session"].values())), len(places["session"]))

    def test_makes_bars_in_proportion_to_seconds(self):
        page = self.show()
        for name, column in (("by-application", "application"), ("by-device", "device")):
            expected = dict(page.query(f"SELECT {column}, sum(seconds) FROM volume_stretch GROUP BY 1"))
            bars = [mark for mark in self.marks("bar") if mark["name"] in expected]
            seconds, widths = {}, {}
            found = self.browser.evaluate(f"({MARKS})('bar').length && [...document.querySelectorAll('#{name} [data-mark=bar]')].map((bar) => [bar.dataset.name, Number(bar.dataset.seconds), Number(bar.getAttribute('width'))])")
            for bar, part, width in found:
                seconds[bar] = seconds.get(bar, 0) + part
                widths[bar] = widths.get(bar, 0) + width
            self.assertTrue(bars)
            self.assertEqual(set(seconds), set(expected))
            longest = max(expected, key=expected.get)
            for bar, sum_of_bar in expected.items():
                self.assertAlmostEqual(seconds[bar], sum_of_bar, delta=0.1)
                self.assertAlmostEqual(widths[bar] / widths[longest], sum_of_bar / expected[longest], delta=0.005)

    def test_makes_columns_in_proportion_to_counts(self):
        page = self.show()
        for name, sql in (
            ("overloads", "SELECT count(*) FROM issue WHERE kind = 'overload' GROUP BY CAST(at / 86400 AS INTEGER) ORDER BY min(at)"),
            ("buffers", "SELECT count(*) FROM issue WHERE kind = 'overload' GROUP BY buffer_frames ORDER BY buffer_frames"),
        ):
            expected = [row[0] for row in page.query(sql)]
            found = self.browser.evaluate(f"[...document.querySelectorAll('#{name} [data-mark=column]')].map((bar) => [Number(bar.dataset.value), Number(bar.getAttribute('height'))])")
            self.assertEqual([value for value, _ in found], expected)
            greatest = max(height for _, height in found)
            for value, height in found:
                self.assertAlmostEqual(height / greatest, value / max(expected), delta=0.01)

    def test_colours_an_hour_by_its_average_volume(self):
        page = self.show("--days", "4")
        hours = {}
        for started, ended, volume in page.query("SELECT started_at, ended_at, volume FROM volume_stretch"):
            while started < ended:
                hour = math.floor(started / 3600) * 3600
                part = min(ended, hour + 3600) - started
                seconds, loud = hours.get(hour, (0, 0))
                hours[hour] = (seconds + part, loud + part * volume)
                started += part
        cells = self.marks("cell")
        self.assertEqual({int(cell["from"]) for cell in cells}, set(hours))
        for cell in cells:
            seconds, loud = hours[int(cell["from"])]
            step = sum(loud / seconds >= limit for limit in (0.2, 0.35, 0.5, 0.65, 0.8))
            self.assertAlmostEqual(float(cell["volume"]), loud / seconds, delta=0.001)
            if min(abs(loud / seconds - limit) for limit in (0.2, 0.35, 0.5, 0.65, 0.8)) > 0.001:
                self.assertEqual(cell["fill"], f"var(--h{step + 1})")

    def test_shows_the_shares_of_a_drivers_buckets_and_states(self):
        page = self.show("--days", "4")
        (hits,) = page.query("SELECT sum(hits) FROM channel_bucket WHERE name = 'Temperature'")[0]
        expected = [row[0] / hits for row in page.query("SELECT sum(hits) FROM channel_bucket WHERE name = 'Temperature' GROUP BY lower ORDER BY lower")]
        find = "[...document.querySelectorAll('figure')].find((figure) => figure.innerText.includes('%s'))"
        found = self.browser.evaluate(f"[...{find % 'Temperature'}.querySelectorAll('[data-mark=column]')].map((bar) => [Number(bar.dataset.value), Number(bar.getAttribute('height'))])")
        self.assertEqual(len(found), 5)
        for (share, height), right in zip(found, expected):
            self.assertAlmostEqual(share, right, places=6)
            self.assertAlmostEqual(height / max(tall for _, tall in found), right / max(expected), delta=0.01)
        widths = self.browser.evaluate(f"[...{find % 'Amplifier'}.querySelectorAll('[data-mark=state]')].map((bar) => [Number(bar.dataset.share), Number(bar.getAttribute('width'))])")
        self.assertAlmostEqual(sum(share for share, _ in widths), 1.0)
        for share, width in widths:
            self.assertAlmostEqual(width / sum(wide for _, wide in widths), share, delta=0.01)

    def test_zooms_by_keyboard(self):
        self.show("--days", "3")
        before, _ = self.assert_stretches_follow_the_scale()
        self.browser.evaluate("document.querySelector('#timeline .picture').focus()")
        for key, factor in (("+", 1.6), ("+", 1.6 * 1.6), ("-", 1.6)):
            self.browser.call("Input.dispatchKeyEvent", type="keyDown", key=key, text=key)
            scale, _ = self.assert_stretches_follow_the_scale()
            self.assertAlmostEqual((before["until"] - before["from"]) / (scale["until"] - scale["from"]), factor, delta=0.01)
        self.browser.call("Input.dispatchKeyEvent", type="keyDown", key="ArrowRight")
        moved, _ = self.assert_stretches_follow_the_scale()
        self.assertGreater(moved["from"], scale["from"] + 3600)
        self.assertIn("Shows ", self.text("#timeline .shows"))
        self.browser.call("Input.dispatchKeyEvent", type="keyDown", key="0", text="0")
        scale, _ = self.assert_stretches_follow_the_scale()
        self.assertEqual(scale["until"], before["until"])
        self.assert_clean()

    def test_zooms_by_mouse_and_moves_by_dragging(self):
        self.show("--days", "3")
        before, _ = self.assert_stretches_follow_the_scale()
        box = self.browser.evaluate("(() => { const b = document.querySelector('#timeline .picture'); b.scrollIntoView(); const r = b.getBoundingClientRect(); return [r.x, r.y, r.width]; })()")
        middle = {"x": box[0] + box[2] / 2, "y": box[1] + 60}
        wheel = {"type": "mouseWheel", "deltaX": 0, "deltaY": -300, **middle}
        self.browser.call("Input.dispatchMouseEvent", **wheel)
        unchanged, _ = self.assert_stretches_follow_the_scale()
        self.assertEqual(unchanged["until"], before["until"])  # the wheel scrolls the page
        self.browser.evaluate("document.querySelector('#timeline .picture').scrollIntoView()")
        self.browser.call("Input.dispatchMouseEvent", modifiers=2, **wheel)
        zoomed, _ = self.assert_stretches_follow_the_scale()
        self.assertLess(zoomed["until"] - zoomed["from"], (before["until"] - before["from"]) / 1.2)
        for kind, x in (("mousePressed", 0), ("mouseMoved", 100), ("mouseReleased", 100)):
            self.browser.call("Input.dispatchMouseEvent", type=kind, x=middle["x"] + x, y=middle["y"], button="left", buttons=1, clickCount=1)
        dragged, _ = self.assert_stretches_follow_the_scale()
        per_pixel = (zoomed["until"] - zoomed["from"]) / (zoomed["right"] - zoomed["left"])
        self.assertAlmostEqual(dragged["from"], zoomed["from"] - 100 * per_pixel, delta=2 * per_pixel)
        self.assert_clean()

    def test_zooms_with_two_fingers(self):
        self.show("--days", "3", width=390)
        before, _ = self.assert_stretches_follow_the_scale()
        box = self.browser.evaluate("(() => { const b = document.querySelector('#timeline .picture'); b.scrollIntoView(); const r = b.getBoundingClientRect(); return [r.x + r.width / 2, r.y + 80]; })()")
        for kind, apart in (("touchStart", 30), ("touchMove", 60), ("touchMove", 90)):
            self.browser.call("Input.dispatchTouchEvent", type=kind, touchPoints=[{"x": box[0] - apart, "y": box[1], "id": 0}, {"x": box[0] + apart, "y": box[1], "id": 1}])
        self.browser.call("Input.dispatchTouchEvent", type="touchEnd", touchPoints=[])
        scale, _ = self.assert_stretches_follow_the_scale()
        # The browser may deliver only one of the moves.
        self.assertGreater((before["until"] - before["from"]) / (scale["until"] - scale["from"]), 1.9)
        self.assert_clean()

    def test_names_from_programs_do_nothing(self):
        self.show("--days", "1", "--application", HOSTILE)
        self.assertNotEqual(self.browser.evaluate("document.title"), "taken")
        self.assertEqual(self.browser.evaluate("document.querySelectorAll('img, [onload], [onerror]').length"), 0)
        self.assertEqual(self.browser.evaluate("JSON.parse(document.getElementById('data').textContent).playing.byApplication.top.rows.some(([name]) => name.startsWith('</script><img'))"), True)
        self.assertIn("</script><img src=x onerror=", self.text("#by-application"))
        self.assertNotIn("\u202e", self.browser.evaluate("document.querySelector('main').textContent"))
        self.assertEqual(self.browser.evaluate(CLASHES), [])

    def test_runs_no_script_but_its_own(self):
        self.show("--days", "1")
        self.browser.evaluate("(() => { const made = document.createElement('script'); made.textContent = 'document.title = \"taken\"'; document.body.append(made); })()")
        self.browser.evaluate("document.body.insertAdjacentHTML('beforeend', '<img src=\"data:image/png;base64,AAAA\" onerror=\"document.title=1\">')")
        self.assertTrue(self.browser.evaluate("document.title").startswith("Audio report"))
        self.assertTrue(any("Content Security Policy" in problem for problem in self.browser.problems), self.browser.problems)

    def test_says_in_words_what_an_empty_store_lacks(self):
        self.show("--days", "1", change=NOTHING)
        text = self.text()
        for sentence in ("Nothing was recorded in this time", "No session was open in this time.", "No playback was recorded in this time.", "No overload was recorded in this time.", "No glitch was recorded in this time.",
                         "No driver published counters in this time.", "The haptics engine was not used in this time.", "No daemon answered when this page was made"):
            self.assertIn(sentence, text)
        self.assertEqual(self.browser.evaluate("document.querySelectorAll('.picture').length"), 0)
        self.assertNotRegex(text, "NaN|undefined|null")

    def test_is_not_empty_with_only_a_leak_inputs_or_counters(self):
        for change in ("INSERT INTO haptics VALUES (1, 1795100000, NULL, 'LeakedHapticsSessionInfo', 60, NULL)",
                       "INSERT INTO input_stretch (id, started_at, ended_at, seconds) VALUES (1, 1795100000, 1795100060, 60)",
                       "INSERT INTO channel_value VALUES (1, 1795100000, 'amp', 'Tx', '', 'underruns', '', 3)"):
            with self.subTest(change=change):
                self.show("--days", "1", change=NOTHING + change)
                self.assertNotIn("Nothing was recorded", self.text())

    def test_tells_times_by_the_devices_clock(self):
        page = self.show("--days", "1", zone="Asia/Kolkata")
        (started,) = page.query("SELECT min(started_at) FROM session")[0]
        self.assertEqual(started % 86400, 6.75 * 3600)
        self.assertIn("12:15 to ", self.text("header"))
        self.assertIn("(IST)", self.text("header"))
        self.assertIn("12:15:00", self.browser.evaluate("document.querySelector('#timeline tbody').textContent"))

    # On 25 October 2026 the clock of Berlin shows the hour from two o'clock twice.
    def test_draws_the_hour_that_comes_twice_forwards_and_in_one_cell(self):
        change = 1792890000  # 02:00 CET, an hour after 02:00 CEST
        self.show("--days", "1", zone="Europe/Berlin", change=NOTHING + played(1, -7200, -1800, day=change) + played(2, -1800, 600, day=change) + played(3, 600, 7200, day=change))
        _, marks = self.assert_stretches_follow_the_scale()
        self.assertEqual(len(marks), 3)
        cells = [(mark["_x"], mark["_y"]) for mark in self.marks("cell")]
        self.assertEqual(len(set(cells)), len(cells))
        self.assertEqual(len(cells), 3)  # from one, two and three o'clock
        ticks = self.browser.evaluate("[...document.querySelectorAll('#timeline svg [aria-label=\"x-axis tick label\"] text')].map((text) => text.textContent)")
        self.assertEqual(sum(tick.startswith("02:00") for tick in ticks), 2, ticks)

    def test_every_picture_has_a_name_a_description_and_a_table(self):
        self.show()
        problems = self.browser.evaluate("""[...document.querySelectorAll('.picture')].flatMap((picture) => {
          const svg = picture.querySelector('svg');
          const named = (name) => document.getElementById(svg.getAttribute(name))?.textContent;
          const figure = picture.closest('figure');
          return svg.getAttribute('role') === 'img' && named('aria-labelledby') && named('aria-describedby') && figure.querySelectorAll('details tbody tr').length ? [] : [figure.innerText];
        })""")
        self.assertEqual(problems, [])
        self.assertEqual(self.browser.evaluate("new Set([...document.querySelectorAll('[id]')].map(({id}) => id)).size"), self.browser.evaluate("document.querySelectorAll('[id]').length"))

    def test_says_what_the_lanes_leave_out(self):
        page = self.show("--days", "20", "--times", "3")
        (sessions,) = page.query("SELECT count(*) FROM session")[0]
        self.assertGreater(sessions, 420)
        laned = len({mark["session"] for mark in self.marks("session")})
        kept = self.browser.evaluate("JSON.parse(document.getElementById('data').textContent).timeline.lanes.rows.length")
        text = self.text("#timeline .left-out")
        self.assertIn(f"{sessions - kept} sessions besides the {kept} that played longest or overloaded most", text)
        self.assertEqual(laned, kept)
        self.choose_lanes("session")
        self.assertIn(f"{kept - 24} sessions for which no lane is free (there are at most 24)", self.text("#timeline .left-out"))

    def choose_lanes(self, kind):
        self.browser.evaluate(f"(() => {{ const lanes = document.getElementById('lanes'); lanes.value = '{kind}'; lanes.dispatchEvent(new Event('change')); }})()")

    # It was said to have played less than those shown.
    def test_says_that_a_fifth_session_at_the_same_time_has_no_lane(self):
        self.show("--days", "1", change=NOTHING + "".join(played(number, number, 3600 * number) for number in range(1, 6)))
        self.choose_lanes("application")
        self.assertIn("1 session for which no lane is free (there are at most 24, and 4 for one application)", self.text("#timeline .left-out"))

    # Programs choose these times. One of them left the page empty.
    def test_shows_the_rest_when_a_program_chose_an_impossible_time(self):
        page = self.show("--days", "2", change="INSERT INTO volume_stretch (id, session, started_at, ended_at, seconds, volume) VALUES (1, 1, 1e14, 1e14, 1, 0.5), (2, 1, -1e14, 1e14, 1, 0.5)")
        _, marks = self.assert_stretches_follow_the_scale()
        self.assertEqual(len(marks), page.query("SELECT count(*) FROM volume_stretch")[0][0] - 2)
        self.assertIn("2 stretches with a time that cannot be", self.text("#timeline .left-out"))
        # The table of a session is also without these.
        self.show("--days", "2", options=("--session", "1"), change="UPDATE session SET started_at = 1e14, ended_at = 1e14 WHERE id = 1")

    # The daemon may have died with the session; then nobody knows.
    def test_does_not_say_that_a_session_runs_when_no_daemon_answers(self):
        page = self.show("--days", "2")
        (running,) = page.query("SELECT id FROM session WHERE ended_at IS NULL")[0]
        self.assertIn("1 without an end", self.text(".numbers"))
        self.show("--days", "2", options=("--session", str(running)))
        text = self.browser.evaluate("document.querySelector('main').textContent")
        self.assertIn("no end recorded", text)
        self.assertNotIn("still run", text)

    # Opens the page again with what another daemon says of itself.
    def sentence_of(self, page, **daemon):
        text = page.path.read_text()
        changed = re.sub(r'"daemon":\{"answers":false,"reason":"[^"]*"\}', lambda _: '"daemon":' + json.dumps(daemon), text)
        self.assertNotEqual(changed, text)
        path = page.state / "changed.html"
        path.write_text(changed)
        self.browser.open(path)
        self.assert_clean()
        return self.text(".findings")

    def test_says_of_the_daemon_only_what_it_has_told(self):
        page = self.show("--days", "1")
        told = {"answers": True, "refused": [], "sinks": [], "linesHeldBack": 0}
        self.assertIn("it dropped and refused nothing.", self.sentence_of(page, tellsSinks=True, **told))
        untrusted = self.sentence_of(page, tellsSinks=False, **told)
        self.assertIn("it refused nothing of the user who made this page.", untrusted)
        self.assertNotIn("dropped and refused nothing", untrusted)
        told["linesHeldBack"] = 4
        held = self.sentence_of(page, tellsSinks=True, **told)
        self.assertIn("the daemon kept 4 lines out of its log.", held)
        self.assertNotIn("refused requests", held)

    def test_tells_the_time_of_the_device_from_that_of_its_sessions(self):
        self.show("--days", "1", change=NOTHING + played(1, 0, 3600) + played(2, 0, 3600) + played(3, 0, 3600))
        self.assertIn("The sessions played 3 h added up, in 1 h of the device's time, ", self.text(".findings"))
        self.assertIn("added up, in 1 h of time", self.text(".numbers"))
        self.show("--days", "1", change=NOTHING + played(1, 0, 3600) + played(2, 3600, 7200))
        self.assertIn("The device played 2 h, ", self.text(".findings"))

    def test_says_each_day_once_and_each_cause_only_when_there_is_one(self):
        self.show("--days", "1", change=NOTHING + played(1, 0, 3600) + "UPDATE session SET ending = 'disconnected';")
        self.assertIn("20 Nov 2026, 00:00 to 01:00, by the device's clock", self.text("header"))
        self.assertIn("1 session ended without a stop: 1 client disconnected.", self.text(".findings"))
        self.show("--days", "1", change=NOTHING + played(1, 0, 7) + "UPDATE session SET ending = 'interrupted';")
        self.assertIn("20 Nov 2026, 00:00:00 to 00:00:07, by the device's clock", self.text("header"))
        self.assertIn("1 session ended without a stop: 1 was interrupted because the daemon or the device ended.", self.text(".findings"))
        self.show("--days", "1", change=NOTHING + played(1, 0, 90000) + played(2, 0, 7) + "UPDATE session SET ending = 'interrupted' WHERE id = 1; UPDATE session SET ending = 'disconnected' WHERE id = 2;")
        self.assertIn("20 Nov 2026, 00:00 to 21 Nov 2026, 01:00, by the device's clock", self.text("header"))
        self.assertIn("2 sessions ended without a stop: 1 client disconnected, 1 was interrupted because the daemon or the device ended.", self.text(".findings"))

    def test_says_no_more_than_the_store_knows(self):
        nearly = played(1, 0, 86000) + played(2, 86000, 86100, application="Phone")
        self.show("--days", "1", options=("--app", "M*"), change=NOTHING + nearly + "INSERT INTO issue (at, kind) VALUES (1795132800, 'overload');")
        said = self.text(".findings")
        self.assertIn("What fits “M*” played 23 h 53 min, all of it for Melody", said)
        self.assertIn("No overload was recorded.", said)
        self.show("--days", "1", options=("--since", "2026-11-20T00:00:00Z"), change=NOTHING + nearly + "UPDATE session SET messages = 4, redundant_messages = 1; INSERT INTO issue (at, kind) VALUES (1795132800, 'overload');")
        said = self.text(".findings")
        self.assertIn("nearly all of it for Melody", said)
        self.assertIn("The audio overloaded 1 time.", said)
        self.assertIn("25 % said nothing new; of whole sessions", self.text(".numbers"))
        self.show("--days", "1", options=("--session", "1"), change=NOTHING + nearly)
        self.assertEqual(self.browser.evaluate("[...document.querySelectorAll('h3')].find((title) => title.textContent === 'What was played').nextElementSibling.querySelector('tbody td:last-child').textContent"), "not known")

    def test_says_that_the_unit_of_haptics_is_an_assumption(self):
        self.show("--days", "2")
        self.assertIn("Applications report it without a unit; the page takes it for seconds.", self.text())
        self.assertRegex(self.text(".numbers"), r"events, taken as seconds")

    def test_fits_a_phone(self):
        self.show(width=390)
        self.assertEqual(self.browser.evaluate("document.documentElement.scrollWidth"), 390)
        self.assertEqual(self.browser.evaluate(CLASHES), [])

    def test_no_label_lies_over_another(self):
        self.show()
        self.assertEqual(self.browser.evaluate(CLASHES), [])
        self.assertGreater(self.browser.evaluate("document.querySelectorAll('.picture svg text').length"), 50)

    def test_prints_in_light_colours_without_controls(self):
        self.show("--days", "3", dark=True)
        self.assertNotEqual(self.browser.evaluate("getComputedStyle(document.body).backgroundColor"), "rgb(255, 255, 255)")
        pages = self.browser.print_to_pdf().count(b"/Type /Page\n")
        self.assertTrue(2 <= pages <= 9, pages)
        self.assert_clean()
        self.browser.evaluate("dispatchEvent(new Event('beforeprint'))")
        self.assertEqual(self.browser.evaluate(CLASHES), [])
        self.assertTrue(all(width <= 690 for width in self.browser.evaluate("[...document.querySelectorAll('.picture svg')].map((svg) => Number(svg.getAttribute('width')))")))
        self.browser.call("Emulation.setEmulatedMedia", media="print", features=[{"name": "prefers-color-scheme", "value": "dark"}])
        self.assertEqual(self.browser.evaluate("getComputedStyle(document.body).backgroundColor"), "rgb(255, 255, 255)")
        self.assertEqual(self.browser.evaluate("[...document.querySelectorAll('button, details')].filter((element) => element.checkVisibility()).length"), 0)

    def test_tables_fit_on_paper_and_break_no_short_words(self):
        page = self.show("--days", "30", width=688)  # A4 without its margins
        self.assertGreater(page.query("SELECT count(*) FROM glitch WHERE cause = 'not scheduled'")[0][0], 0)
        self.browser.call("Emulation.setEmulatedMedia", media="print")
        wide = "[...document.querySelectorAll('table')].filter((table) => table.checkVisibility() && table.getBoundingClientRect().right > 689).length"
        self.assertEqual(self.browser.evaluate(wide), 0)
        self.assertEqual(self.browser.evaluate(BROKEN_WORDS), [])
        self.browser.call("Emulation.setEmulatedMedia", media="screen")
        self.assertEqual(self.browser.evaluate(BROKEN_WORDS), [])

    def test_shows_one_session(self):
        source = Page(self.scratch, "all", "--days", "5")
        (session, application) = source.query("SELECT id, application FROM session ORDER BY overloads DESC LIMIT 1")[0]
        page = self.show("--days", "5", options=("--session", str(session)))
        text = self.text()
        self.assertTrue(text.startswith(f"Audio session #{session} on "), text[:50])
        self.assertIn(application, text)
        self.assertIn("Messages by kind", text)
        marks = self.marks("stretch")
        self.assertEqual({mark["session"] for mark in marks}, {str(session)})
        self.assertEqual(len(marks), page.query(f"SELECT count(*) FROM volume_stretch WHERE session = {session}")[0][0])
        self.assert_stretches_follow_the_scale()


if __name__ == "__main__":
    unittest.main()
