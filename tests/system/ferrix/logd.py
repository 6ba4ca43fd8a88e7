"""Stands in for the log daemon: takes every line sent to /dev/log and keeps it.

A process of its own reads the socket: a reader that had to share the interpreter with the scenario
would be late when the machine is busy, and the daemon drops lines when its reader is late.
"""
import ctypes
import os
import re
import select
import signal
import socket
import threading
import time

LINE = re.compile(rb"<(\d+)>\w{3} [ \d]\d \d\d:\d\d:\d\d (\w+): (.*)", re.S)
KEPT = "/tmp/log-lines"  # what has arrived, each with a NUL behind it
ROOM = 512  # datagrams that wait for the reader, as an init system sets it; the kernel's own is 10
CLONE_NEWNET, PR_SET_PDEATHSIG = 0x40000000, 1


def _read_lines(path, ready):
    """The reader's process."""
    libc = ctypes.CDLL(None, use_errno=True)
    libc.prctl(PR_SET_PDEATHSIG, signal.SIGKILL)
    # The room belongs to the network namespace that a socket is made in.
    if libc.unshare(CLONE_NEWNET) == 0:
        with open("/proc/sys/net/unix/max_dgram_qlen", "w", encoding="ascii") as room:
            room.write(str(ROOM))
    os.nice(-10)
    reader = socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
    reader.setsockopt(socket.SOL_SOCKET, socket.SO_RCVBUF, 8 << 20)
    if os.path.exists(path):
        os.unlink(path)
    reader.bind(path)
    os.chmod(path, 0o666)
    with open(KEPT, "wb", buffering=0) as kept:
        os.write(ready, b"x")
        waiting = [reader]
        while True:
            select.select(waiting, [], [])
            lines = []
            try:
                while len(lines) < ROOM:
                    lines.append(reader.recv(1 << 18, socket.MSG_DONTWAIT))
            except BlockingIOError:
                pass
            kept.write(b"".join(line + b"\0" for line in lines))


class LogDaemon:
    def __init__(self, path="/dev/log"):
        self.lines = []
        self._path = path
        self._lock = threading.Lock()
        self._raw = []  # arrived, and not yet taken apart
        self._rest = b""
        heard, ready = os.pipe()
        if os.fork() == 0:
            try:
                _read_lines(path, ready)
            finally:
                os._exit(1)
        os.close(ready)
        assert os.read(heard, 1) == b"x", "the log daemon of the test does not start"
        os.close(heard)
        self._kept = open(KEPT, "rb", buffering=0)  # pylint: disable=consider-using-with

    def _load(self):
        """Takes in what has arrived; the caller has the lock."""
        *raw, self._rest = (self._rest + self._kept.read()).split(b"\0")
        self._raw += raw

    def mark(self):
        """The number of lines so far; quick, as a run goes on meanwhile."""
        with self._lock:
            self._load()
            return len(self.lines) + len(self._raw)

    def since(self, mark=0):
        with self._lock:
            self._load()
            for data in self._raw:
                match = LINE.match(data)
                self.lines.append(os.fsdecode(match[3] if match else data).rstrip("\n"))
            self._raw.clear()
            return self.lines[mark:]

    def expect(self, part, mark=0, timeout=20):
        """True as soon as a line contains `part`; the line may be on its way still."""
        deadline = time.monotonic() + timeout
        while not self.has(part, mark):
            if time.monotonic() > deadline:
                return False
            time.sleep(0.05)
        return True

    def lacks(self, part, mark=0):
        """True if no line contains `part`, of all that were sent before this call."""
        end = f"end of lines {time.monotonic_ns()}"
        with socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as sender:
            sender.connect(self._path)
            sender.send(f"<15>{time.strftime('%b %e %H:%M:%S')} test: {end}".encode())
        if not self.expect(end, mark):
            raise AssertionError("the log daemon of the test does not answer")
        return not self.has(part, mark)

    def has(self, part, mark=0):
        return any(part in line for line in self.since(mark))
