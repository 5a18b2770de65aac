"""Starts the real daemon in a directory of its own, and tells what it did: its store, its log, its end.

Environment, set by CTest: TAL_BIN_DIR, the directory of the built programs; PYTHONPATH, the Python client.
"""

import json
import os
import pathlib
import select
import shutil
import signal
import socket
import sqlite3
import subprocess
import tempfile
import time
import unittest

import talreporting

BIN_DIR = pathlib.Path(os.environ["TAL_BIN_DIR"])
# How long anything may take before a test is a failure: generous, for sanitizer builds on a busy machine.
PATIENCE_SECONDS = 120

IPC_SETTINGS = "settings/org.vantle.talsys.ipc.toml"
STORE_SETTINGS = "settings/org.vantle.talsys.store.toml"
ANALYTICS_SETTINGS = "settings/org.vantle.talsys.analytics.toml"

PLAYBACK, GENERIC, START, STOP = 4, 1, 1, 2
BARRIER_REPORTER = -(2**63)


class Daemon:
    """talreportingd under `--root`, ready to be spoken to once constructed."""

    def __init__(self, root, *arguments, config=None, log="stderr.log", wait_ready=True, environment=None):
        self.root = pathlib.Path(root)
        self.socket_path = str(self.root / "run/talreporting.sock")
        self.store_path = self.root / "state/store.db"
        self.log_path = self.root / log
        for file, text in (config or {}).items():
            self.write_config(file, text)
        self._barrier = None
        with socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as notify, open(self.log_path, "ab") as log:
            notify_path = self.root / "notify.sock"
            notify_path.unlink(missing_ok=True)
            notify.bind(str(notify_path))
            self.process = subprocess.Popen(
                [BIN_DIR / "talreportingd", "--root", str(self.root), *arguments],
                env={**os.environ, "NOTIFY_SOCKET": str(notify_path), **(environment or {})}, stdin=subprocess.DEVNULL, stderr=log)
            if wait_ready:
                self._wait_ready(notify)

    def _wait_ready(self, notify):
        end = os.pidfd_open(self.process.pid)
        try:
            while True:
                ready, _, _ = select.select([notify, end], [], [], PATIENCE_SECONDS)
                if notify in ready and b"READY=1" in notify.recv(4096).split(b"\n"):
                    return
                if end in ready or not ready:
                    self.kill()
                    raise AssertionError(f"the daemon did not become ready:\n{self.log()}")
        finally:
            os.close(end)

    def write_config(self, file, text):
        """Moves a file of the config directory into place, as an administrator's editor does."""
        path = self.root / "config" / file
        path.parent.mkdir(parents=True, exist_ok=True)
        draft = path.with_suffix(".draft")
        draft.write_text(text)
        draft.rename(path)

    def client(self, **options):
        return talreporting.Client(self.socket_path, timeout=PATIENCE_SECONDS, **options)

    def raw_socket(self):
        """A blocking connection for bytes that no client would send."""
        connection = socket.socket(socket.AF_UNIX)
        connection.settimeout(PATIENCE_SECONDS)
        connection.connect(self.socket_path)
        return connection

    def settle(self):
        """Returns once everything that was answered so far is committed: the store commits in order."""
        if self._barrier is None:
            self._barrier = self.client(durable=True)
        self._barrier.create_reporting_session(BARRIER_REPORTER)
        self._barrier.send_message({"barrier": time.monotonic()}, GENERIC, 0, [BARRIER_REPORTER])
        self._barrier.destroy_reporting_session(BARRIER_REPORTER)

    def eventually(self, condition, what):
        """Tries again, after a durable round trip each time, until the condition holds."""
        deadline = time.monotonic() + PATIENCE_SECONDS
        while not condition():
            if time.monotonic() > deadline:
                raise AssertionError(f"never came true: {what}")
            self.settle()

    def rows(self, query, *parameters):
        """What the store holds, read beside the daemon."""
        store = sqlite3.connect(f"file:{self.store_path}?mode=ro", uri=True, timeout=PATIENCE_SECONDS)
        try:
            return store.execute(query, parameters).fetchall()
        finally:
            store.close()

    def events(self, name, **fields):
        """The payloads of the events of one name that have these fields, in the order of recording."""
        if self.process.poll() is None:
            self.settle()
        payloads = [json.loads(text) for (text,) in
                    self.rows("SELECT payload FROM events WHERE name = ? ORDER BY id", name)]
        return [p for p in payloads if all(p.get(key) == value for key, value in fields.items())]

    def log(self):
        return self.log_path.read_text(errors="replace")

    def memory_bytes(self, field="VmRSS"):
        status = pathlib.Path(f"/proc/{self.process.pid}/status").read_text()
        return int(status.split(field + ":")[1].split()[0]) * 1024

    def wait(self):
        """The exit status; a sanitizer's finding is a failure whatever it is."""
        status = self.process.wait(PATIENCE_SECONDS)
        log = self.log()
        for finding in ("AddressSanitizer", "ThreadSanitizer", "runtime error:"):
            assert finding not in log, log[-8000:]
        return status

    def terminate(self):
        self._close_barrier()
        self.process.terminate()
        return self.wait()

    def kill(self):
        self._close_barrier()
        self.process.send_signal(signal.SIGKILL)
        return self.wait()

    def _close_barrier(self):
        if self._barrier is not None:
            self._barrier.close()
            self._barrier = None


