"""The box of one scenario: a volume with shares, the package's folders, the daemon, its devices."""
import contextlib
import os
import shutil
import signal
import sqlite3
import subprocess
import time

from . import wire
from .logd import LogDaemon

PACKAGE = "/var/packages/Ferrix"
FILTER_KEYS = ("custom_name", "custom_ext", "black_name", "black_ext", "white_name", "white_ext")


def sh(*args, **options):
    return subprocess.run(args, check=True, stdout=subprocess.PIPE, stderr=subprocess.STDOUT,
                          text=True, errors="surrogateescape", **options).stdout


def wait_until(condition, timeout=60, step=0.1, what="the condition"):
    deadline = time.monotonic() + timeout
    while not (result := condition()):
        if time.monotonic() > deadline:
            raise AssertionError(f"waited {timeout} s in vain for {what}")
        time.sleep(step)
    return result


class Device:
    """A file system image on a loop device, mounted like a plugged-in disk."""

    def __init__(self, box, name, fs="ext4", size_mb=64, loop=None):
        """With `loop`: a loop device that holds a file system already."""
        self.box, self.name, self.fs = box, name, fs
        self.mountpoint = f"/volumeUSB{len(box.devices) + 1}/usbshare"
        self.loop = loop or self._make_image(f"/tmp/{name}.img", size_mb)
        self.uuid = sh("blkid", "-o", "value", "-s", "UUID", self.loop).strip().lower()
        self.mounted = False
        box.devices.append(self)
        box.write_host_conf()

    def _make_image(self, image, size_mb):
        sh("truncate", "-s", f"{size_mb}M", image)
        make = {"ext4": ["mkfs.ext4", "-q", "-F"], "xfs": ["mkfs.xfs", "-q", "-f"],
                "btrfs": ["mkfs.btrfs", "-q", "-f"], "exfat": ["mkfs.exfat"]}[self.fs]
        sh(*make, image)
        return sh("losetup", "-f", "--show", image).strip()

    def mount(self):
        os.makedirs(self.mountpoint, exist_ok=True)
        if self.fs == "exfat":
            sh("mount.exfat-fuse", self.loop, self.mountpoint)
        else:
            sh("mount", self.loop, self.mountpoint)
        self.mounted = True

        if os.path.isdir(self.path("lost+found")):
            os.rmdir(self.path("lost+found"))

    def unmount(self):
        sh("umount", self.mountpoint)
        self.mounted = False

    def plug(self):
        """Mounts the device and tells the daemon, as the box's mount service does."""
        self.mount()
        return self.hook("post_mount")

    def unplug(self):
        self.hook("pre_unmount")
        self.unmount()

    def hook(self, name):
        return wire.request({"notify": name, "type": "volume_hook",
                             "mountpoint": self.mountpoint, "device": self.loop})

    def path(self, relative=""):
        return os.path.join(self.mountpoint, relative)

    def release(self):
        if self.mounted:
            subprocess.run(["umount", "-l", self.mountpoint], check=False)
        subprocess.run(["losetup", "-d", self.loop], check=False)


