"""Things that go wrong during a run: files, destinations, devices, power. Nothing may be lost."""
import os
import sqlite3
import subprocess
import threading
import time

from ferrix import tree, wire
from ferrix.box import sh, wait_until


def start(box, share_options=None, device_mb=64, **add):
    share = box.add_share("photos", **(share_options or {}))
    stick = box.add_device("stick", "ext4", device_mb)
    stick.mount()
    box.start()
    return share, stick, box.add_mirror(stick, **add)


def run(box, stick, task, number=1, timeout=300):
    stick.hook("post_mount")
    return box.wait_run(task, number, timeout)


def test_a_full_destination(box):
    """A destination that fills up: the run fails with its own code, no half file stays."""
    share = box.add_share("photos")
    sh("mount", "-t", "tmpfs", "-o", "size=4m", "tmpfs", share)
    stick = box.add_device("stick")
    stick.mount()
    rng = tree.rng(1)
    for number in range(8):
        tree.write(stick.path(f"img{number}"), rng, 1 << 20)
    box.start()
    task = box.add_mirror(stick)
    assert run(box, stick, task) == "failed"
    assert box.task(task)["error_code"] & 0xFFFFFFFF == (-19) & 0xFFFFFFFF
    assert wait_until(box.notified) == ["FERRIXNospace|Mirror|"]
    for name in os.listdir(share):
        with open(f"{share}/{name}", "rb") as copy, open(stick.path(name), "rb") as source:
            assert copy.read() == source.read(), name
    failures = box.log_rows("description_id = 1000")
    assert failures and all(row[2] == -19 for row in failures)
    sh("umount", share)
    assert run(box, stick, task, 2) == "successful"
    assert len(os.listdir(share)) == 8


def test_a_read_only_destination(box):
    """A destination that cannot be written fails the run and changes nothing."""
    share, stick, task = start(box)
    tree.write(stick.path("a"), tree.rng(1))
    tree.write(share + "/kept", tree.rng(2))
    sh("mount", "--bind", share, share)
    sh("mount", "-o", "remount,bind,ro", share)
    assert run(box, stick, task) == "failed"
    assert os.listdir(share) == ["kept"]
    sh("umount", share)


def test_type_conflicts_at_the_destination(box):
    """A file where a folder should be, a folder where a file should be, links in the way."""
    share, stick, task = start(box, {"recycle_bin": "yes"})
    rng = tree.rng(1)
    os.mkdir(stick.path("folder"))
    tree.write(stick.path("folder/inside"), rng)
    tree.write(stick.path("file"), rng)
    os.mkdir(stick.path("through"))
    tree.write(stick.path("through/inside"), rng)
    tree.write(stick.path("linked"), rng)
    os.makedirs("/volume1/outside")
    with open("/volume1/outside/victim", "w", encoding="ascii") as victim:
        victim.write("untouched")
    tree.write(share + "/folder", rng)
    os.makedirs(share + "/file/deep")
    tree.write(share + "/file/deep/old", rng)
    os.symlink("/volume1/outside", share + "/through")
    os.symlink("/volume1/outside/victim", share + "/linked")
    run(box, stick, task)
    assert os.listdir("/volume1/outside") == ["victim"]
    with open("/volume1/outside/victim", encoding="ascii") as victim:
        assert victim.read() == "untouched"
    for name in ("folder/inside", "file"):
        with open(f"{share}/{name}", "rb") as copy, open(stick.path(name), "rb") as source:
            assert copy.read() == source.read(), name
    assert os.path.isfile(share + "/#recycle/file/deep/old")
    assert os.path.isfile(share + "/#recycle/folder")


def test_files_that_cannot_be_read_or_vanish(box):
    """A source file that fails costs one log row; the others are copied."""
    share, stick, task = start(box)
    rng = tree.rng(1)
    for number in range(300):
        tree.write(stick.path(f"img{number:03}"), rng)
    os.mkdir(stick.path("zz"))
    stop = threading.Event()

    def churn():
        while not stop.is_set():
            for number in range(290, 300):
                path = stick.path(f"img{number}")
                try:
                    os.rename(path, stick.path("away"))
                    time.sleep(0.002)
                    os.rename(stick.path("away"), path)
                except OSError:
                    pass

    churner = threading.Thread(target=churn)
    churner.start()
    run(box, stick, task)
    stop.set()
    churner.join()
    missing = [n for n in range(290) if not os.path.exists(f"{share}/img{n:03}")]
    assert not missing, missing
    status = run(box, stick, task, len(box.log_rows("description_id IN (101,102,103)")) + 1)
    assert status == "successful"
    assert not tree.differences(tree.listing(stick.mountpoint), tree.listing(share))


