# SPDX-License-Identifier: Apache-2.0
"""Runs Chromium without a window, and talks to it over its debugging pipe."""

import base64
import json
import os
import select
import shutil
import subprocess
import tempfile
import time

PATIENCE = 60.0


def program():
    """Returns the path of the browser; none when there is none."""
    return shutil.which("chromium") or shutil.which("chromium-browser")


class Browser:
    """One page of a browser. `problems` has what the page logged as errors, and its uncaught exceptions."""

    def __init__(self):
        self.problems = []
        self.requests = []
        self.number = 0
        self.buffer = b""
        self.session = None
        self.profile = tempfile.TemporaryDirectory()
        to_browser, self.output = os.pipe()
        self.input, from_browser = os.pipe()

        # The browser reads commands from descriptor 3 and writes to descriptor 4. High numbers first, so that none is overwritten.
        def arrange():
            high = [os.dup2(descriptor, number) for descriptor, number in ((to_browser, 103), (from_browser, 104))]
            os.dup2(high[0], 3)
            os.dup2(high[1], 4)

        self.process = subprocess.Popen(
            [program(), "--headless", "--no-sandbox", "--disable-gpu", "--disable-dev-shm-usage", "--no-first-run",
             "--disable-background-networking", "--disable-component-update", "--disable-extensions", "--force-device-scale-factor=1",
             f"--user-data-dir={self.profile.name}", "--remote-debugging-pipe", "about:blank"],
            preexec_fn=arrange, close_fds=False, stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL,
            env={**os.environ, "TZ": "America/New_York", "HOME": self.profile.name})  # another zone than the device's
        os.close(to_browser)
        os.close(from_browser)
        page = next(target for target in self.call("Target.getTargets")["targetInfos"] if target["type"] == "page")
        self.session = self.call("Target.attachToTarget", targetId=page["targetId"], flatten=True)["sessionId"]
        for domain in ("Page", "Runtime", "Log", "Network"):
            self.call(f"{domain}.enable")

    def close(self):
        try:
            self.session = None
            self.call("Browser.close")
        except (OSError, EOFError, TimeoutError):
            self.process.kill()
        self.process.wait()
        os.close(self.input)
        os.close(self.output)
        try:
            self.profile.cleanup()
        except OSError:
            shutil.rmtree(self.profile.name, ignore_errors=True)

    def call(self, method, **parameters):
        """Sends a command and returns its result."""
        self.number += 1
        message = {"id": self.number, "method": method, "params": parameters}
        if self.session:
            message["sessionId"] = self.session
        os.write(self.output, json.dumps(message).encode() + b"\0")
        while True:
            answer = self.receive()
            if answer.get("id") == self.number:
                if "error" in answer:
                    raise RuntimeError(f"{method}: {answer['error']['message']}")
                return answer["result"]

    def receive(self):
        deadline = time.monotonic() + PATIENCE
        while b"\0" not in self.buffer:
            if not select.select([self.input], [], [], max(0.0, deadline - time.monotonic()))[0]:
                raise TimeoutError("the browser does not answer")
            read = os.read(self.input, 1 << 20)
            if not read:
                raise EOFError("the browser has gone")
            self.buffer += read
        text, self.buffer = self.buffer.split(b"\0", 1)
        message = json.loads(text)
        self.note(message.get("method"), message.get("params", {}))
        return message

    def note(self, method, parameters):
        if method == "Runtime.exceptionThrown":
            details = parameters["exceptionDetails"]
            self.problems.append(details.get("exception", {}).get("description", details["text"]))
        elif method == "Log.entryAdded" and parameters["entry"]["level"] == "error":
            self.problems.append(parameters["entry"]["text"])
        elif method == "Runtime.consoleAPICalled" and parameters["type"] in ("error", "assert", "warning"):
            self.problems.append(str(parameters["args"]))
        elif method == "Network.requestWillBeSent":
            self.requests.append(parameters["request"]["url"])

    def open(self, path, **options):
        """Loads a file and waits until its pictures are drawn."""
        self.open_address(f"file://{path}", **options)

    def open_address(self, address, width=1200, height=900, dark=False, mobile=False):
        """Loads a page and waits until its pictures are drawn."""
        self.problems.clear()
        self.requests.clear()
        self.call("Emulation.setDeviceMetricsOverride", width=width, height=height, deviceScaleFactor=1, mobile=mobile)
        self.call("Emulation.setTouchEmulationEnabled", enabled=mobile, maxTouchPoints=2)
        self.call("Emulation.setEmulatedMedia", features=[{"name": "prefers-color-scheme", "value": "dark" if dark else "light"}])
        problem = self.call("Page.navigate", url=address).get("errorText")
        if problem:
            raise RuntimeError(f"{address}: {problem}")
        deadline = time.monotonic() + PATIENCE
        scheme = address.split("//", 1)[0]
        while not self.evaluate(f"location.protocol === '{scheme}' && document.readyState === 'complete'"):
            if time.monotonic() > deadline:
                where = self.evaluate("`${location}, ${document.readyState}, ${document.body?.innerText.length} characters`")
                raise TimeoutError(f"the page does not load: {where}; {self.requests}")
            time.sleep(0.05)

    def evaluate(self, expression):
        """Returns the value of a JavaScript expression, of a promise when it has one."""
        answer = self.call("Runtime.evaluate", expression=expression, returnByValue=True, awaitPromise=True)
        if "exceptionDetails" in answer:
            raise RuntimeError(answer["exceptionDetails"].get("exception", {}).get("description", "exception"))
        return answer["result"].get("value")

    def screenshot(self, path, whole=True):
        options = {}
        if whole:
            size = self.call("Page.getLayoutMetrics")["cssContentSize"]
            options = {"captureBeyondViewport": True, "clip": {"x": 0, "y": 0, "width": size["width"], "height": size["height"], "scale": 1}}
        with open(path, "wb") as file:
            file.write(base64.b64decode(self.call("Page.captureScreenshot", format="png", **options)["data"]))

    def print_to_pdf(self):
        return base64.b64decode(self.call("Page.printToPDF", preferCSSPageSize=True, printBackground=False)["data"])
