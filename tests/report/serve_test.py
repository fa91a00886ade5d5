# SPDX-License-Identifier: Apache-2.0
"""Asks `twctl serve` over real sockets, as browsers, foreign pages and hostile programs do."""

import hashlib
import http.client
import json
import os
import pathlib
import signal
import socket
import stat
import unittest

from processes import Machine, wait_until

PATIENCE = 100.0


class ServeTest(unittest.TestCase):
    def setUp(self):
        self.machine = Machine(self)
        self.machine.make_store(sessions=3)

    def serve(self, *arguments):
        server, address = self.machine.serve(*arguments)
        self.assertRegex(address, r"^http://127\.0\.0\.1:\d+/\?token=[0-9a-f]{40}$")
        self.address = address
        self.port = int(address.split(":")[2].split("/")[0])
        self.token = address.split("=")[1]
        return server

    def ask(self, path, method="GET", host=None, body=None, **headers):
        """Returns the answer, with its body as `text`."""
        connection = http.client.HTTPConnection("127.0.0.1", self.port, timeout=PATIENCE)
        connection.putrequest(method, path, skip_host=True)
        connection.putheader("Host", host or f"127.0.0.1:{self.port}")
        for name, value in headers.items():
            connection.putheader(name.replace("_", "-"), value)
        if body:
            connection.putheader("Content-Length", str(len(body)))
        connection.endheaders(body)
        answer = connection.getresponse()
        answer.text = answer.read().decode()
        connection.close()
        return answer

    def connect(self):
        connected = socket.create_connection(("127.0.0.1", self.port), PATIENCE)
        self.addCleanup(connected.close)
        return connected

    def read_until(self, connected, text):
        read = b""
        while text not in read:
            more = connected.recv(65536)
            self.assertTrue(more, read)
            read += more
        return read

    def test_gives_the_page_only_with_the_token(self):
        self.serve()
        page = self.ask(f"/?token={self.token}")
        self.assertEqual(page.status, 200)
        self.assertIn("Time by application", page.text)
        self.assertEqual(page.headers["Content-Type"], "text/html; charset=utf-8")
        self.assertEqual(json.loads(self.ask(f"/data?token={self.token}").text)["totals"]["sessions"], 3)
        for path in ("/", "/?token=", f"/?token={self.token[:-1]}", f"/?token={'0' * 40}", "/data", "/live", "/favicon.ico"):
            with self.subTest(path=path):
                answer = self.ask(path)
                self.assertEqual(answer.status, 403)
                self.assertIn("Open the whole address that twctl serve has printed", answer.text)
        self.assertEqual(self.ask(f"/other?token={self.token}").status, 404)

    def test_answers_no_other_origin_host_or_method(self):
        self.serve()
        path = f"/data?token={self.token}"
        self.assertEqual(self.ask(path, host=f"localhost:{self.port}", Origin=f"http://localhost:{self.port}").status, 200)
        for wrong in ({"host": f"evil.example:{self.port}"}, {"Origin": "http://evil.example"}, {"Origin": "null"}, {"host": "127.0.0.1"}):
            with self.subTest(wrong=wrong):
                answer = self.ask(path, **wrong)
                self.assertEqual(answer.status, 403)
                self.assertNotIn("totals", answer.text)
        for method in ("POST", "PUT", "DELETE", "OPTIONS", "PATCH"):
            with self.subTest(method=method):
                answer = self.ask(path, method=method)
                self.assertEqual((answer.status, answer.headers["Allow"]), (405, "GET, HEAD"))
        self.assertEqual(self.ask(path, body=b"x").status, 400)
        head = self.ask(path, method="HEAD")
        self.assertEqual((head.status, head.text), (200, ""))
        self.assertGreater(int(head.headers["Content-Length"]), 1000)

    def test_guards_every_answer_with_headers(self):
        self.serve()
        for path in (f"/?token={self.token}", f"/data?token={self.token}", "/", f"/none?token={self.token}"):
            with self.subTest(path=path):
                headers = self.ask(path).headers
                for name, value in (("X-Content-Type-Options", "nosniff"), ("Referrer-Policy", "no-referrer"), ("Cache-Control", "no-store")):
                    self.assertEqual(headers[name], value)
                self.assertIn("frame-ancestors 'none'", headers["Content-Security-Policy"])
                self.assertTrue(headers["Content-Security-Policy"].startswith("default-src 'none';"))
                self.assertEqual([name for name in headers if name.lower().startswith("access-control")], [])
        first, second = [self.ask(f"/?token={self.token}").headers["Content-Security-Policy"] for _ in range(2)]
        self.assertIn("connect-src 'self'", first)
        self.assertNotEqual(first, second)  # the number of its scripts is new

    def test_tells_what_runs_and_that_no_daemon_answers(self):
        self.serve()
        stream = self.connect()
        stream.sendall(f"GET /live?token={self.token} HTTP/1.1\r\nHost: 127.0.0.1:{self.port}\r\n\r\n".encode())
        self.assertIn(b"text/event-stream", self.read_until(stream, b"The daemon does not answer; trying again."))
        daemon = self.machine.start_daemon()
        self.read_until(stream, b'"answers":true')
        daemon.send_signal(signal.SIGSTOP)
        self.read_until(stream, b"The daemon does not answer; trying again.")
        daemon.send_signal(signal.SIGCONT)
        self.read_until(stream, b'"answers":true')
        self.machine.open_session(50, "org.example.Player", {"session_output_running": True, "QMSessionVolume": 0.5})
        self.read_until(stream, b'"application":"org.example.Player"')

    def test_shows_only_the_chosen_applications(self):
        self.machine.start_daemon()
        self.machine.open_session(51, "org.example.Other", {"session_output_running": True})
        self.machine.open_session(52, "org.example.Player1", {"session_output_running": True})
        self.serve("--app", "*.Player?", "--since", "3650d")
        self.assertEqual(json.loads(self.ask(f"/data?token={self.token}").text)["filter"]["application"], "*.Player?")
        stream = self.connect()
        stream.sendall(f"GET /live?token={self.token} HTTP/1.1\r\nHost: 127.0.0.1:{self.port}\r\n\r\n".encode())
        self.assertNotIn(b"org.example.Other", self.read_until(stream, b'"application":"org.example.Player1"'))

    def test_bounds_requests_connections_and_slow_readers(self):
        server = self.serve()
        for line in (f"GET /?token={'x' * 100_000} HTTP/1.1\r\n", f"GET / HTTP/1.1\r\nHost: {'x' * 100_000}\r\n", "\0\1\2\r\n\r\n"):
            connected = self.connect()
            connected.sendall(line.encode())
            connected.sendall(b"\r\n")
            connected.shutdown(socket.SHUT_WR)
            answer = b""
            try:
                while more := connected.recv(65536):
                    answer += more
            except ConnectionResetError:
                pass
            self.assertNotIn(b" 200 ", answer.split(b"\r\n")[0])
        # Connections that never read: there are as many as the server takes, and then it serves again.
        full = []
        for _ in range(40):
            connected = socket.create_connection(("127.0.0.1", self.port), PATIENCE)
            connected.setsockopt(socket.SOL_SOCKET, socket.SO_RCVBUF, 4096)
            full.append(connected)
            try:
                connected.sendall(f"GET /live?token={self.token} HTTP/1.1\r\nHost: 127.0.0.1:{self.port}\r\n\r\n".encode())
            except OSError:
                pass  # one too many
        threads = pathlib.Path(f"/proc/{server.pid}/task")
        wait_until(lambda: len(list(threads.iterdir())) > 30, "the connections")
        self.assertLess(len(list(threads.iterdir())), 45)
        for connected in full:
            connected.close()

        def serves():
            try:
                return self.ask(f"/data?token={self.token}").status == 200
            except (OSError, http.client.HTTPException):
                return False

        wait_until(serves, "the answer to the next reader")

    def test_ends_at_once_with_a_signal_while_pages_are_open(self):
        for number in (signal.SIGINT, signal.SIGTERM):
            server = self.serve()
            stream = self.connect()
            stream.sendall(f"GET /live?token={self.token} HTTP/1.1\r\nHost: 127.0.0.1:{self.port}\r\n\r\n".encode())
            self.read_until(stream, b"data: ")
            self.assertEqual(self.machine.stop(server, number), 0)

    def test_takes_the_port_that_is_asked_for_and_says_when_it_is_taken(self):
        first = self.serve()
        again = self.machine.run_twctl("serve", "--port", self.port)
        self.assertEqual((again.returncode, again.stdout), (1, ""))
        self.assertEqual(again.stderr, f"twctl: serve: 127.0.0.1:{self.port}: Address already in use\n")
        self.assertEqual(self.machine.stop(first), 0)
        port = self.port
        self.serve("--port", port)
        self.assertEqual(self.port, port)
        for wrong in ("70000", "-1", "http"):
            self.assertEqual(self.machine.run_twctl("serve", "--port", wrong).returncode, 2)
        self.assertIn("no session has the id 99", self.machine.run_twctl("serve", "--session", "99").stderr)
        server, line = self.machine.serve("--json")
        self.assertRegex(json.loads(line)["address"], "^http://127.0.0.1:")
        self.assertEqual(self.machine.stop(server), 0)

    def test_writes_nothing(self):
        def files():
            return {path: (path.stat().st_mtime_ns, hashlib.sha256(path.read_bytes()).hexdigest()) for path in sorted((self.machine.directory / "state").rglob("*")) if stat.S_ISREG(os.lstat(path).st_mode)}

        before = files()
        server = self.serve()
        self.assertEqual(self.ask(f"/?token={self.token}").status, 200)
        self.assertEqual(self.machine.stop(server), 0)
        self.assertEqual(files(), before)

    def test_listens_on_the_loopback_interface_only(self):
        self.serve()
        listening = [line.split() for line in pathlib.Path("/proc/net/tcp").read_text().splitlines()[1:]]
        own = [address for _, address, _, state, *_ in listening if state == "0A" and int(address.split(":")[1], 16) == self.port]
        self.assertEqual(own, [f"0100007F:{self.port:04X}"])


if __name__ == "__main__":
    unittest.main()
