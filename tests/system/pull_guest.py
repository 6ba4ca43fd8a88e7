#!/usr/bin/env python3
"""Runs inside the emulated machine of scenarios/pull.py: the daemon, a stick, and its pull.

usage: pull_guest.py --install DIR --fs vfat|exfat|ext4 --stick /dev/sda
"""
import argparse
import glob
import os
import pathlib
import subprocess
import sys
import time
import traceback

HERE = pathlib.Path(__file__).resolve().parent
sys.path.insert(0, str(HERE))

from ferrix import tree, world  # noqa: E402
from ferrix.box import Box, Device, wait_until  # noqa: E402


def make_node(name):
    with open(f"/sys/block/{name}/dev", encoding="ascii") as numbers:
        major, minor = map(int, numbers.read().split(":"))
    path = f"/dev/{name}"
    if not os.path.exists(path):
        os.mknod(path, 0o60600, os.makedev(major, minor))
    return path


def sticks():
    return sorted(os.path.basename(path) for path in glob.glob("/sys/block/sd*"))


def ended_runs(box):
    return len(box.log_rows("description_id IN (101, 102, 103)"))


def nothing_is_gone(before, share):
    now = tree.listing(share)
    lost = [path for path, entry in before.items() if now.get(path) != entry]
    assert not lost, f"{len(lost)} of {len(before)} entries of the copy are gone: {lost[:5]}"


def scenario(box, fs, stick_name):
    share = box.add_share("photos", recycle_bin="yes")
    stick = Device(box, "stick", loop=make_node(stick_name))
    stick.mount()
    rng = tree.rng(1)
    for folder in range(5):
        os.mkdir(stick.path(f"roll{folder}"))
        for number in range(10):
            tree.write(stick.path(f"roll{folder}/img{number}.jpg"), rng, 5000)
    subprocess.run(["sync"], check=True)
    box.start()
    task = box.add_mirror(stick)
    stick.hook("post_mount")
    assert box.wait_run(task, 1) == "successful"
    before = tree.listing(share)
    assert sum(entry[0] == "file" for entry in before.values()) == 50, before

    print("pulled while nothing runs, then a run is asked for")
    print("YANK", flush=True)
    wait_until(lambda: stick_name not in sticks(), 60, what="the pull")
    runs = ended_runs(box)
    stick.hook("post_mount")
    time.sleep(12)
    if box.status(task) in ("copying", "waiting"):
        wait_until(lambda: ended_runs(box) > runs, 120)
    nothing_is_gone(before, share)
    assert box.log.lacks("RemoveFile: remove path"), "a removal was tried"

    print("put back, then pulled in the middle of a run")
    stick.hook("pre_unmount")
    subprocess.run(["umount", "-l", stick.mountpoint], check=True)
    print("PLUG", flush=True)
    name = wait_until(sticks, 60, what="the stick")[0]
    stick.loop = make_node(name)
    box.write_host_conf()
    time.sleep(1)
    stick.mount()
    for number in range(150):
        tree.write(stick.path(f"roll0/new{number:03}.jpg"), rng, 20000)
    subprocess.run(["sync"], check=True)
    subprocess.run(["sh", "-c", "echo 3 > /proc/sys/vm/drop_caches"], check=False)
    runs = ended_runs(box)
    stick.hook("post_mount")
    wait_until(lambda: os.path.exists(f"{share}/roll0/new140.jpg"), 120, 0.02)
    print("YANK", flush=True)
    wait_until(lambda: not sticks(), 60, what="the pull")
    wait_until(lambda: ended_runs(box) > runs, 240, what="the end of the broken run")
    nothing_is_gone(before, share)

    print("put back once more: the run completes the copy")
    stick.hook("pre_unmount")
    subprocess.run(["umount", "-l", stick.mountpoint], check=True)
    print("PLUG", flush=True)
    name = wait_until(sticks, 60, what="the stick")[0]
    stick.loop = make_node(name)
    box.write_host_conf()
    time.sleep(1)
    stick.mount()
    stick.hook("post_mount")
    wait_until(lambda: box.status(task) == "successful" and
               os.path.exists(f"{share}/roll0/new000.jpg"), 240, 0.5, "a good run")
    found = tree.differences(tree.listing(stick.mountpoint), tree.listing(share))
    assert not found, "\n".join(found)


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("--install", required=True)
    parser.add_argument("--fs", required=True)
    parser.add_argument("--stick", required=True)
    args = parser.parse_args()
    os.mkdir("/mnt/world")
    world.enter(str(HERE.parents[1]), "/mnt/world", extra=(args.install,))
    box = Box(args.install)
    try:
        scenario(box, args.fs, os.path.basename(args.stick))
        return 0
    except BaseException:
        traceback.print_exc(file=sys.stdout)
        print("--- last log lines of the daemon")
        print("\n".join(box.log.since()[-80:]))
        return 1
    finally:
        sys.stdout.flush()
        box.kill()


if __name__ == "__main__":
    sys.exit(main())
