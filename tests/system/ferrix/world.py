"""Builds the private world of one scenario: its own root file system that nothing survives.

Called in a process that is already in a mount namespace of its own (see `enter`). The machine's
root is seen through an overlay whose upper side is a tmpfs, so every path the daemon uses can be
written freely; /dev is private too, with the loop devices that the scenario needs.
"""
import ctypes
import os
import stat
import subprocess

CLONE_NEWNS = 0x00020000
PR_SET_CHILD_SUBREAPER = 36
MS_REC, MS_PRIVATE, MS_BIND = 0x4000, 1 << 18, 0x1000
_libc = ctypes.CDLL(None, use_errno=True)
LOOPS = 128


def mount(source, target, fstype=None, flags=0, data=None):
    args = [x.encode() if isinstance(x, str) else x for x in (source, target, fstype)]
    if _libc.mount(*args, ctypes.c_ulong(flags), data.encode() if data else None) != 0:
        error = ctypes.get_errno()
        raise OSError(error, f"mount {source} on {target}: {os.strerror(error)}")


def enter(repository, scratch, extra=()):
    """Moves this process into a new root. `scratch` is an empty folder of the caller's; `extra` are
    further folders of the machine to be seen there."""
    # Daemons that a scenario starts become children of this process when they have forked, so that
    # their end is seen at once.
    _libc.prctl(PR_SET_CHILD_SUBREAPER, 1, 0, 0, 0)
    if _libc.unshare(CLONE_NEWNS) != 0:
        raise OSError(ctypes.get_errno(), "unshare")
    mount(None, "/", None, MS_REC | MS_PRIVATE)
    mount("tmpfs", scratch, "tmpfs", 0, "mode=755,size=8g")
    for name in ("upper", "work", "root"):
        os.mkdir(f"{scratch}/{name}")
    root = f"{scratch}/root"
    mount("overlay", root, "overlay", 0,
          f"lowerdir=/,upperdir={scratch}/upper,workdir={scratch}/work")
    mount("proc", root + "/proc", "proc")  # of this process namespace
    mount("/sys", root + "/sys", None, MS_BIND | MS_REC)
    for path, mode in (("/tmp", "1777"), ("/run", "755"), ("/dev", "755")):
        mount("tmpfs", root + path, "tmpfs", 0, f"mode={mode},size=6g")
    for path in (repository, *extra):
        os.makedirs(root + path, exist_ok=True)
        mount(path, root + path, None, MS_BIND | MS_REC)
    _make_devices(root + "/dev")
    os.chroot(root)
    os.chdir("/")
    os.umask(0o022)
    # The machine's own state must not shine through.
    for path in ("/var/packages", "/etc/keld", "/etc.defaults", "/var/lib/keld"):
        subprocess.run(["rm", "-rf", path], check=True)
        os.makedirs(path)
    os.makedirs("/etc/cron.d", exist_ok=True)


def _make_devices(dev):
    char = {"null": (1, 3), "zero": (1, 5), "full": (1, 7), "random": (1, 8), "urandom": (1, 9),
            "tty": (5, 0), "fuse": (10, 229), "loop-control": (10, 237)}
    for name, numbers in char.items():
        _node(f"{dev}/{name}", stat.S_IFCHR, *numbers)
    for number in range(LOOPS):
        _node(f"{dev}/loop{number}", stat.S_IFBLK, 7, number)
    os.symlink("/proc/self/fd", f"{dev}/fd")
    os.mkdir(f"{dev}/shm", 0o1777)
    os.mkdir(f"{dev}/pts")  # terminals
    mount("devpts", f"{dev}/pts", "devpts", 0, "newinstance,ptmxmode=0666,mode=620")
    os.symlink("pts/ptmx", f"{dev}/ptmx")


def _node(path, kind, major, minor):
    os.mknod(path, kind | 0o666, os.makedev(major, minor))
