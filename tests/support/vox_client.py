"""A Vox client in Python, made from docs/wire-protocol.md alone.

It shows that the document suffices for another language, and tests use it to
talk to our services from outside. Standard library and cbor2 only.

    with Connection.open("net.example.radio") as radio:
        reply = radio.request({"o": "get", "a": "me", "r": "/radio/signal", "v": None})
        radio.send({"o": "set", "a": "me", "r": "/radio/power", "v": True})
        message, request_id = radio.receive()

A connection is for one thread. Every wait ends after `timeout` seconds with
TimeoutError; a peer that closes raises ConnectionError, one that breaks the
protocol ProtocolError.

Values: None, bool, int (int64), Uint64, float, Date, bytes, str, uuid.UUID, list,
dict, Error, Fd, Endpoint.
"""

import collections
import dataclasses
import io
import os
import socket
import struct
import time
import uuid

import cbor2

TAG_UINT64 = int.from_bytes(b"voxu", "big")
TAG_DATE = int.from_bytes(b"voxt", "big")
TAG_ERROR = int.from_bytes(b"voxe", "big")
TAG_FD = int.from_bytes(b"voxf", "big")
TAG_ENDPOINT = int.from_bytes(b"voxp", "big")
TAG_UUID = 37

HEADER = struct.Struct("<4sBBHIIQ")
MAGIC = b"VOX1"
HELLO, MESSAGE, REQUEST, REPLY, CANCEL, PING, DROPPED, REFUSED = range(1, 9)
TAP = 9
PING_WANTS_ANSWER = 1
LIMITS = {"min": 1, "max": 1, "bytes": 16 << 20, "depth": 64, "fds": 64}


class ProtocolError(Exception):
    """The peer sent what the protocol does not allow."""


class Refused(Exception):
    """The peer did not take a request; the argument is its Error."""


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


@dataclasses.dataclass(frozen=True)
class Fd:
    number: int  # when received: the receiver closes it


@dataclasses.dataclass(frozen=True)
class Endpoint:
    number: int  # the same


def _head(kind, argument):
    for short, (code, size) in enumerate(((None, 0), (24, 1), (25, 2), (26, 4), (27, 8))):
        if argument < (24 if short == 0 else 1 << 8 * size):
            break
    if code is None:
        return bytes([kind << 5 | argument])
    return bytes([kind << 5 | code]) + argument.to_bytes(size, "big")


def _tag(number, content):
    return _head(6, number) + content


def _int(value):
    if not -(1 << 63) <= value < 1 << 63:
        raise ValueError(f"{value} does not fit into an int64")
    return cbor2.dumps(value)


def _descriptor(tag, value, descriptors):
    descriptors.append(value.number)
    return _tag(tag, _head(0, len(descriptors) - 1))


def _encode(value, descriptors):
    match value:
        case None | bool() | str() | bytes():
            return cbor2.dumps(value)
        case Uint64():
            if not 0 <= value < 1 << 64:
                raise ValueError(f"{int(value)} does not fit into a uint64")
            return _tag(TAG_UINT64, _head(0, int(value)))
        case int():
            return _int(value)
        case float():  # cbor2 shortens NaN and the infinities
            return b"\xfb" + struct.pack(">d", value)
        case Date():
            return _tag(TAG_DATE, _int(value.nanoseconds))
        case uuid.UUID():
            return _tag(TAG_UUID, cbor2.dumps(value.bytes))
        case list():
            return _head(4, len(value)) + b"".join(_encode(v, descriptors) for v in value)
        case dict():
            return _head(5, len(value)) + b"".join(
                cbor2.dumps(k) + _encode(v, descriptors) for k, v in value.items())
        case Error():
            parts = [value.code] if value.description is None else [value.code, value.description]
            return _tag(TAG_ERROR, _encode(parts, descriptors))
        case Fd():
            return _descriptor(TAG_FD, value, descriptors)
        case Endpoint():
            return _descriptor(TAG_ENDPOINT, value, descriptors)
    raise TypeError(f"{type(value).__name__} is no Vox value")


def encode(value):
    """The bytes of a value and the descriptors that travel with them."""
    descriptors = []
    return _encode(value, descriptors), descriptors


def decode(body, descriptors=()):
    """The value that fills `body`; `descriptors` are those of its frame."""
    def tagged(_, tag):
        match tag.tag:
            case n if n == TAG_UINT64:
                return Uint64(tag.value)
            case n if n == TAG_DATE:
                return Date(tag.value)
            case n if n == TAG_ERROR:
                return Error(*tag.value)
            case n if n == TAG_FD:
                return Fd(descriptors[tag.value])
            case n if n == TAG_ENDPOINT:
                return Endpoint(descriptors[tag.value])
        raise ProtocolError(f"tag {tag.tag} is unknown")

    source = io.BytesIO(body)
    value = cbor2.CBORDecoder(source, tag_hook=tagged).decode()
    if source.tell() != len(body):
        raise ProtocolError("bytes follow the value")
    return value