def test_odd_files(box):
    """Sparse files, long names, set-uid bits, dates far away: copied, nothing widened."""
    share, stick, task = start(box, device_mb=200)
    rng = tree.rng(1)
    with open(stick.path("sparse"), "wb") as sparse:
        sparse.seek(100 << 20)
        sparse.write(b"end")
        sparse.truncate(120 << 20)
    tree.write(stick.path("n" * 255), rng)
    tree.write(stick.path("setuid"), rng)
    os.chmod(stick.path("setuid"), 0o6755)
    tree.write(stick.path("empty"), rng, 0)
    for name, when in (("before-1970", -1000), ("after-2038", 2_200_000_000)):
        tree.write(stick.path(name), rng)
        os.utime(stick.path(name), (when, when))
    assert run(box, stick, task) == "successful"
    assert os.stat(share + "/sparse").st_size == 120 << 20
    assert os.stat(share + "/sparse").st_blocks * 512 < 1 << 20
    assert os.stat(share + "/setuid").st_mode & 0o7777 == 0o755
    assert os.path.getsize(share + "/" + "n" * 255) == os.path.getsize(stick.path("n" * 255))
    inode = os.stat(share + "/before-1970").st_ino
    assert run(box, stick, task, 2) == "successful"
    assert os.stat(share + "/before-1970").st_ino == inode


def test_a_tree_two_thousand_folders_deep(box):
    """A chain of 2,000 folders is mirrored, then removed again through the file layer."""
    share, stick, task = start(box)
    top = os.open(stick.mountpoint, os.O_RDONLY)
    here = top
    for _ in range(1999):
        os.mkdir("d", dir_fd=here)
        here = os.open("d", os.O_RDONLY, dir_fd=here)
        if here > 900:
            os.closerange(top + 1, here)
    file_fd = os.open("bottom", os.O_WRONLY | os.O_CREAT, dir_fd=here)
    os.write(file_fd, b"the end")
    os.close(file_fd)
    os.close(here)
    assert run(box, stick, task, timeout=600) == "successful"
    with open(share + "/d" * 1999 + "/bottom", "rb") as bottom:
        assert bottom.read() == b"the end"
    sh("rm", "-rf", stick.path("d"))
    assert run(box, stick, task, 2, timeout=600) == "successful"
    assert os.listdir(share) == []


test_a_tree_two_thousand_folders_deep.long = True


def test_a_kill_in_the_middle_of_a_run(box):
    """After kill -9 no half file stands under a final name; the next run completes the copy."""
    share, stick, task = start(box, device_mb=400)
    rng = tree.rng(1)
    for number in range(200):
        tree.write(stick.path(f"img{number:03}"), rng, 1 << 20)
    for attempt in range(3):
        stick.hook("post_mount")
        wait_until(lambda: len(os.listdir(share)) > 20 * (attempt + 1), 60, 0.01)
        box.kill()
        for name in os.listdir(share):
            if not name.startswith(".ferrix-tmp-"):
                assert os.path.getsize(f"{share}/{name}") == 1 << 20, name
        box.start()
    runs = len(box.log_rows("description_id IN (101,102,103)"))
    assert run(box, stick, task, runs + 1) == "successful"
    assert not tree.differences(tree.listing(stick.mountpoint), tree.listing(share))
    assert not [name for name in os.listdir(share) if name.startswith(".ferrix-tmp-")]


test_a_kill_in_the_middle_of_a_run.box = {"volume": "ext4"}


