"""The wire format, written independently of the daemon's own codec, and a client of the socket.

Values: None, int, bytes (strings are bytes on the wire; str is encoded as UTF-8), list, dict.
"""
import os
import socket
import struct

SOCKET = "/tmp/ferrix-socket"


def encode(value):
    if value is None:
        return b"\x00\x00"
    if isinstance(value, bool):
        value = int(value)
    if isinstance(value, int):
        value &= (1 << 64) - 1
        size = 1 if value < 1 << 8 else 2 if value < 1 << 16 else 4 if value < 1 << 32 else 8
        return bytes((1, size)) + value.to_bytes(size, "big")
    if isinstance(value, str):
        value = os.fsencode(value)
    if isinstance(value, bytes):
        return b"\x10" + struct.pack(">H", len(value)) + value
    if isinstance(value, (list, tuple)):
        return b"\x41" + b"".join(encode(item) for item in value) + b"\x40"
    if isinstance(value, dict):
        pairs = sorted((os.fsencode(k), v) for k, v in value.items())
        return b"\x42" + b"".join(encode(k) + encode(v) for k, v in pairs) + b"\x40"
    raise TypeError(f"cannot send {value!r}")


class Truncated(Exception):
    """The peer closed in the middle of a value."""


def _decode(read):
    tag = read(1)[0]
    if tag == 0x40:
        return StopIteration
    if tag == 0x00:
        assert read(1) == b"\x00"
        return None
    if tag == 0x01:
        return int.from_bytes(read(read(1)[0]), "big")
    if tag == 0x10:
        return os.fsdecode(read(struct.unpack(">H", read(2))[0]))
    if tag == 0x41:
        items = []
        while (item := _decode(read)) is not StopIteration:
            items.append(item)
        return items
    if tag == 0x42:
        entries = {}
        while (key := _decode(read)) is not StopIteration:
            entries[key] = _decode(read)
        return entries
    raise ValueError(f"unknown tag {tag}")


def decode_stream(sock):
    def read(count):
        data = b""
        while len(data) < count:
            piece = sock.recv(count - len(data))
            if not piece:
                raise Truncated()
            data += piece
        return data
    return _decode(read)


def connect(timeout=90):
    sock = socket.socket(socket.AF_UNIX, socket.SOCK_STREAM)
    sock.settimeout(timeout)
    sock.connect(SOCKET)
    return sock


def send_raw(data, timeout=90):
    """Sends bytes and returns all that comes back before the daemon closes."""
    with connect(timeout) as sock:
        try:
            sock.sendall(data)
            sock.shutdown(socket.SHUT_WR)
        except (BrokenPipeError, ConnectionResetError):
            pass
        answer = b""
        try:
            while piece := sock.recv(65536):
                answer += piece
        except ConnectionResetError:
            pass
        return answer


def request(message, timeout=90):
    """Sends one request; returns its response, or None when the daemon closes without one."""
    with connect(timeout) as sock:
        sock.sendall(encode(message))
        try:
            return decode_stream(sock)
        except Truncated:
            return None