# ---- Frames -----------------------------------------------------------------------


def frame(kind, value, request_id=0, flags=0):
    """The bytes of a frame and its descriptors."""
    body, descriptors = encode(value)
    return HEADER.pack(MAGIC, kind, flags, len(descriptors), len(body), 0, request_id) + body, \
        descriptors


def runtime_directory():
    if os.environ.get("VOX_RUNTIME_DIR"):
        return os.environ["VOX_RUNTIME_DIR"]
    if os.environ.get("XDG_RUNTIME_DIR"):
        return os.path.join(os.environ["XDG_RUNTIME_DIR"], "vox")
    return "/run/vox"


class Connection:
    """One end of a connection, over a connected socket that it owns."""

    def __init__(self, connected, timeout=30):
        self.timeout = timeout
        self.dropped = 0  # messages that the peer said it dropped for us
        self._socket = connected
        self._received = bytearray()
        self._descriptors = collections.deque()  # arrived, not yet part of a frame
        self._messages = collections.deque()  # (message, request id or None)
        self._replies = {}
        self._last_id = 0
        self._socket.settimeout(timeout)
        self._write(HELLO, LIMITS)
        kind, _, _, hello = self._read_frame(time.monotonic() + timeout)
        if kind != HELLO or not hello["min"] <= 1 <= hello["max"]:
            raise ProtocolError("no hello, or no common version")
        self.peer_limits = hello

    @classmethod
    def open(cls, name, timeout=30):
        """A client of the service `name`; waits until somebody serves it."""
        deadline = time.monotonic() + timeout
        while True:
            connected = socket.socket(socket.AF_UNIX, socket.SOCK_STREAM)
            try:
                connected.connect(os.path.join(runtime_directory(), name))
                return cls(connected, timeout)
            except (FileNotFoundError, ConnectionRefusedError, BlockingIOError):
                connected.close()
                if time.monotonic() > deadline:
                    raise
                time.sleep(0.01)

    def __enter__(self):
        return self

    def __exit__(self, *_):
        self.close()

    def close(self):
        self._socket.close()

    def send(self, message):
        self._write(MESSAGE, message)

    def request(self, message):
        """Sends `message` and returns its reply. Messages that come meanwhile
        wait for receive(). Raises Refused when the peer has too many to answer."""
        self._last_id += 1
        self._write(REQUEST, message, self._last_id)
        deadline = time.monotonic() + self.timeout
        while self._last_id not in self._replies:
            self._handle_frame(deadline)
        reply = self._replies.pop(self._last_id)
        if isinstance(reply, Error):
            raise Refused(reply)
        return reply

    def receive(self):
        """The next message and its request id, None when it wants no reply."""
        deadline = time.monotonic() + self.timeout
        while not self._messages:
            self._handle_frame(deadline)
        return self._messages.popleft()

    def _write(self, kind, value, request_id=0, flags=0):
        data, descriptors = frame(kind, value, request_id, flags)
        if descriptors:
            sent = socket.send_fds(self._socket, [data], descriptors)
            data = data[sent:]
        self._socket.sendall(data)

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
        elif kind == DROPPED:
            self.dropped += value
        elif kind not in (PING, CANCEL):  # who asked gave up; an answer would be thrown away
            raise ProtocolError(f"a frame of type {kind}")

    def _read_frame(self, deadline):
        header = self._take(HEADER.size, deadline)
        magic, kind, flags, count, length, zero, request_id = HEADER.unpack(header)
        if magic != MAGIC or zero != 0:
            raise ProtocolError(f"no frame begins with {header.hex()}")
        body = self._take(length, deadline)
        if len(self._descriptors) < count:
            raise ProtocolError("descriptors are missing")
        descriptors = [self._descriptors.popleft() for _ in range(count)]
        return kind, flags, request_id, decode(body, descriptors)

    def _take(self, count, deadline):
        while len(self._received) < count:
            self._socket.settimeout(max(deadline - time.monotonic(), 0.001))
            data, descriptors, _, _ = socket.recv_fds(self._socket, 65536, 64)
            if not data:
                raise ConnectionError("the peer closed the connection")
            self._received += data
            self._descriptors.extend(descriptors)
        taken = bytes(self._received[:count])
        del self._received[:count]
        return taken