class Box:
    def __init__(self, binaries, volume="tmpfs", volume_mb=2048, log=True):
        self.binaries = binaries
        self.devices, self.shares = [], {}
        self.extra_conf = ""
        self.daemon_pid = None
        self.volume_loop = None
        self.log = LogDaemon() if log else None
        os.makedirs("/volume1", exist_ok=True)
        if volume == "tmpfs":
            sh("mount", "-t", "tmpfs", "-o", "mode=755", "tmpfs", "/volume1")
        else:
            self._mount_volume(volume, volume_mb)
        os.makedirs("/volume1/@Ferrix/db")
        os.makedirs("/volume1/@Ferrix/task")
        os.makedirs(f"{PACKAGE}/etc")
        os.makedirs(f"{PACKAGE}/target/etc")
        for folder in ("sbin", "bin"):
            source = f"{binaries}/{folder}"
            if os.path.isdir(source):
                shutil.copytree(source, f"{PACKAGE}/target/{folder}")
        shutil.copy(f"{binaries}/etc/ferrix_system.filter", f"{PACKAGE}/target/etc/")
        self._write(f"{PACKAGE}/etc/setting.conf", 'repo_vol_path="/volume1"\nbeep="yes"\n')
        os.makedirs("/etc/keld/notify.d")
        os.makedirs("/etc/keld/index.d")
        self.notifications = "/tmp/notifications"
        self._program("/etc/keld/notify.d/10-record",
                      f'echo "$KELD_NOTIFY_TAG|$KELD_NOTIFY_TASKNAME|$KELD_NOTIFY_ERR"'
                      f' >> {self.notifications}\n')
        self._program("/etc/keld/index.d/10-record", 'echo "$1" >> /tmp/indexed\n')
        self.write_host_conf()

    def _mount_volume(self, fs, size_mb):
        sh("truncate", "-s", f"{size_mb}M", "/tmp/volume1.img")
        sh(*{"ext4": ["mkfs.ext4", "-q", "-F"], "xfs": ["mkfs.xfs", "-q", "-f"],
             "btrfs": ["mkfs.btrfs", "-q", "-f"]}[fs], "/tmp/volume1.img")
        self.volume_loop = sh("losetup", "-f", "--show", "/tmp/volume1.img").strip()
        sh("mount", self.volume_loop, "/volume1")

    @staticmethod
    def _write(path, text):
        os.makedirs(os.path.dirname(path), exist_ok=True)
        with open(path, "w", encoding="utf-8") as out:
            out.write(text)

    def _program(self, path, body):
        self._write(path, "#!/bin/sh\n" + body)
        os.chmod(path, 0o755)

    def write_host_conf(self):
        text = "[volume /volume1]\ninternal = yes\n"
        for name, options in self.shares.items():
            text += f"[share {name}]\npath = /volume1/{name}\n"
            text += "".join(f"{key} = {value}\n" for key, value in options.items())
        text += "[removable]\ndevices = " + ", ".join(d.loop for d in self.devices) + "\n"
        self._write("/etc/keld/host.conf", text + self.extra_conf)

    def add_share(self, name, **options):
        """Makes a folder /volume1/NAME and declares it; options are keys of its section."""
        os.makedirs(f"/volume1/{name}", exist_ok=True)
        self.shares[name] = options
        self.write_host_conf()
        return f"/volume1/{name}"

    def add_device(self, name, fs="ext4", size_mb=64):
        return Device(self, name, fs, size_mb)

    # --- the daemon

    def start(self, wrapper=(), wait=True):
        program = f"{PACKAGE}/target/sbin/ferrixd"
        environment = dict(os.environ,
                           ASAN_OPTIONS="log_path=/tmp/sanitizer:exitcode=99",
                           UBSAN_OPTIONS="log_path=/tmp/sanitizer:print_stacktrace=1",
                           TSAN_OPTIONS="log_path=/tmp/sanitizer:exitcode=99")
        subprocess.run([*wrapper, program], check=True, env=environment)
        if wait:
            wait_until(self._answers, 60, 0.02, "the daemon's first answer")
            with open("/run/ferrixd.pid", encoding="ascii") as pid_file:
                self.daemon_pid = int(pid_file.read())

    @staticmethod
    def _answers():
        with contextlib.suppress(FileNotFoundError, ConnectionRefusedError):
            return wire.request({"action": "ping"}) is not None
        return False

    def is_running(self):
        if self.daemon_pid is None:
            return False
        try:
            gone, _ = os.waitpid(self.daemon_pid, os.WNOHANG)
        except ChildProcessError:
            gone = self.daemon_pid
        if gone:
            self.daemon_pid = None
        return not gone

    def stop(self, timeout=60):
        if self.is_running():
            os.kill(self.daemon_pid, signal.SIGTERM)
            wait_until(lambda: not self.is_running(), timeout, what="the daemon's end")

    def kill(self):
        if self.is_running():
            os.kill(self.daemon_pid, signal.SIGKILL)
            wait_until(lambda: not self.is_running(), 20, what="the daemon's death")

    def ask(self, action, **keys):
        return wire.request({"action": action, **keys})

    # --- tasks

    def add_mirror(self, device, share="photos", folder="/", usb_folder="/", name="Mirror",
                   run_when_plug_in=True, eject=False, export=False, **more):
        message = {
            "usb_share_path": device.mountpoint, "uuid": device.uuid,
            "run_when_plug_in": run_when_plug_in, "eject_when_task_done": eject,
            "producer": "Maker", "product": "Stick", "task_name": name,
            "task_type": 2 if export else 1, "usb_folder_path": usb_folder,
            "hub_folder_path": folder, "hub_share_name": share, "copy_strategy": 2,
            "keep_dir_structure": True, "smart_create_date_dir": False,
            "rename_photo_video": False, "remove_src_file": False, "conflict_policy": 2,
            "enable_rotation": False, "max_version_count": 256, "rotation_policy": 1,
            "schedule_enabled": False, "schedule_json_str": "{}",
            **{key: [] for key in FILTER_KEYS}, "white_name": ["*"], **more}
        answer = self.ask("add_task", **message)
        assert "error" not in answer, answer
        return answer["task_id"]

    def task(self, task_id):
        for entry in self.ask("list_task")["task_list"]:
            if entry["id"] == task_id:
                return entry
        return None

    def status(self, task_id):
        entry = self.task(task_id)
        return entry and entry["task_status"]

    def wait_status(self, task_id, *wanted, timeout=120):
        return wait_until(lambda: (s := self.status(task_id)) in wanted and s, timeout, 0.2,
                          f"status {wanted} of task {task_id}, now {self.status(task_id)}")

    def wait_run(self, task_id, runs, timeout=300):
        """Waits until the log holds `runs` ended runs of the task; returns its status."""
        wait_until(lambda: len(self.log_rows("description_id IN (101, 102, 103)")) >= runs,
                   timeout, 0.2, f"{runs} ended runs")
        return wait_until(lambda: (s := self.status(task_id)) not in ("copying", "waiting") and s,
                          timeout, 0.1, "the end of the run")

    def log_rows(self, where="1"):
        """Rows of the log as (description_id, parameters, error)."""
        with contextlib.closing(sqlite3.connect("/volume1/@Ferrix/db/log-db.sqlite")) as db:
            return db.execute("SELECT description_id, description_param, error FROM log_info_table"
                              f" WHERE {where} ORDER BY id").fetchall()

    def notified(self):
        if not os.path.exists(self.notifications):
            return []
        with open(self.notifications, encoding="utf-8", errors="surrogateescape") as lines:
            return lines.read().splitlines()

    # --- the end

    def sanitizer_reports(self):
        reports = ""
        for name in sorted(os.listdir("/tmp")):
            if name.startswith("sanitizer."):
                with open(f"/tmp/{name}", encoding="utf-8", errors="replace") as report:
                    reports += report.read()
        return reports

    def close(self):
        try:
            self.stop()
        finally:
            self.kill()
            for device in self.devices:
                device.release()
            subprocess.run(["umount", "-l", "/volume1"], check=False)
            if self.volume_loop:
                subprocess.run(["losetup", "-d", self.volume_loop], check=False)