def run_program(name, *arguments):
    """A finished run of one of the built programs, its output as text."""
    return subprocess.run([BIN_DIR / name, *arguments], capture_output=True, text=True, timeout=PATIENCE_SECONDS,
                          stdin=subprocess.DEVNULL)


class DaemonTest(unittest.TestCase):
    """Cases that share a daemon, each with clients of its own; or start one of their own with start_daemon()."""

    config = {}  # files of the shared daemon's config directory

    @classmethod
    def make_root(cls, add_cleanup):
        root = tempfile.mkdtemp(prefix="tal-")
        os.chmod(root, 0o755)  # other users connect too
        add_cleanup(shutil.rmtree, root, ignore_errors=True)
        return root

    @classmethod
    def setUpClass(cls):
        cls.daemon = Daemon(cls.make_root(cls.addClassCleanup), config=cls.config)
        cls.addClassCleanup(cls._end_shared)

    @classmethod
    def _end_shared(cls):
        status = cls.daemon.terminate()
        if status != 0:
            raise AssertionError(f"the shared daemon ended with {status}:\n{cls.daemon.log()[-4000:]}")

    def start_daemon(self, *arguments, root=None, **options):
        daemon = Daemon(root or self.make_root(self.addCleanup), *arguments, **options)
        self.addCleanup(lambda: daemon.kill() if daemon.process.poll() is None else None)
        return daemon

    def connect(self, daemon=None, **options):
        client = (daemon or self.daemon).client(**options)
        self.addCleanup(client.close)
        return client

    def start_process(self, *command, **options):
        process = subprocess.Popen(command, stdin=subprocess.DEVNULL, **options)

        def end():
            process.kill()
            process.communicate()

        self.addCleanup(end)
        return process

    def start_bus(self, root):
        """A bus of the test's own, with nobody on it, and nobody whom it would start."""
        (pathlib.Path(root) / "bus.conf").write_text(
            f"<busconfig><type>session</type><listen>unix:path={root}/bus</listen><policy context='default'>"
            "<allow send_destination='*' eavesdrop='true'/><allow eavesdrop='true'/><allow own='*'/></policy>"
            "</busconfig>")
        bus = self.start_process("dbus-daemon", f"--config-file={root}/bus.conf", "--nofork", "--print-address=1",
                                 stdout=subprocess.PIPE, stderr=subprocess.DEVNULL)
        return bus.stdout.readline().decode().strip()

    def wait_for_no_sessions(self):
        """Clients of earlier cases leave asynchronously."""
        probe = self.connect()
        self.daemon.eventually(lambda: probe.get_all_reporters() == [], "all sessions of earlier cases are gone")

    def assert_refused(self, code, client, call, domain="org.vantle.talsys.ipc"):
        with self.assertRaises(talreporting.ReportingError) as caught:
            client.result(call)
        self.assertEqual((caught.exception.domain, caught.exception.code), (domain, code), caught.exception)
