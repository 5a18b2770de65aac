"""A headless Chromium that shows one page, spoken to over its debugging pipe: what would a person see of it?"""

import base64
import fcntl
import json
import os
import select
import shutil
import subprocess
import tempfile

PATIENCE_SECONDS = 120
CHROMIUM = shutil.which("chromium") or shutil.which("chromium-browser")
# The browser reads commands from the first and writes answers to the second.
COMMAND_DESCRIPTOR, ANSWER_DESCRIPTOR = 3, 4


def high_pipe():
    """Both ends away from the two descriptors, so that one cannot hide behind the other."""
    ends = []
    for low in os.pipe():
        ends.append(fcntl.fcntl(low, fcntl.F_DUPFD_CLOEXEC, 10))
        os.close(low)
    return ends


class Browser:
    """One browser with one page; ends with the test."""

    def __init__(self, test):
        profile = tempfile.mkdtemp(prefix="tal-browser-")
        test.addCleanup(shutil.rmtree, profile, ignore_errors=True)
        commands, self._commands = high_pipe()
        self._answers, answers = high_pipe()

        def take_descriptors():
            os.dup2(commands, COMMAND_DESCRIPTOR)
            os.dup2(answers, ANSWER_DESCRIPTOR)

        # Root may not use the browser's sandbox; the page is the test's own.
        self.process = subprocess.Popen(
            [CHROMIUM, "--headless=new", "--no-sandbox", "--disable-gpu", "--disable-dev-shm-usage",
             "--disable-background-networking", "--no-first-run", f"--user-data-dir={profile}",
             "--remote-debugging-pipe", "about:blank"],
            stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL, close_fds=False,
            preexec_fn=take_descriptors)
        test.addCleanup(self._end)
        os.close(commands)
        os.close(answers)
        self._buffer = b""
        self._number = 0
        self._session = None
        self.requests = []
        target = self.call("Target.createTarget", url="about:blank")["targetId"]
        self._session = self.call("Target.attachToTarget", targetId=target, flatten=True)["sessionId"]
        for domain in ("Page", "Network", "Log", "Runtime"):
            self.call(f"{domain}.enable")
        self.complaints = []

    def _end(self):
        self.process.kill()
        self.process.wait(PATIENCE_SECONDS)
        os.close(self._commands)
        os.close(self._answers)

    def call(self, method, **parameters):
        self._number += 1
        message = {"id": self._number, "method": method, "params": parameters}
        if self._session:
            message["sessionId"] = self._session
        os.write(self._commands, json.dumps(message).encode() + b"\0")
        return self._read_until(lambda answer: answer.get("id") == self._number)["result"]

    def _read_until(self, wanted):
        while True:
            while b"\0" not in self._buffer:
                if not select.select([self._answers], [], [], PATIENCE_SECONDS)[0]:
                    raise AssertionError("the browser does not answer")
                data = os.read(self._answers, 1 << 16)
                if not data:
                    raise AssertionError(f"the browser has ended with {self.process.wait(PATIENCE_SECONDS)}")
                self._buffer += data
            text, self._buffer = self._buffer.split(b"\0", 1)
            message = json.loads(text)
            if message.get("method") == "Network.requestWillBeSent":
                self.requests.append(message["params"]["request"]["url"])
            if message.get("method") in ("Log.entryAdded", "Runtime.exceptionThrown"):
                self.complaints.append(message["params"])
            if wanted(message):
                return message

    def show(self, url, *, width, height=800, scheme="light"):
        """Loads the page on a screen of that size, whose owner prefers that colour scheme."""
        self.call("Emulation.setDeviceMetricsOverride", width=width, height=height, deviceScaleFactor=1,
                  mobile=width < 600)
        self.call("Emulation.setEmulatedMedia", features=[{"name": "prefers-color-scheme", "value": scheme}])
        self.requests.clear()
        self.complaints.clear()
        self.call("Page.navigate", url=url)
        self._read_until(lambda message: message.get("method") == "Page.loadEventFired")

    def evaluate(self, expression):
        answer = self.call("Runtime.evaluate", expression=expression, returnByValue=True)
        if "exceptionDetails" in answer:
            raise AssertionError(answer["exceptionDetails"])
        return answer["result"].get("value")

    def screenshot(self, path):
        """The whole page as a PNG."""
        height = self.evaluate("document.documentElement.scrollHeight")
        width = self.evaluate("document.documentElement.clientWidth")
        image = self.call("Page.captureScreenshot", captureBeyondViewport=True,
                          clip={"x": 0, "y": 0, "width": width, "height": height, "scale": 1})
        with open(path, "wb") as file:
            file.write(base64.b64decode(image["data"]))
