"""A real broker on a loopback port, and a receiver that counts what it gets from it."""

import collections
import json
import pathlib
import queue
import shutil
import socket
import subprocess
import threading
import time

from tal_harness import PATIENCE_SECONDS

TOPIC = "talreporting"
BROKER = shutil.which("mosquitto", path="/usr/sbin:/usr/bin:/usr/local/sbin:/usr/local/bin")


def free_port():
    with socket.socket() as probe:
        probe.bind(("127.0.0.1", 0))
        return probe.getsockname()[1]


class Broker:
    """mosquitto in a directory of its own; remembers subscriptions over a restart."""

    def __init__(self, directory, options="allow_anonymous true\n"):
        self.port = free_port()
        self.directory = pathlib.Path(directory)
        self.process = None
        (self.directory / "broker.conf").write_text(
            f"listener {self.port} 127.0.0.1\n"
            f"persistence true\npersistence_location {self.directory}/\n"
            "max_queued_messages 0\nmax_inflight_messages 0\nlog_dest file " + str(self.directory / "broker.log") +
            f"\nuser root\n{options}")

    def start(self):
        self.process = subprocess.Popen([BROKER, "-c", self.directory / "broker.conf"], stdin=subprocess.DEVNULL,
                                        stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL)
        deadline = time.monotonic() + PATIENCE_SECONDS
        while True:
            if self.process.poll() is not None:
                raise AssertionError("the broker ended: " + (self.directory / "broker.log").read_text())
            try:
                socket.create_connection(("127.0.0.1", self.port), 1).close()
                return self
            except OSError:
                if time.monotonic() > deadline:
                    raise

    def stop(self):
        if self.process is not None and self.process.poll() is None:
            self.process.terminate()
            self.process.wait(PATIENCE_SECONDS)


class Receiver:
    """mosquitto_sub, subscribed for good; keeps the messages by session in the order of their coming."""

    def __init__(self, broker, *options):
        self.publications = []  # topic and parsed payload
        self.by_session = collections.defaultdict(list)  # (reporter, token) -> messages, repeats taken out
        self.repeats = 0
        self._numbers = {}
        self._lines = queue.Queue()
        self._process = subprocess.Popen(
            ["stdbuf", "-oL", "mosquitto_sub", "-h", "127.0.0.1", "-p", str(broker.port), "-V", "mqttv311", "-c", "-i", "receiver", "-q",
             "1", "-t", TOPIC + "/#", "-F", "%t %p", "-d", *options],
            stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, stderr=subprocess.STDOUT)
        self._reader = threading.Thread(target=self._read, daemon=True)
        self._reader.start()
        self.wait_for(lambda: self._subscribed, "the receiver has subscribed")

    _subscribed = False

    def _read(self):
        for line in self._process.stdout:
            self._lines.put(line)

    def _take(self, line):
        if line.startswith(b"Subscribed "):
            self._subscribed = True
        if not line.startswith(TOPIC.encode() + b"/"):
            return
        topic, _, text = line.rstrip(b"\n").partition(b" ")
        payload = json.loads(text)
        self.publications.append((topic.decode(), payload))
        for message in payload if isinstance(payload, list) else [payload]:
            known = self._numbers.setdefault(message["number"], message)
            if known is not message:
                assert known == message, "a number that was used for another message"
                self.repeats += 1
                continue
            info = message["session_info"]
            self.by_session[info["session_identifier"], info["hierarchy_token"]].append(message)

    def wait_for(self, condition, what):
        deadline = time.monotonic() + PATIENCE_SECONDS
        while not condition():
            try:
                self._take(self._lines.get(timeout=max(0, deadline - time.monotonic())))
            except queue.Empty:
                counts = {key[0]: len(messages) for key, messages in self.by_session.items()}
                raise AssertionError(f"never came true: {what}; received {counts}") from None

    def everything_so_far(self):
        while not self._lines.empty():
            self._take(self._lines.get())
        return self.publications

    def of_reporter(self, reporter):
        return [message for key, messages in self.by_session.items() if key[0] == reporter for message in messages]

    def client_numbers(self, reporter):
        """What the test's client numbered, in the order of its coming; summaries are left out."""
        return [m["payload"]["n"] for m in self.of_reporter(reporter) if (m["category"], m["type"]) == (4, 1)]

    def close(self):
        self._process.kill()
        self._process.wait(PATIENCE_SECONDS)
        self._reader.join()
        self._process.stdout.close()