def test_a_device_that_leaves_during_a_run(box):
    """pre_unmount in the middle of a run ends it quickly and loses nothing; then it goes on."""
    share, stick, task = start(box, device_mb=300)
    rng = tree.rng(1)
    for number in range(150):
        tree.write(stick.path(f"img{number:03}"), rng, 1 << 20)
    for number in range(20):
        tree.write(f"{share}/old{number}", rng)
    stick.hook("post_mount")
    box.wait_status(task, "copying")
    wait_until(lambda: len(os.listdir(share)) > 30, 60, 0.01)
    stick.unplug()
    assert box.status(task) in ("unmounted", "failed")
    stick.plug()
    wait_until(lambda: box.status(task) == "successful" and box.task(task)["latest_finish_time"],
               120)
    assert not tree.differences(tree.listing(stick.mountpoint), tree.listing(share))


def test_a_device_unmounted_without_a_word(box):
    """A mount point that is suddenly empty, without a hook, removes nothing of the copy."""
    share, stick, task = start(box)
    rng = tree.rng(1)
    for number in range(50):
        tree.write(stick.path(f"img{number:03}"), rng)
    assert run(box, stick, task) == "successful"
    copied = sorted(os.listdir(share))
    stick.unmount()
    stick.hook("post_mount")
    time.sleep(8)
    assert sorted(os.listdir(share)) == copied
    assert box.log.lacks("RemoveFile: remove path")
    assert box.task(task)["is_usb_mounted"] == 0


def test_stop_in_the_middle_of_a_run(box):
    """SIGTERM during a run ends the daemon soon; the next start and run complete the copy."""
    share, stick, task = start(box, device_mb=300)
    rng = tree.rng(1)
    for number in range(150):
        tree.write(stick.path(f"img{number:03}"), rng, 1 << 20)
    stick.hook("post_mount")
    box.wait_status(task, "copying")
    wait_until(lambda: len(os.listdir(share)) > 10, 60, 0.01)
    box.stop(30)
    box.start()
    runs = len(box.log_rows("description_id IN (101,102,103)"))
    assert run(box, stick, task, runs + 1) == "successful"
    assert not tree.differences(tree.listing(stick.mountpoint), tree.listing(share))


def test_a_folder_swapped_for_a_link_during_a_run(box):
    """A destination folder that is swapped for a link again and again leads nothing outside."""
    share, stick, task = start(box)
    os.makedirs("/volume1/outside")
    rng = tree.rng(1)
    os.mkdir(stick.path("target"))
    for number in range(400):
        tree.write(stick.path(f"target/img{number:03}"), rng, 3000)
    os.mkdir(share + "/target")
    stop = threading.Event()

    def swap():
        while not stop.is_set():
            try:
                os.rename(share + "/target", share + "/real")
                os.symlink("/volume1/outside", share + "/target")
                time.sleep(0.001)
                os.unlink(share + "/target")
                os.rename(share + "/real", share + "/target")
                time.sleep(0.001)
            except OSError:
                subprocess.run(["rm", "-rf", share + "/real"], check=False)

    swapper = threading.Thread(target=swap)
    swapper.start()
    stick.hook("post_mount")
    time.sleep(15)
    stop.set()
    swapper.join()
    assert os.listdir("/volume1/outside") == []
    box.ask("remove_task", task_id=task)
    assert os.listdir("/volume1/outside") == []


def test_a_locked_database_is_waited_for(box):
    """Another process that holds the databases locked for a while delays, and loses nothing."""
    share, stick, task = start(box)
    tree.write(stick.path("a"), tree.rng(1))
    locks = []
    for name in ("task-db", "log-db"):
        lock = sqlite3.connect(f"/volume1/@Ferrix/db/{name}.sqlite", check_same_thread=False)
        lock.execute("BEGIN EXCLUSIVE")
        locks.append(lock)
    threading.Timer(8, lambda: [lock.rollback() for lock in locks]).start()
    assert run(box, stick, task) == "successful"
    assert os.path.exists(share + "/a")
    assert [row[0] for row in box.log_rows()] == [0, 100, 101]


def test_a_broken_host_configuration_keeps_the_last_good_state(box):
    """A broken host.conf is told with its line, and shares stay as they were."""
    share, stick, task = start(box)
    tree.write(stick.path("a"), tree.rng(1))
    with open("/etc/keld/host.conf", "a", encoding="ascii") as conf:
        conf.write("this is no setting\n")
    assert run(box, stick, task) == "successful"
    assert os.path.exists(share + "/a")
    assert box.log.expect("host.conf")
    assert wire.request({"action": "list_task"})["task_list"][0]["is_hub_mounted"] == 1
