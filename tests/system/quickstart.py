#!/usr/bin/env python3
"""The main job of ferrixd, for a newcomer to see. Called by ./quickstart; needs root.

usage: quickstart.py --install DIR [--repository DIR] [FOLDER]
"""
import argparse
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
             102: "run stopped", 103: "run failed", 1000: "file failed"}


def say(text=""):
    print(text, flush=True)


def sample_files(folder):
    rng = tree.rng(1)
    for card in ("100BOX", "101BOX"):
        os.makedirs(f"{folder}/DCIM/{card}")
        for number in range(1, 7):
            tree.write(f"{folder}/DCIM/{card}/IMG_{number:04}.JPG", rng)
    tree.write(f"{folder}/readme.txt", rng, 300)


def make_stick(folder, scratch):
    """An ext4 image with the files of `folder`, on a loop device."""
    used = int(subprocess.run(["du", "-sm", folder], check=True, stdout=subprocess.PIPE,
                              text=True).stdout.split()[0])
    image = f"{scratch}/stick.img"
    subprocess.run(["truncate", "-s", f"{used * 5 // 4 + 64}M", image], check=True)
    subprocess.run(["mkfs.ext4", "-q", "-F", "-d", folder, image], check=True)
    return subprocess.run(["losetup", "-f", "--show", image], check=True, stdout=subprocess.PIPE,
                          text=True).stdout.strip()


def show_tree(top, limit=12):
    entries = sorted(path for path, entry in tree.listing(top).items() if entry[0] == "file")
    for path in entries[:limit]:
        say(f"    {path}")
    if len(entries) > limit:
        say(f"    ... and {len(entries) - limit} more")
    return len(entries)


def show_task(box, task):
    entry = box.task(task)
    for key in ("task_name", "task_status", "source_path", "destination_path", "error_code"):
        say(f"    {key:17} {entry[key]}")


def demonstrate(install, loop):
    box = Box(install)
    try:
        box.add_share("photos", recycle_bin="yes")
        say("1. The daemon starts. It listens on /tmp/ferrix-socket.")
        box.start()
        stick = Device(box, "stick", loop=loop)
        stick.mount()
        say(f"2. A client adds a mirror task for the device with the uuid {stick.uuid}:")
        say("   everything on it is to stand in the shared folder \"photos\", at each plug-in.")
        task = box.add_mirror(stick, name="My camera")
        stick.unplug()
        show_task(box, task)
        say("3. The device is plugged in. The task runs by itself.")
        stick.plug()
        seen = []

        def ended():
            entry = box.task(task)
            if entry["task_status"] not in seen:
                seen.append(entry["task_status"])
                say(f"    status: {seen[-1]}")
            return entry["task_status"] in ("successful", "failed")

        wait_until(ended, 3600)
        status = seen[-1]
        say(f"4. What was copied from {stick.mountpoint} to /volume1/photos:")
        count = show_tree("/volume1/photos")
        found = tree.differences(tree.listing(stick.mountpoint), tree.listing("/volume1/photos"))
        say(f"   {count} files; source and copy compared, bytes and dates: "
            + ("equal." if not found else "NOT equal:\n" + "\n".join(found)))
        say("5. What the task says now:")
        show_task(box, task)
        say("6. What the log of the box holds for the user:")
        for number, parameters, error in box.log_rows():
            detail = ", ".join(json.loads(parameters)) + (f", error {error}" if error else "")
            say(f"    {SENTENCES.get(number, number)}: {detail}")
        say("7. The notification that was sent (tag | task | error):")
        for line in wait_until(box.notified):
            say(f"    {line}")
        box.stop()
        return 0 if status == "successful" and not found else 1
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
        loop = make_stick(source, scratch)
        os.mkdir(f"{scratch}/world")
        child = os.fork()
        if child == 0:
            code = 1
            try:
                world.enter(str(HERE.parents[1]), f"{scratch}/world", extra=(args.install,))
                code = demonstrate(args.install, loop)
            finally:
                sys.stdout.flush()
                os._exit(code)
        code = os.waitstatus_to_exitcode(os.waitpid(child, 0)[1])
        subprocess.run(["losetup", "-d", loop], check=False, stderr=subprocess.DEVNULL)
    if code == 0:
        say()
        say("That was all of it, in a private mount namespace: nothing stays but ./build.")
        say("How to go on: ./quickstart FOLDER does the same with your own files; ./run-tests")
        say("proves it; README.md tells the messages; ARCHITECTURE.md is the map of the code.")
    return code


if __name__ == "__main__":
    sys.exit(main())
