"""Version tasks: a dated copy on each run, rotation, and what a run that did not end leaves."""
import datetime
import os
import random
import re
import time

from ferrix import tree
from ferrix.box import sh, wait_until

NAME = re.compile(r"Ferrix Copy_(\d{4}-\d\d-\d\d_\d{6})(\.Bad)?")


def start(box, files=60, device_mb=64, big=0, **options):
    share = box.add_share("photos")
    stick = box.add_device("stick", "ext4", device_mb)
    stick.mount()
    tree.fill(stick.mountpoint, tree.rng(7), files=files, folders=8, big=big)
    box.start()
    task = box.add_mirror(stick, name="Dated", copy_strategy=1, **options)
    return share, stick, task


def dated(days=0, seconds=0, suffix=""):
    """The name of a version of the past."""
    when = datetime.datetime.now() - datetime.timedelta(days=days, seconds=seconds)
    return when.strftime("Ferrix Copy_%Y-%m-%d_%H%M%S") + suffix


def make_version(share, name, files=3):
    os.makedirs(f"{share}/{name}/deep/er")
    for number in range(files):
        with open(f"{share}/{name}/deep/er/{number}", "w", encoding="ascii") as out:
            out.write("old")
    return name


def versions(share):
    return sorted(name for name in os.listdir(share) if NAME.fullmatch(name))


def new_version(share, before):
    found = [name for name in versions(share) if name not in before]
    assert len(found) == 1, found
    return found[0]


def assert_whole(stick, share, name):
    found = tree.differences(tree.listing(stick.mountpoint), tree.listing(f"{share}/{name}"))
    assert not found, "\n".join(found)


def test_each_run_makes_a_dated_version(box):
    """Each plug-in makes a complete copy in a folder named by its time; nothing else is touched."""
    share, stick, task = start(box)
    tree.write(share + "/beside", tree.rng(1))
    assert box.status(task) == "initial"
    stick.unplug()
    begin = datetime.datetime.now().replace(microsecond=0)
    stick.plug()
    assert box.wait_run(task, 1) == "successful"
    first = new_version(share, ["beside"])
    when = datetime.datetime.strptime(NAME.fullmatch(first)[1], "%Y-%m-%d_%H%M%S")
    assert begin <= when <= datetime.datetime.now()
    assert_whole(stick, share, first)
    os.unlink(stick.path(next(name for name in os.listdir(stick.mountpoint)
                              if os.path.isfile(stick.path(name)))))
    stick.hook("post_mount")
    assert box.wait_run(task, 2) == "successful"
    second = new_version(share, ["beside", first])
    assert second > first
    assert_whole(stick, share, second)
    assert sorted(os.listdir(share)) == sorted(["beside", first, second])
    assert len(tree.listing(f"{share}/{first}")) == len(tree.listing(f"{share}/{second}")) + 1
    with open("/tmp/indexed", encoding="utf-8") as indexed:
        assert indexed.read().splitlines() == [f"{share}/{first}", f"{share}/{second}"]
    assert not os.path.exists(f"/volume1/@Ferrix/task/{task}/version-marks")


def test_oldest_versions_are_rotated(box):
    """Policy "oldest": bad versions go first, then the oldest, each with a row of the log."""
    share, stick, task = start(box, files=10, enable_rotation=True, max_version_count=3,
                               rotation_policy=1)
    old = [make_version(share, dated(days, suffix=suffix))
           for days, suffix in ((5, ""), (4, ""), (3, ".Bad"), (2, ""), (1, ""))]
    others = [make_version(share, name) for name in (old[0] + ".old", "Ferrix Copy_mine")]
    stick.hook("post_mount")
    assert box.wait_run(task, 1) == "successful"
    new = new_version(share, old)
    assert versions(share) == [old[3], old[4], new]
    assert all(os.path.isdir(f"{share}/{name}") for name in others)
    rows = box.log_rows("description_id = 104")
    assert [row[1] for row in rows] == [f'["Dated","{name}"]' for name in
                                        (old[2], old[0], old[1])]


