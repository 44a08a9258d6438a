"""A Vox client in Python, made from docs/wire-protocol.md alone.

It shows that the document suffices for another language, and tests use it to
talk to our services from outside. Standard library and cbor2 only.

    radio = Connection.open("net.example.radio")
    reply = radio.request({"o": "get", "a": "me", "r": "/radio/signal", "v": None})
    radio.send({"o": "set", "a": "me", "r": "/radio/power", "v": True})
    message, request_id = radio.receive()

A connection is for one thread. Every wait ends after `timeout` seconds with
TimeoutError; a peer that closes raises ConnectionError, one that breaks the
protocol ProtocolError.

Values: None, bool, int (int64), Uint64, finite float, Date, bytes, str, list, dict,
Error. Descriptors and UUIDs are left out.
"""

import collections
import dataclasses
import io
import os
import socket
import struct
import time

import cbor2

TAG_UINT64 = int.from_bytes(b"voxu", "big")
TAG_DATE = int.from_bytes(b"voxt", "big")
TAG_ERROR = int.from_bytes(b"voxe", "big")

HEADER = struct.Struct("<4sBBHIIQ")
MAGIC = b"VOX1"
HELLO, MESSAGE, REQUEST, REPLY, CANCEL, PING, DROPPED, REFUSED = range(1, 9)
PING_WANTS_ANSWER = 1
LIMITS = {"min": 1, "max": 1, "bytes": 16 << 20, "depth": 64, "fds": 0}


class ProtocolError(Exception):
    """The peer sent what the protocol does not allow."""


# ---- Values -----------------------------------------------------------------------


class Uint64(int):
    """An unsigned 64-bit integer, which is a type of its own on the wire."""


@dataclasses.dataclass(frozen=True)
class Date:
    nanoseconds: int  # since 1970-01-01T00:00:00Z


@dataclasses.dataclass(frozen=True)
class Error:
    code: int
    description: str | None = None


def _tagged(value):
    """`value` as cbor2 has it."""
    match value:
        case Uint64():
            return cbor2.CBORTag(TAG_UINT64, int(value))
        case Date():
            return cbor2.CBORTag(TAG_DATE, value.nanoseconds)
        case Error(description=None):
            return cbor2.CBORTag(TAG_ERROR, [value.code])
        case Error():
            return cbor2.CBORTag(TAG_ERROR, [value.code, value.description])
        case list():
            return [_tagged(v) for v in value]
        case dict():
            return {k: _tagged(v) for k, v in value.items()}
    return value


def decode(body):
    """The value that fills `body`."""
    def untagged(_, tag):
        match tag.tag:
            case n if n == TAG_UINT64:
                return Uint64(tag.value)
            case n if n == TAG_DATE:
                return Date(tag.value)
            case n if n == TAG_ERROR:
                return Error(*tag.value)
        raise ProtocolError(f"tag {tag.tag} is unknown")

    source = io.BytesIO(body)
    value = cbor2.CBORDecoder(source, tag_hook=untagged).decode()
    if source.tell() != len(body):
        raise ProtocolError("bytes follow the value")
    return value


# ---- Frames -----------------------------------------------------------------------


def frame(kind, value, request_id=0, flags=0):
    body = cbor2.dumps(_tagged(value))
    return HEADER.pack(MAGIC, kind, flags, 0, len(body), 0, request_id) + body


class Connection:
    """One end of a connection, over a connected socket that it owns."""

    def __init__(self, connected, timeout=30):
        self.timeout = timeout
        self._socket = connected
        self._received = bytearray()
        self._messages = collections.deque()  # (message, request id or None)
        self._replies = {}
        self._last_id = 0
        self._socket.settimeout(timeout)
        self._write(HELLO, LIMITS)
        kind, _, _, hello = self._read_frame(time.monotonic() + timeout)
        if kind != HELLO or not hello["min"] <= 1 <= hello["max"]:
            raise ProtocolError("no hello, or no common version")

    @classmethod
    def open(cls, name, timeout=30):
        """A client of the service `name`; waits until somebody serves it."""
        deadline = time.monotonic() + timeout
        while True:
            connected = socket.socket(socket.AF_UNIX, socket.SOCK_STREAM)
            try:
                connected.connect(os.path.join(os.environ["VOX_RUNTIME_DIR"], name))
                return cls(connected, timeout)
            except (FileNotFoundError, ConnectionRefusedError, BlockingIOError):
                connected.close()
                if time.monotonic() > deadline:
                    raise
                time.sleep(0.01)

    def close(self):
        self._socket.close()

    def send(self, message):
        self._write(MESSAGE, message)

    def request(self, message):
        """Sends `message` and returns its reply. Messages that come meanwhile
        wait for receive()."""
        self._last_id += 1
        self._write(REQUEST, message, self._last_id)
        deadline = time.monotonic() + self.timeout
        while self._last_id not in self._replies:
            self._handle_frame(deadline)
        reply = self._replies.pop(self._last_id)
        if isinstance(reply, Error):
            raise ProtocolError(f"refused: {reply}")
        return reply

    def receive(self):
        """The next message and its request id, None when it wants no reply."""
        deadline = time.monotonic() + self.timeout
        while not self._messages:
            self._handle_frame(deadline)
        return self._messages.popleft()

    def _write(self, kind, value, request_id=0, flags=0):
        self._socket.sendall(frame(kind, value, request_id, flags))

    def _handle_frame(self, deadline):
        kind, flags, request_id, value = self._read_frame(deadline)
        if kind == MESSAGE:
            self._messages.append((value, None))
        elif kind == REQUEST:
            self._messages.append((value, request_id))
        elif kind in (REPLY, REFUSED):  # a reply is a dictionary, a refusal an error
            self._replies[request_id] = value
        elif kind == PING and flags & PING_WANTS_ANSWER:
            self._write(PING, None, request_id)
        elif kind not in (PING, CANCEL, DROPPED):  # of which nothing depends here
            raise ProtocolError(f"a frame of type {kind}")

    def _read_frame(self, deadline):
        header = self._take(HEADER.size, deadline)
        magic, kind, flags, count, length, zero, request_id = HEADER.unpack(header)
        if magic != MAGIC or zero != 0:
            raise ProtocolError(f"no frame begins with {header.hex()}")
        if count != 0:
            raise ProtocolError("descriptors, which this client does not take")
        return kind, flags, request_id, decode(self._take(length, deadline))

    def _take(self, count, deadline):
        while len(self._received) < count:
            self._socket.settimeout(max(deadline - time.monotonic(), 0.001))
            data = self._socket.recv(65536)
            if not data:
                raise ConnectionError("the peer closed the connection")
            self._received += data
        taken = bytes(self._received[:count])
        del self._received[:count]
        return taken
