"""Stands in for the log daemon: takes every line sent to /dev/log and keeps it."""
import os
import re
import socket
import threading
import time

LINE = re.compile(rb"<(\d+)>\w{3} [ \d]\d \d\d:\d\d:\d\d (\w+): (.*)", re.S)


class LogDaemon:
    def __init__(self, path="/dev/log"):
        self.lines = []
        self._path = path
        self._lock = threading.Lock()
        self._socket = socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
        self._socket.setsockopt(socket.SOL_SOCKET, socket.SO_RCVBUF, 8 << 20)
        if os.path.exists(path):
            os.unlink(path)
        self._socket.bind(path)
        os.chmod(path, 0o666)
        threading.Thread(target=self._run, daemon=True).start()

    def _run(self):
        while True:
            data = self._socket.recv(1 << 18)
            match = LINE.match(data)
            with self._lock:
                self.lines.append(os.fsdecode(match[3] if match else data).rstrip("\n"))

    def mark(self):
        with self._lock:
            return len(self.lines)

    def since(self, mark=0):
        with self._lock:
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