def test_a_spread_of_versions_is_kept(box):
    """Policy "conditional": one of each hour, day and week stays; the newest always."""
    share, stick, task = start(box, files=10, enable_rotation=True, max_version_count=5,
                               rotation_policy=2)
    hour = 3600
    kept = [make_version(share, dated(seconds=s)) for s in
            (50 * 86400, 5 * 86400 + 9000, 5 * hour + 900)]
    surplus = [make_version(share, dated(seconds=s)) for s in
               (5 * 86400 + 7200, 5 * hour + 300, 49 * 86400)]
    bad = make_version(share, dated(days=3, suffix=".Bad"))
    stick.hook("post_mount")
    assert box.wait_run(task, 1) == "successful"
    new = new_version(share, [*kept, *surplus, bad])
    left = versions(share)
    assert set(kept) | {new} <= set(left), left
    assert bad not in left and len(left) == 5, left


def test_rotation_with_the_recycle_bin(box):
    """Versions of a share with a recycle bin are moved there, under their names."""
    share, stick, task = start(box, files=10, enable_rotation=True, max_version_count=1,
                               rotation_policy=1)
    box.shares["photos"] = {"recycle_bin": "yes"}
    box.write_host_conf()
    old = make_version(share, dated(days=2))
    stick.hook("post_mount")
    assert box.wait_run(task, 1) == "successful"
    assert len(versions(share)) == 1
    assert os.path.isfile(f"{share}/#recycle/{old}/deep/er/0")


def test_an_export_makes_and_rotates_versions_on_the_device(box):
    """A version task from the share to the device keeps its versions on the device."""
    share = box.add_share("photos")
    tree.fill(share, tree.rng(3), files=20, folders=3)
    stick = box.add_device("stick")
    stick.mount()
    box.start()
    task = box.add_mirror(stick, name="Dated", copy_strategy=1, export=True, enable_rotation=True,
                          max_version_count=2, rotation_policy=1)
    for number in (1, 2, 3):
        stick.hook("post_mount")
        assert box.wait_run(task, number) == "successful"
    left = versions(stick.mountpoint)
    assert len(left) == 2
    assert not tree.differences(tree.listing(share), tree.listing(stick.path(left[-1])))


def test_the_status_while_versions_are_rotated(box):
    """A task that removes old versions shows "copying" until the rotation has ended."""
    share, stick, task = start(box, files=5, enable_rotation=True, max_version_count=1,
                               rotation_policy=1)
    for days in range(1, 81):
        make_version(share, dated(days), files=600)
    stick.hook("post_mount")
    seen = set()
    while len(versions(share)) > 1:
        count = len(versions(share))
        status = box.status(task)
        if 1 < count < 80 and len(versions(share)) > 1:
            seen.add(status)
        time.sleep(0.01)
    assert seen == {"copying"}, seen
    assert box.wait_run(task, 1) == "successful"


def test_versions_of_the_future_are_left_alone(box):
    """A version dated after the present time stays and does not count; the others rotate."""
    share, stick, task = start(box, files=5, enable_rotation=True, max_version_count=1,
                               rotation_policy=1)
    for days in (300, 301):
        make_version(share, dated(days=days))
    future = {make_version(share, dated(days=-days)) for days in (300, 301)}
    stick.hook("post_mount")
    assert box.wait_run(task, 1) == "successful"
    assert future < set(versions(share)) and len(versions(share)) == 3, versions(share)
    assert len(box.log_rows("description_id = 104")) == 2


