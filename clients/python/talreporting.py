"""Client of the talreporting daemon: one connection, its eleven operations, and pipelining.

    with talreporting.Client() as client:
        client.create_reporting_session(7)
        client.set_service_type(7, talreporting.SERVICE_TYPES["longformaudio"])
        client.start_reporting_session(7)
        client.send_message({"RvSessionVolume": 0.5}, category=4, type=1, reporter_ids=[7])
        client.stop_reporting_session(7)

Needs Python 3.9 and cbor2 (Debian package python3-cbor2). The protocol is told in docs/protocol.md.
A client is used by one thread at a time.
"""

import collections
import os
import selectors
import socket
import struct
import time

import cbor2

SERVICE_TYPES = {name: number for number, name in enumerate(
    "generic voxa telephony haptics alarms standalone soundautoconfig longformaudio nonlongformaudio "
    "audiodeviceusage alerts test apiusage systemsounds".split())}
NO_SERVICE_TYPE = 65535

(HELLO, CREATE, SET_SERVICE_TYPE, GET_SERVICE_NAME, SET_CONFIGURATION, START, SEND_MESSAGE, STOP, DESTROY, VALIDATE,
 GET_ALL_REPORTERS, KILL_SERVICE) = range(12)


class ReportingError(Exception):
    """The daemon answered a request with an error: `domain`, `code` and a text."""

    def __init__(self, domain, code, message):
        super().__init__(f"{message} ({domain} {code})")
        self.domain, self.code = domain, code


def default_socket_path():
    """TALREPORTING_SOCKET, else the user's own daemon if one is there, else the system's."""
    if path := os.environ.get("TALREPORTING_SOCKET"):
        return path
    user = os.path.join(os.environ.get("XDG_RUNTIME_DIR") or "/nonexistent", "talreporting/talreporting.sock")
    return user if os.path.exists(user) else "/run/talreporting/talreporting.sock"


def encode_frame(item):
    """The bytes of one frame. A date becomes a number of seconds under tag 1; it must know its time zone."""
    body = cbor2.dumps(item, datetime_as_timestamp=True)
    return struct.pack("<I", len(body)) + body


class Client:
    """One connection. Raises OSError when there is no daemon, ReportingError when it refuses a request.

    `timeout` is how many seconds any one reply is waited for before TimeoutError. With `durable`, the reply to a
    message comes only when everything that the message caused is safely stored.
    """

    def __init__(self, path=None, *, durable=False, timeout=30.0):
        self.timeout = timeout
        self.socket = socket.socket(socket.AF_UNIX)
        self._selector = selectors.DefaultSelector()
        self._received = bytearray()
        self._replies = collections.defaultdict(collections.deque)
        self._last_call = 0
        try:
            self.socket.connect(path or default_socket_path())
            self.socket.setblocking(False)
            self._selector.register(self.socket, selectors.EVENT_READ)
            self.server = self.hello(acknowledge="durable") if durable else None
        except BaseException:
            self.close()
            raise

    def __enter__(self):
        return self

    def __exit__(self, *exception):
        self.close()

    def close(self):
        """Ends the connection; the daemon then stops this client's started sessions."""
        self._selector.close()
        self.socket.close()

    # The operations. All wait for their reply but start and kill, whose reply is held back or never comes.

    def hello(self, version=1, **options):
        return self.call(HELLO, version, options)

    def create_reporting_session(self, reporter_id):
        return self.call(CREATE, reporter_id)

    def set_service_type(self, reporter_id, service_type):
        return self.call(SET_SERVICE_TYPE, service_type, reporter_id)

    def get_service_name(self, reporter_id):
        """The number of the service type; NO_SERVICE_TYPE if no client has such a session."""
        return self.call(GET_SERVICE_NAME, reporter_id)

    def set_configuration(self, reporter_id, configuration):
        return self.call(SET_CONFIGURATION, configuration, reporter_id)

    def start_reporting_session(self, reporter_id):
        """Starts the session and returns the call: `result(call)` waits until the session is stopped."""
        return self.request(START, reporter_id)

    def send_message(self, message, category, type, reporter_ids=None):
        """Sends to the sessions named, or to every started one if none is named."""
        return self.call(SEND_MESSAGE, message, category, type, reporter_ids)

    def stop_reporting_session(self, reporter_id):
        return self.call(STOP, reporter_id)

    def destroy_reporting_session(self, reporter_id):
        return self.call(DESTROY, reporter_id)

    def validate_reporter(self, reporter_id):
        """{"reporterID": …, "serviceType": …} of whichever client's session; reporterID 0 if there is none."""
        return self.call(VALIDATE, reporter_id)

    def get_all_reporters(self):
        return self.call(GET_ALL_REPORTERS)

    def kill_service(self):
        """Ends the daemon. Allowed for root and the daemon's own user; nobody ever answers it."""
        return self.request(KILL_SERVICE)

    # Pipelining: any number of requests, then their results.

    def call(self, operation, *arguments):
        """Sends a request and waits for its result."""
        return self.result(self.request(operation, *arguments))

    def request(self, operation, *arguments, reply=True):
        """Sends a request without waiting for its reply and returns its call, 0 when no reply is wanted."""
        call = 0
        if reply:
            self._last_call = call = self._last_call + 1
        self.send_raw(encode_frame([operation, call, *arguments]))
        return call

    def result(self, call):
        """Waits for the next reply to this call and returns its result or raises its error.

        Call 0 stands for the errors that the daemon could not assign to a call.
        """
        deadline = time.monotonic() + self.timeout
        while not self.has_reply(call):
            self._exchange(b"", deadline)
        status, value = self._replies[call].popleft()
        if not self._replies[call]:
            del self._replies[call]
        if status == 0:
            return value
        raise ReportingError(value["domain"], value["code"], value["message"])

    def has_reply(self, call):
        """Whether a reply to this call has been read already; reads nothing."""
        return call in self._replies

    def send_raw(self, data):
        """Sends bytes as they are, reading replies meanwhile so that neither side waits for the other."""
        data = memoryview(data)
        deadline = time.monotonic() + self.timeout
        while data:
            try:
                data = data[self.socket.send(data):]
            except BlockingIOError:
                self._exchange(data, deadline)

    def _exchange(self, outgoing, deadline):
        """Waits until there is something to read, or room for `outgoing`, and reads."""
        events = selectors.EVENT_READ | (selectors.EVENT_WRITE if outgoing else 0)
        self._selector.modify(self.socket, events)
        ready = self._selector.select(max(0.0, deadline - time.monotonic()))
        if not ready:
            raise TimeoutError(f"nothing from the daemon for {self.timeout:g} s")
        if ready[0][1] & selectors.EVENT_READ:
            self._read()

    def _read(self):
        data = self.socket.recv(1 << 18)
        if not data:
            raise ConnectionError("the daemon closed the connection")
        self._received += data
        start = 0
        while len(self._received) - start >= 4:
            end = start + 4 + int.from_bytes(self._received[start:start + 4], "little")
            if len(self._received) < end:
                break
            call, status, value = cbor2.loads(self._received[start + 4:end])
            self._replies[call].append((status, value))
            start = end
        del self._received[:start]
