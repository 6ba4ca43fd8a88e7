#!/usr/bin/env python3
"""The main job of ferrixd, for a newcomer to see. Called by ./quickstart; needs root.

usage: quickstart.py --install DIR [FOLDER]
"""
import argparse
import collections
import json
import os
import pathlib
import subprocess
import sys
import tempfile

HERE = pathlib.Path(__file__).resolve().parent
sys.path.insert(0, str(HERE))

from ferrix import tree, world  # noqa: E402
from ferrix.box import Box, Device, wait_until  # noqa: E402

SENTENCES = {0: "task added", 1: "task removed", 100: "run started", 101: "run done",
             102: "run stopped", 103: "run failed", 104: "old version removed", 1000: "file failed"}
# Name of the task and of its share, what a client asks for, and what that means.
TASKS = (
    ("mirror", {"copy_strategy": 2}, "the folder is to equal the device"),
    ("versions", {"copy_strategy": 1, "enable_rotation": True, "max_version_count": 8},
     "a full copy for each run, in a folder with its date; at most 8 of them"),
    ("camera", {"copy_strategy": 3, "conflict_policy": 1, "keep_dir_structure": False,
                "smart_create_date_dir": True, "rename_photo_video": True},
     "what is new, pictures in a folder for each day, named by their time; nothing ever goes"),
)


def say(text=""):
    print(text, flush=True)


def sample_files(folder):
    rng = tree.rng(1)
    for card in ("100BOX", "101BOX"):
        os.makedirs(f"{folder}/DCIM/{card}")
        for number in range(1, 7):
            tree.write(f"{folder}/DCIM/{card}/IMG_{number:04}.JPG", rng)
    tree.write(f"{folder}/readme.txt", rng, 300)


def megabytes(folder):
    return int(subprocess.run(["du", "-sm", folder], check=True, stdout=subprocess.PIPE,
                              text=True).stdout.split()[0])


def make_stick(folder, image):
    """An ext4 image with the files of `folder`, on a loop device."""
    subprocess.run(["truncate", "-s", f"{megabytes(folder) * 5 // 4 + 64}M", image], check=True)
    subprocess.run(["mkfs.ext4", "-q", "-F", "-d", folder, image], check=True)
    return subprocess.run(["losetup", "-f", "--show", image], check=True, stdout=subprocess.PIPE,
                          text=True).stdout.strip()


def files_of(top):
    return {path: entry for path, entry in tree.listing(top).items() if entry[0] == "file"}


def show_tree(top, limit=8):
    paths = sorted(files_of(top))
    for path in paths[:limit]:
        say(f"      {path}")
    if len(paths) > limit:
        say(f"      ... and {len(paths) - limit} more")