def test_a_device_that_goes_during_a_run_leaves_a_bad_version(box):
    """A device that leaves in the middle: ".Bad", no rotation; the next run is good and rotates."""
    share, stick, task = start(box, device_mb=300, big=8, enable_rotation=True,
                               max_version_count=1, rotation_policy=1)
    old = make_version(share, dated(days=2))
    stick.hook("post_mount")
    wait_until(lambda: [n for n in versions(share) if n != old
                        and len(os.listdir(f"{share}/{n}")) > 2], 60, 0.002)
    stick.unplug()
    assert box.status(task) == "failed"
    bad = new_version(share, [old])
    assert bad.endswith(".Bad"), bad
    assert os.path.isdir(f"{share}/{old}")
    stick.plug()
    wait_until(lambda: box.status(task) == "successful" and box.task(task)["latest_finish_time"],
               120)
    left = versions(share)
    assert len(left) == 1 and not left[0].endswith(".Bad"), left
    assert_whole(stick, share, left[0])


def test_a_device_that_vanishes_during_a_run_leaves_a_bad_version(box):
    """A device unmounted without a word: the run fails, its version is ".Bad", the old one stays."""
    share, stick, task = start(box, device_mb=300, big=8, enable_rotation=True,
                               max_version_count=1, rotation_policy=1)
    old = make_version(share, dated(days=2))
    stick.hook("post_mount")
    wait_until(lambda: [n for n in versions(share) if n != old
                        and len(os.listdir(f"{share}/{n}")) > 2], 60, 0.002)
    sh("umount", "-l", stick.mountpoint)
    stick.mounted = False
    assert box.log.expect("HandleError: task_err_code = -22", timeout=120)
    wait_until(lambda: box.log_rows("description_id = 103"), 60)
    assert [name.endswith(".Bad") for name in versions(share)] == [False, True]
    assert versions(share)[0] == old


def test_a_killed_run_leaves_a_bad_version(box):
    """kill -9 at any moment of a run: after the restart only whole versions have a good name."""
    share, stick, task = start(box, files=300, device_mb=200, big=3)
    rng = random.Random(5)
    whole = tree.listing(stick.mountpoint)
    for attempt in range(6):
        before = versions(share)
        stick.hook("post_mount")
        wait_until(lambda: versions(share) != before, 60, 0.002)
        time.sleep(rng.uniform(0, 0.4))
        box.kill()
        box.start()
        fresh = new_version(share, before)
        if not fresh.endswith(".Bad"):
            assert not tree.differences(whole, tree.listing(f"{share}/{fresh}")), attempt
        assert not os.path.exists(f"/volume1/@Ferrix/task/{task}/version-marks")
        time.sleep(1)  # the next version needs another second
    assert any(name.endswith(".Bad") for name in versions(share))
    before = versions(share)
    runs = len(box.log_rows("description_id IN (101,102,103)"))
    stick.hook("post_mount")
    assert box.wait_run(task, runs + 1) == "successful"
    assert_whole(stick, share, new_version(share, before))


test_a_killed_run_leaves_a_bad_version.box = {"volume": "ext4"}


def test_a_killed_rotation_leaves_no_half_version(box):
    """kill -9 while versions are removed: what is half removed is ".Bad", the others are whole."""
    share, stick, task = start(box, files=5, enable_rotation=True, max_version_count=1,
                               rotation_policy=1)
    for days in range(1, 41):
        make_version(share, dated(days), files=500)
    stick.hook("post_mount")
    wait_until(lambda: len(versions(share)) < 35, 60, 0.001)
    box.kill()
    halves = [name for name in versions(share) if os.path.exists(f"{share}/{name}/deep/er/0")
              and len(os.listdir(f"{share}/{name}/deep/er")) < 500]
    box.start()
    left = versions(share)
    assert len(left) > 1, "the kill came too late"
    for name in left[:-1]:
        if not name.endswith(".Bad"):
            assert len(os.listdir(f"{share}/{name}/deep/er")) == 500, name
    assert all(f"{name}.Bad" in left for name in halves), halves
    assert not left[-1].endswith(".Bad")
    assert sum(name.endswith(".Bad") for name in left) <= 1
    stick.hook("post_mount")
    box.wait_run(task, 1)
    assert len(versions(share)) == 1


test_a_killed_rotation_leaves_no_half_version.box = {"volume": "ext4"}
