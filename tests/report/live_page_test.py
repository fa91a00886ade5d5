# SPDX-License-Identifier: Apache-2.0
"""Looks at the page of `twctl serve` in a browser while sessions play, through PipeWire and its bridge, too."""

import os
import signal
import unittest

import browser
from browser import Browser
from processes import Graph, Machine, wait_until

# Each stretch with its numbers, in the order of time.
STRETCHES = """[...document.querySelectorAll('[data-mark=stretch]')].map((mark) => ({session: mark.dataset.session, volume: Number(mark.dataset.volume),
  started: Number(mark.dataset.started), ended: Number(mark.dataset.ended), open: mark.dataset.open === 'yes',
  width: Number(mark.getAttribute('width')), height: Number(mark.getAttribute('height'))})).sort((a, b) => a.started - b.started)"""
PICTURES = os.environ.get("TONEWERK_PICTURES")  # a directory for pictures to look at


class LivePageTest(unittest.TestCase):
    def setUp(self):
        if not browser.program():
            self.skipTest("there is no Chromium")
        self.machine = Machine(self)
        self.browser = Browser()
        self.addCleanup(self.browser.close)

    def open(self, address, **options):
        self.browser.open_address(address, **options)
        self.wait_for("document.documentElement.dataset.ready === 'yes'", "the page")

    def evaluate(self, expression):
        return self.browser.evaluate(expression)

    def wait_for(self, expression, what):
        return wait_until(lambda: self.evaluate(expression), what, lambda: f"The page: {self.text()} {self.browser.problems[:2]}")

    def wait_for_text(self, text):
        self.wait_for(f"document.body.innerText.includes({text!r})", repr(text))

    def text(self):
        """The beginning of what a reader sees."""
        return self.evaluate("document.querySelector('main').innerText")[:1500]

    def stretches(self):
        return self.evaluate(STRETCHES)

    def wait_for_stretch(self, what, condition):
        return wait_until(lambda: next((one for one in self.stretches() if condition(one)), None), what, lambda: f"{self.stretches()} {self.text()} {self.browser.problems[:2]}")

    def picture(self, name):
        if PICTURES:
            self.browser.screenshot(f"{PICTURES}/{name}.png")

    def test_shows_what_a_pipewire_graph_plays_while_it_plays(self):
        if Graph.missing():
            self.skipTest(f"{', '.join(Graph.missing())}: not installed")
        self.machine.start_daemon()
        graph = Graph(self.machine)
        server, address = self.machine.serve()
        self.open(address)
        self.wait_for_text("Live: the daemon answers.")
        self.wait_for_text("Nothing plays now.")

        player, node = graph.play()
        first = self.wait_for_stretch("a stretch that grows", lambda one: one["open"])
        self.assertEqual(first["volume"], 1.0)
        grown = self.wait_for_stretch("its growth", lambda one: one["open"] and one["ended"] > first["ended"] + 1.0)
        self.assertEqual(grown["started"], first["started"])
        self.wait_for_text("pw-cat #1: Test Speaker at 100 %")

        self.assertEqual(graph.run("wpctl", "set-volume", str(node), "0.3").returncode, 0)
        quiet = self.wait_for_stretch("the new volume", lambda one: one["open"] and one["volume"] == 0.3)
        loud = self.wait_for_stretch("the end of the first stretch", lambda one: one["volume"] == 1.0 and not one["open"])
        self.assertEqual(loud["started"], first["started"])
        self.assertAlmostEqual(loud["ended"], quiet["started"], delta=0.01)
        self.assertAlmostEqual(quiet["height"] / loud["height"], 0.3, delta=0.01)
        self.wait_for_text("pw-cat #1: Test Speaker at 30 %")
        self.wait_for_stretch("its growth", lambda one: one["open"] and one["ended"] > quiet["ended"] + 1.0)
        self.picture("playing")

        self.machine.stop(player)
        self.wait_for_text("Nothing plays now.")
        # Then the summary is made, and the page has it without being loaded again.
        self.wait_for("document.querySelector('.findings').innerText.includes('of it on Test Speaker')", "the stored summary")
        self.wait_for("[...document.querySelectorAll('.numbers b')].some((number) => number.textContent === '1')", "the stored session")
        stored = self.stretches()
        self.assertEqual([(one["volume"], one["open"]) for one in stored], [(1.0, False), (0.3, False)])
        self.assertEqual({one["session"] for one in stored}, {"1"})
        self.assertEqual(self.browser.problems, [])
        self.assertEqual({url.split("?")[0] for url in self.browser.requests}, {address.split("?")[0] + path for path in ("", "live", "data")})
        self.assertEqual(self.machine.stop(server), 0)

    def test_knows_what_played_before_it_began(self):
        self.machine.start_daemon()
        self.machine.open_session(700, "org.example.Player", {"session_output_running": True, "QMSessionVolume": 0.6, "active_devices": "Kitchen"})
        _, address = self.machine.serve()
        self.open(address)
        self.wait_for_text("org.example.Player #1: Kitchen at 60 %")
        self.wait_for_stretch("the stretch", lambda one: one["open"] and one["volume"] == 0.6 and one["session"] == "1")
        self.assertEqual(self.browser.problems, [])

    # Nothing changes any more, so nothing new is published: the page takes the time from the server.
    def test_a_page_that_opens_late_has_the_time_of_now(self):
        self.machine.start_daemon()
        self.machine.open_session(706, "org.example.Player", {"session_output_running": True, "QMSessionVolume": 0.6, "active_devices": "Kitchen"})
        _, address = self.machine.serve()
        self.open(address)
        self.wait_for_text("org.example.Player #1: Kitchen at 60 %")
        first = self.wait_for_stretch("a stretch that grows", lambda one: one["open"])
        grown = self.wait_for_stretch("its growth", lambda one: one["open"] and one["ended"] > first["ended"] + 2.0)
        self.open(address)
        self.wait_for_text("org.example.Player #1: Kitchen at 60 %")
        late = self.wait_for_stretch("the stretch", lambda one: one["open"])
        self.assertEqual(late["started"], grown["started"])
        self.assertGreaterEqual(late["ended"], grown["ended"])
        self.assertEqual(self.browser.problems, [])

    def test_says_when_the_daemon_is_gone_and_goes_on_when_it_is_back(self):
        self.machine.make_store()
        _, address = self.machine.serve()
        self.open(address)
        self.wait_for_text("The daemon does not answer; trying again")
        self.wait_for_text("What plays now is not known.")
        self.assertGreater(self.evaluate("document.querySelectorAll('.picture svg').length"), 4)
        self.assertEqual(self.evaluate("document.querySelector('.shows').textContent"), "Shows everything.")  # because nothing happened in the last hour
        self.picture("no-daemon")
        daemon = self.machine.start_daemon()
        self.wait_for_text("Live: the daemon answers.")
        self.machine.open_session(701, "org.example.Radio", {"session_output_running": True, "QMSessionVolume": 0.5, "active_devices": "Desk"})
        self.wait_for_text("Desk at 50 %")
        self.machine.stop(daemon, signal.SIGKILL)  # which cannot end its sessions any more
        self.wait_for_text("The daemon does not answer; trying again")
        self.wait_for_text("No daemon answered when this page was made")
        frozen = self.wait_for_stretch("a stretch that does not grow", lambda one: one["volume"] == 0.5)
        self.machine.start_daemon()
        self.wait_for_text("Live: the daemon answers.")
        self.wait_for_text("Since it began it dropped and refused nothing.")
        self.assertLessEqual(next((one["ended"] for one in self.stretches() if one["volume"] == 0.5), 0.0), frozen["ended"] + 0.01)
        self.assertEqual(self.browser.problems, [])

    # The timeline was made anew in between, so it is not the one that the page began with.
    def test_empties_and_fills_the_timeline_again_with_a_new_store(self):
        def timeline_has(text):
            self.wait_for(f"document.querySelector('#timeline').innerText.includes({text!r})", f"{text!r} in the timeline")

        daemon = self.machine.start_daemon()
        _, address = self.machine.serve()
        self.open(address)
        timeline_has("No session was open in this time.")
        self.machine.open_session(708, "org.example.Player", {"session_output_running": True, "active_devices": "Desk"})
        timeline_has("org.example.Player")
        self.machine.stop(daemon)
        self.wait_for_text("The daemon does not answer; trying again")
        for file in self.machine.store.parent.glob("reports.db*"):
            file.unlink()
        self.machine.start_daemon()
        timeline_has("No session was open in this time.")
        self.machine.open_session(709, "org.example.Radio", {"session_output_running": True, "active_devices": "Desk"})
        timeline_has("org.example.Radio")
        self.assertEqual(self.browser.problems, [])

    def test_keeps_what_its_reader_has_done(self):
        self.machine.make_store()
        self.machine.start_daemon()
        client = self.machine.open_session(702, "org.example.Player", {"session_output_running": True, "QMSessionVolume": 0.4, "active_devices": "Desk"})
        _, address = self.machine.serve()
        self.open(address)
        self.wait_for_text("Desk at 40 %")
        self.evaluate("document.querySelector('[aria-label=\"Show everything\"]').click()")
        self.evaluate("document.querySelector('[aria-label=\"Zoom in\"]').click()")
        self.evaluate("new Promise((done) => setTimeout(done, 0)).then(() => new Promise((done) => requestAnimationFrame(() => requestAnimationFrame(done))))")
        self.wait_for("document.querySelector('.shows').textContent.includes(' to ')", "the zoom")
        # A table is open and scrolled, the focus is on it, and the page is scrolled.
        self.evaluate("""(() => {
          for (const details of document.querySelectorAll('#timeline details, #by-device details')) details.open = true;
          document.querySelector('#timeline .scroll').scrollTop = 40;
          const table = document.querySelector('#by-device .scroll');
          table.scrollIntoView();
          table.focus({preventScroll: true});
        })()""")
        place = """(() => { const svg = document.querySelector('#timeline .picture svg').dataset; return {
          from: Math.round(svg.from), until: Math.round(svg.until), open: document.querySelectorAll('#timeline details[open], #by-device details[open]').length,
          top: document.querySelector('#timeline .scroll').scrollTop, page: Math.round(scrollY / 40), focus: document.activeElement.closest('figure')?.id}; })()"""
        before = self.evaluate(place)
        self.assertEqual((before["open"], before["top"], before["focus"]), (2, 40, "by-device"))
        self.assertGreater(before["page"], 5)
        # A summary has only stretches of more than half a second.
        self.wait_for("document.querySelector('.now').innerText.match(/for (?!1 s)[0-9]/)", "two seconds of playing")
        # The session ends, which gives the stored data another device and another session.
        self.machine.say(702, session_output_running=False)
        self.wait_for_text("Nothing plays now.")
        self.machine.stop(client)
        self.wait_for("document.querySelector('#by-device').innerText.includes('Desk')", "the stored summary")
        self.assertEqual(self.evaluate(place), before)
        self.assertEqual(self.browser.problems, [])

    def test_is_whole_on_a_phone_and_in_the_dark(self):
        self.machine.make_store()
        self.machine.start_daemon()
        self.machine.open_session(703, "org.example.A-player-with-a-name-that-is-longer-than-a-phone-is-wide", {"session_output_running": True, "QMSessionVolume": 0.4, "active_devices": "<b>Desk</b>"})
        _, address = self.machine.serve()
        for width, dark in ((380, False), (380, True), (1200, True)):
            with self.subTest(width=width, dark=dark):
                self.open(address, width=width, dark=dark, mobile=width < 500)
                self.wait_for_text("<b>Desk</b> at 40 %")
                self.wait_for_stretch("the stretch", lambda one: one["open"])
                self.assertEqual(self.evaluate("document.querySelector('.shows').textContent"), "Shows the last 1 h, and what comes.")
                self.assertLessEqual(self.evaluate("document.documentElement.scrollWidth"), width)
                self.picture(f"live-{width}-{'dark' if dark else 'light'}")
                self.assertEqual(self.browser.problems, [])
        self.assertEqual(self.evaluate("[...document.querySelectorAll('[aria-live], [role=status]')].map((one) => one.className).sort()"), ["live-says", "shows"])

    def test_tells_two_clients_with_the_same_identifier_by_their_applications(self):
        self.machine.start_daemon()
        for application in ("org.example.One", "org.example.Two"):
            self.machine.open_session(707, application, {"session_output_running": True, "QMSessionVolume": 0.5, "active_devices": "Desk"})
        _, address = self.machine.serve()
        self.open(address)
        self.wait_for_text("org.example.One #1: Desk at 50 %")
        names = "[...document.querySelectorAll('#timeline tbody tr')].map((row) => [...row.cells].slice(0, 2).map((cell) => cell.textContent).join(' ')).sort().join(', ')"
        self.wait_for(f"{names} === '#1 org.example.One, #2 org.example.Two'", "a row for each")
        self.assertEqual(self.browser.problems, [])

    def test_follows_one_session(self):
        self.machine.start_daemon()
        for reporter, device in ((704, "Desk"), (705, "Kitchen")):
            self.machine.open_session(reporter, "org.example.Player", {"session_output_running": True, "QMSessionVolume": 0.5, "active_devices": device})
        _, address = self.machine.serve("--session", 2)
        self.open(address)
        self.wait_for_text("org.example.Player #2: Kitchen at 50 %")
        self.machine.say(705, QMSessionVolume=0.8)
        self.wait_for_text("org.example.Player #2: Kitchen at 80 %")
        self.wait_for_stretch("its stretch", lambda one: one["open"] and one["volume"] == 0.8)
        self.assertEqual({one["session"] for one in self.stretches()}, {"2"})
        self.assertNotIn("Desk", self.evaluate("document.body.innerText"))
        self.assertEqual(self.browser.problems, [])

    def test_refuses_a_page_whose_token_is_old(self):
        self.machine.start_daemon()
        server, address = self.machine.serve()
        self.open(address)
        self.wait_for_text("Live: the daemon answers.")
        self.assertEqual(self.machine.stop(server), 0)
        self.wait_for_text("twctl serve does not answer; trying again.")
        port = address.split(":")[2].split("/")[0]
        self.machine.serve("--port", port)
        self.wait_for_text("open the address that it has printed")


if __name__ == "__main__":
    unittest.main()
