"""A disk that keeps a record of every block that is written to it, and of every flush, so that it can
be looked at as it would be after a power cut at any moment.

The disk is a loop device over a file that nbdkit serves through FUSE: its requests come one at a
time and in order. After a cut the disk holds what was written before the last flush, and of what
was written since then any part: a disk may keep its cache in any order.
"""
import os
import shutil
import struct
import subprocess
import time

from .box import sh, wait_until

HEADER = struct.Struct("<cQId")  # "W" or "F", offset, length, time

PLUGIN = r'''
import os, struct, time
import nbdkit
API_VERSION = 2
files = {}
def config(key, value):
    files[key] = os.open(value, os.O_RDWR | os.O_APPEND if key == "log" else os.O_RDWR)
def thread_model():
    return nbdkit.THREAD_MODEL_SERIALIZE_ALL_REQUESTS
def open(readonly):
    return 1
def get_size(h):
    return os.fstat(files["image"]).st_size
def can_flush(h):
    return True
def can_fua(h):
    return nbdkit.FUA_NATIVE
def can_trim(h):
    return False
def can_zero(h):
    return False
def note(kind, offset, data):
    os.write(files["log"], struct.pack("<cQId", kind, offset, len(data), time.monotonic()) + data)
def pread(h, buf, offset, flags):
    data = os.pread(files["image"], len(buf), offset)
    buf[:len(data)] = data
def pwrite(h, buf, offset, flags):
    os.pwrite(files["image"], buf, offset)
    note(b"W", offset, bytes(buf))
    if flags & nbdkit.FLAG_FUA:
        note(b"F", 0, b"")
def flush(h, flags):
    note(b"F", 0, b"")
'''


class RecordedDisk:
    def __init__(self, size_mb, mount_options="commit=1"):
        self.options = mount_options
        self.work = "/tmp/recorded-disk"
        self.image, self.log = f"{self.work}/image", f"{self.work}/log"
        self.base, self.cut_image = f"{self.work}/base", f"{self.work}/cut"
        os.makedirs(f"{self.work}/served")
        sh("truncate", "-s", f"{size_mb}M", self.image)
        sh("mkfs.ext4", "-q", "-F", "-E", "lazy_itable_init=0,lazy_journal_init=0", self.image)
        self.loop, self.server = None, None

    def serve(self, mountpoint):
        """Mounts the disk; what was written before goes into the base that is always there."""
        shutil.copyfile(self.image, self.base)
        open(self.log, "w", encoding="ascii").close()
        with open(f"{self.work}/plugin.py", "w", encoding="ascii") as plugin:
            plugin.write(PLUGIN)
        self.server = subprocess.Popen(
            ["nbdfuse", f"{self.work}/served/disk", "--command", "nbdkit", "-s", "python",
             f"{self.work}/plugin.py", f"image={self.image}", f"log={self.log}"])
        wait_until(lambda: os.path.exists(f"{self.work}/served/disk"), 20, 0.05, "the served disk")
        self.mount(f"{self.work}/served/disk", mountpoint)

    def mount(self, image, mountpoint):
        self.loop = sh("losetup", "-f", "--show", image).strip()
        sh("mount", "-o", self.options, self.loop, mountpoint)

    def unmount(self, mountpoint):
        if os.path.ismount(mountpoint):
            sh("umount", mountpoint)
        if self.loop:
            sh("losetup", "-d", self.loop)
        self.loop = None

    def position(self):
        """How far the record has got: the present moment as a place in it."""
        return os.path.getsize(self.log)

    def close(self, mountpoint):
        subprocess.run(["umount", "-l", mountpoint], check=False, stderr=subprocess.DEVNULL)
        if self.loop:
            subprocess.run(["losetup", "-d", self.loop], check=False)
            self.loop = None
        if self.server:
            subprocess.run(["umount", "-l", f"{self.work}/served/disk"], check=False,
                           stderr=subprocess.DEVNULL)
            subprocess.run(["umount", "-l", f"{self.work}/served"], check=False,
                           stderr=subprocess.DEVNULL)
            with_timeout(self.server)
            self.server = None

    def read_record(self, start, end):
        """Takes the record from memory: its operations, and those between two positions of it."""
        with open(self.log, "rb") as log:
            self.raw = log.read()
        self.ops, at = [], 0
        while at < len(self.raw):
            kind, offset, size, when = HEADER.unpack_from(self.raw, at)
            self.ops.append((kind, offset, at + HEADER.size, size, when, at))
            at += HEADER.size + size
        self.first = next(i for i, op in enumerate(self.ops) if op[5] >= start)
        self.last = next((i for i, op in enumerate(self.ops) if op[5] >= end), len(self.ops))

    def cut(self, rng):
        """Builds the disk as it may be after a power cut in the run; gives its image and the moment."""
        cut = rng.randint(self.first, self.last - 1)
        flushed = max((i for i in range(cut) if self.ops[i][0] == b"F"), default=-1)
        shutil.copyfile(self.base, self.cut_image)
        with open(self.cut_image, "r+b") as disk:
            for i, (kind, offset, at, size, _, _) in enumerate(self.ops[:cut]):
                if kind != b"W" or (i > flushed and rng.random() < 0.5):
                    continue
                if i == cut - 1:  # torn at the border of a sector
                    size = rng.randint(0, size // 4096) * 4096
                disk.seek(offset)
                disk.write(self.raw[at:at + size])
        return self.cut_image, self.ops[cut][4]


def with_timeout(process):
    deadline = time.monotonic() + 10
    while process.poll() is None and time.monotonic() < deadline:
        time.sleep(0.05)
    if process.poll() is None:
        process.terminate()
        process.wait()