class Show:
    """Three equal devices, a task of another strategy for each, two runs."""

    def __init__(self, box, loops):
        self.box = box
        self.sticks = [Device(box, name, loop=loop) for (name, _, _), loop in zip(TASKS, loops)]
        self.tasks = []

    def add_tasks(self):
        for stick, (name, keys, meaning) in zip(self.sticks, TASKS):
            self.box.add_share(name)
            stick.mount()
            self.tasks.append(self.box.add_mirror(stick, share=name, name=f"My {name}", **keys))
            stick.unplug()
            say(f"   {name:9} {meaning}")

    def plug_in(self):
        """Plugs all devices in; the tasks run by themselves. True when all have done well."""
        mark = len(self.box.log_rows("description_id IN (101, 102, 103)"))
        for stick in self.sticks:
            stick.plug()
        wait_until(lambda: len(self.box.log_rows("description_id IN (101, 102, 103)"))
                   >= mark + len(self.tasks), 3600, 0.2)
        found = [self.box.task(task)["task_status"] for task in self.tasks]
        for (name, _, _), status in zip(TASKS, found):
            say(f"   {name:9} {status}")
        return found == ["successful"] * len(TASKS)

    @staticmethod
    def show_shares():
        for name, _, _ in TASKS:
            say(f"   /volume1/{name}: {len(files_of(f'/volume1/{name}'))} files")
            if name != "versions":
                show_tree(f"/volume1/{name}")
                continue
            for version in sorted(os.listdir(f"/volume1/{name}")):
                say(f"      /{version}: {len(files_of(f'/volume1/{name}/{version}'))} files")

    def change(self):
        """Removes the first file of each device and adds a picture."""
        first = sorted(files_of(self.sticks[0].mountpoint))[0]
        for stick in self.sticks:
            os.unlink(stick.mountpoint + first)
            tree.write(stick.path("ONE_MORE.JPG"), tree.rng(2))
            os.utime(stick.path("ONE_MORE.JPG"), (1700000000, 1700000000))
            stick.unplug()
        return first

    def check(self, before):
        """Compares bytes and dates with the devices; returns what differs."""
        now = tree.listing(self.sticks[0].mountpoint)
        found = tree.differences(now, tree.listing("/volume1/mirror"))
        versions = sorted(os.listdir("/volume1/versions"))
        found += [] if len(versions) == 2 else [f"{len(versions)} versions"]
        for version, wanted in zip(versions, (before, now)):
            found += tree.differences(wanted, tree.listing(f"/volume1/versions/{version}"))
        wanted = collections.Counter(entry[1:] for path, entry in (before | now).items()
                                     if entry[0] == "file")
        kept = collections.Counter(entry[1:] for entry in files_of("/volume1/camera").values())
        return found + [f"camera: {entry}" for entry in (wanted - kept) + (kept - wanted)]

    def show_rows(self):
        for number, parameters, error in self.box.log_rows():
            detail = ", ".join(json.loads(parameters)) + (f", error {error}" if error else "")
            say(f"    {SENTENCES.get(number, number)}: {detail}")

    def show_task(self):
        entry = self.box.task(self.tasks[0])
        for key in ("task_name", "task_status", "source_path", "destination_path", "error_code"):
            say(f"    {key:17} {entry[key]}")


def demonstrate(install, loops, size_mb):
    box = Box(install, volume="ext4", volume_mb=size_mb * 6 + 512)
    try:
        say("1. The daemon starts. It listens on /tmp/ferrix-socket.")
        box.start()
        show = Show(box, loops)
        say("2. A client adds a task for each of three devices, which hold the same files:")
        show.add_tasks()
        say("3. The devices are plugged in. The tasks run by themselves:")
        good = show.plug_in()
        say(f"4. What was copied to the shared folders ({show.sticks[0].mountpoint} and others):")
        show.show_shares()
        before = tree.listing(show.sticks[0].mountpoint)
        say(f"5. On each device {show.change()} is removed and ONE_MORE.JPG is new. Again:")
        good = show.plug_in() and good
        show.show_shares()
        found = show.check(before)
        say("6. Every copy compared with the devices, bytes and dates: "
            + ("equal." if not found else "NOT equal:\n" + "\n".join(found)))
        say("7. What a client reads about the first task:")
        show.show_task()
        say("8. What the log of the box holds for the user:")
        show.show_rows()
        say("9. The notifications that were sent (tag | task | error):")
        for line in wait_until(box.notified):
            say(f"    {line}")
        box.stop()
        return 0 if good and not found else 1
    finally:
        box.close()


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("--install", required=True)
    parser.add_argument("folder", nargs="?")
    args = parser.parse_args()
    with tempfile.TemporaryDirectory(prefix="ferrix-quickstart-") as scratch:
        source = args.folder or f"{scratch}/sample"
        if not args.folder:
            sample_files(source)
        loops = [make_stick(source, f"{scratch}/{name}.img") for name, _, _ in TASKS]
        size_mb = megabytes(source)
        os.mkdir(f"{scratch}/world")
        child = os.fork()
        if child == 0:
            code = 1
            try:
                world.enter(str(HERE.parents[1]), f"{scratch}/world", extra=(args.install,))
                code = demonstrate(args.install, loops, size_mb)
            finally:
                sys.stdout.flush()
                os._exit(code)
        code = os.waitstatus_to_exitcode(os.waitpid(child, 0)[1])
        for loop in loops:
            subprocess.run(["losetup", "-d", loop], check=False, stderr=subprocess.DEVNULL)
    if code == 0:
        say()
        say("That was all of it, in a private mount namespace: nothing stays but ./build.")
        say("How to go on: ./quickstart FOLDER does the same with your own files; ./run-tests")
        say("proves it; README.md tells the messages; ARCHITECTURE.md is the map of the code.")
    return code


if __name__ == "__main__":
    sys.exit(main())
