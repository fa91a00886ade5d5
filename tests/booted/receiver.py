#!/usr/bin/env python3
# Receives OTLP requests on the loopback interface, and prints one line for each: the path and the body.
import gzip
import http.server
import sys


class Receiver(http.server.BaseHTTPRequestHandler):
    def do_POST(self):
        body = self.rfile.read(int(self.headers["Content-Length"]))
        if self.headers["Content-Encoding"] == "gzip":
            body = gzip.decompress(body)
        print(self.path, body.decode(), flush=True)
        self.send_response(200)
        self.send_header("Content-Type", "application/json")
        self.send_header("Content-Length", "2")
        self.end_headers()
        self.wfile.write(b"{}")

    def log_message(self, *_):
        pass


http.server.HTTPServer(("127.0.0.1", int(sys.argv[1])), Receiver).serve_forever()
