"""Shares that are renamed, moved, restored, locked and deleted under tasks, also while they run."""
import os
import random
import shutil
import time

from ferrix import tree, wire
from ferrix.box import sh, wait_until
from scenarios.default_tasks import add_default_task
from scenarios.run_control import ENDED, done, front_box, no_half_files, refused, same
from scenarios.schedule import CRON_FILE

INTERRUPTED = (-1) & 0xFFFFFFFF
MIRROR, INCREMENTAL, VERSION = 2, 3, 1
DAILY = '{"date_type": 0, "week_day": "", "repeat_date": 0, "hour": 3, "minute": 4}'
NOT_ENDED = ("waiting", "copying", "canceling")


def hook(name, share, origin=None):
    """What the share service sends; the answer must come soon, whatever the workers do."""
    message = {"notify": name, "type": "share_hook", "share_name": share}
    if origin is not None:
        message["origin_share_name"] = origin
    begin = time.monotonic()
    assert wire.request(message) == {"ack": "ok"}
    assert time.monotonic() - begin < 20, f"{name} took {time.monotonic() - begin:.0f} s"


class Share:
    """A share that can be locked: a folder elsewhere, which is mounted on the share's place."""

    def __init__(self, box, name, number=0):
        self.box, self.name, self.store = box, name, f"/volume1/.store{number}"
        os.makedirs(self.store)
        self.declare()

    @property
    def path(self):
        return f"/volume1/{self.name}"

    def declare(self):
        self.box.add_share(self.name, mount_point="yes")
        self.unlock()

    def lock(self):
        """Fails when the daemon has anything open there."""
        sh("umount", self.path)

    def unlock(self):
        sh("mount", "--bind", self.store, self.path)

    def move(self, name):
        self.lock()
        os.rmdir(self.path)
        del self.box.shares[self.name]
        self.name = name
        self.declare()

    def rename(self, name):
        """With the pair of hooks around it."""
        old = self.name
        hook("pre_path_change", old)
        self.move(name)
        hook("post_path_change", name, old)

    def empty(self):
        sh("find", self.store, "-mindepth", "1", "-delete")


def start(box, files=20, size=None, device_mb=64, **add):
    """A stick with files and a mirror task of it on the share "photos"."""
    share = Share(box, "photos")
    stick = box.add_device("stick", "ext4", device_mb)
    stick.mount()
    rng = tree.rng(1)
    for number in range(files):
        tree.write(stick.path(f"img{number:04}"), rng, size)
    box.start()
    return share, stick, box.add_mirror(stick, **add)


def assert_stopped(box, task, device):
    """Workers that have been at work do nothing for the task any more."""
    assert box.log.expect(activity(device)), "a line of its work was never seen"
    assert_still(box, task, device)


def begin(box, task, share):
    """Runs the task and returns when it is in the middle of its copies."""
    done(box.ask("run_task", task_id=task))
    wait_until(lambda: len(os.listdir(share.path)) > 10, 60, 0.01, "some copies")


def run(box, task):
    done(box.ask("run_task", task_id=task))
    return wait_until(lambda: (s := box.status(task)) not in NOT_ENDED and s, 120, 0.1, "the run's end")


def activity(device):
    """What stands in a log line of each file in hand; all files are called img..."""
    return f"(1): Copy '{device.path('img')}"


def assert_still(box, task, device, seconds=0.3):
    """No worker does anything for the task any more."""
    time.sleep(0.1)  # lines of what was done before are sent in groups
    mark = box.log.mark()
    time.sleep(seconds)
    assert box.log.lacks(activity(device), mark), "the workers went on"
    assert box.status(task) not in NOT_ENDED


def stopped_rows(box):
    return len(box.log_rows("description_id = 102"))


def test_a_share_is_renamed(box):
    """A task follows its share to the new name and loses nothing of its state; the next run goes
    there, and nothing is made under the old name."""
    share, stick, task = start(box)
    assert run(box, task) == "successful"
    before = box.task(task)
    share.rename("my pictures, 100%s 'new'")
    after = box.task(task)
    assert after == {**before, "destination_path": f"/{share.name}"}
    assert box.log.expect("HandleShareRemoveEntry: share_name = photos")
    assert box.log.expect("HandleSharePathChange: origin_share_name = photos, "
                          f"share_name = {share.name}")
    tree.write(stick.path("new"), tree.rng(2))
    assert run(box, task) == "successful"
    same(stick, share.path)
    assert not os.path.exists("/volume1/photos")
    stick.unplug()
    stick.plug()
    wait_until(lambda: box.status(task) == "successful", 60)
    same(stick, share.path)


def test_a_share_is_renamed_during_a_run(box):
    """The run ends at once with nothing half done, is not started again by itself, and can be run
    again to a good end under the new name."""
    share, stick, task = start(box, files=150, size=1 << 20, device_mb=300)
    begin(box, task, share)
    hook("pre_path_change", "photos")
    count = len(os.listdir(share.path))
    assert count < 150
    no_half_files(stick, share.path)
    answer = box.task(task)
    assert (answer["task_status"], answer["is_usb_mounted"]) == ("failed", 0)
    assert answer["error_code"] & 0xFFFFFFFF == INTERRUPTED
    refused(box.ask("run_task", task_id=task), 11, "Task is not runnable")
    share.move("pictures")
    hook("post_path_change", "pictures", "photos")
    time.sleep(7)
    assert len(os.listdir(share.path)) == count and stopped_rows(box) == 1
    assert run(box, task) == "successful"
    same(stick, share.path)


def test_a_share_moves_to_another_volume(box):
    """A share that keeps its name and gets another place: the task goes there."""
    share = box.add_share("photos")
    stick = box.add_device("stick")
    stick.mount()
    tree.write(stick.path("a"), tree.rng(1))
    box.start()
    task = box.add_mirror(stick)
    assert run(box, task) == "successful"
    hook("pre_path_change", "photos")
    os.makedirs("/volume2")
    shutil.move(share, "/volume2/photos")
    del box.shares["photos"]
    box.extra_conf = "[volume /volume2]\ninternal = yes\n[share photos]\npath = /volume2/photos\n"
    box.write_host_conf()
    hook("post_path_change", "photos", "photos")
    tree.write(stick.path("b"), tree.rng(2))
    assert run(box, task) == "successful"
    same(stick, "/volume2/photos")
    assert not os.path.exists(share)


def test_a_device_plugged_in_while_its_share_is_renamed(box):
    """A device that comes between the two hooks: its task runs to the new place afterwards."""
    share, stick, task = start(box, run_when_plug_in=False)
    for moment in ("before", "after"):
        old, new = share.name, "renamed " + moment
        hook("pre_path_change", old)
        if moment == "before":
            stick.hook("post_mount")
            assert box.status(task) == "initial"
        share.move(new)
        if moment == "after":
            stick.hook("post_mount")
            assert box.task(task)["is_usb_mounted"] == 0
        hook("post_path_change", new, old)
        assert run(box, task) == "successful"
        same(stick, share.path)
        assert os.listdir("/volume1").count(old) == 0


def test_a_share_is_restored_during_a_run(box):
    """A share whose content is put back to an earlier state, with a run under way: the run ends, and
    the next one completes the earlier state. The same for a transformation."""
    share, stick, task = start(box, files=150, size=1 << 20, device_mb=300)
    for number, kind in enumerate(("snapshot_restore", "transform")):
        share.empty()
        begin(box, task, share)
        hook("pre_" + kind, "photos")
        assert stopped_rows(box) == number + 1
        no_half_files(stick, share.path)
        share.lock()
        share.empty()
        tree.write(share.store + "/img0000", tree.rng(9), 1000)
        share.unlock()
        hook("post_" + kind, "photos")
        assert_stopped(box, task, stick)
        assert os.listdir(share.path) == ["img0000"]
        assert run(box, task) == "successful"
        same(stick, share.path)


def test_a_share_is_locked_during_a_run(box):
    """The run is cancelled, the share can be unmounted at once, and the task cannot run. Unlocked,
    the task is there again without a plug-in; nothing starts it."""
    share, stick, task = start(box, files=150, size=1 << 20, device_mb=300)
    begin(box, task, share)
    hook("pre_encrypt", "photos")
    share.lock()
    answer = box.task(task)
    assert (answer["task_status"], answer["is_usb_mounted"], answer["is_hub_mounted"],
            answer["is_task_runnable"]) == ("failed", 1, 0, 0)
    refused(box.ask("run_task", task_id=task), 11, "Task is not runnable")
    stick.hook("post_mount")
    time.sleep(7)
    assert os.listdir(share.path) == []
    share.unlock()
    hook("post_decrypt", "photos")
    assert box.log.expect("HandleShareMounted: share_name = photos, do nothing")
    count = len(os.listdir(share.path))
    no_half_files(stick, share.path)
    time.sleep(7)
    assert len(os.listdir(share.path)) == count < 150
    assert box.task(task)["is_task_runnable"] == 1
    assert run(box, task) == "successful"
    same(stick, share.path)


def test_a_share_is_deleted_during_a_run(box):
    """The task goes with its rows, its folder and its timetable; the share can be removed at once;
    the device can get another task."""
    share, stick, task = start(box, files=150, size=1 << 20, device_mb=300, schedule_enabled=True,
                               schedule_json_str=DAILY)
    with open(CRON_FILE, encoding="utf-8") as cron:
        assert f"--execute-task {task}\n" in cron.read()
    begin(box, task, share)
    hook("pre_delete", "photos")
    assert box.ask("list_task")["task_list"] == []
    assert os.listdir("/volume1/@Ferrix/task") == []
    assert (1, '["Mirror"]', 0) in box.log_rows() and stopped_rows(box) == 1
    share.lock()
    shutil.rmtree(share.store)
    os.rmdir(share.path)
    del box.shares["photos"]
    box.write_host_conf()
    with open(CRON_FILE, encoding="utf-8") as cron:
        assert "--execute-task" not in cron.read()
    time.sleep(2)
    assert "photos" not in os.listdir("/volume1")
    box.add_share("other")
    other = box.add_mirror(stick, share="other")
    assert other != task
    assert run(box, other) == "successful"
    same(stick, "/volume1/other")


def test_a_default_task_loses_its_share(box):
    """A default task whose share is deleted in the middle of a run stays, without a share and off;
    with a share of its own again it serves the device that is still there."""
    front = front_box(box)
    front.mount()
    rng = tree.rng(1)
    for number in range(150):
        tree.write(front.path(f"img{number:04}"), rng, 1 << 20)
    box.start()
    task = add_default_task("photos")
    done(box.ask("set_trigger_time_setting", task_id=task, run_when_plug_in=True,
                 eject_when_task_done=False))
    front.hook("post_mount")
    wait_until(lambda: len(os.listdir("/volume1/photos")) > 10, 60, 0.01)
    hook("pre_delete", "photos")
    assert len(os.listdir("/volume1/photos")) < 150
    shutil.rmtree("/volume1/photos")
    del box.shares["photos"]
    box.write_host_conf()
    answer = box.task(task)
    assert (answer["task_status"], answer["is_default_task"], answer["destination_path"]) == (
        "disabled", 1, "/"), answer
    front.hook("post_mount")
    time.sleep(7)
    assert "photos" not in os.listdir("/volume1")
    box.add_share("second")
    done(box.ask("set_task_setting", task_id=task, task_type=1, hub_share_name="second",
                 hub_folder_path="/"))
    done(box.ask("enable_task", task_id=task))
    assert run(box, task) == "successful"
    same(front, "/volume1/second")


def test_a_device_goes_over_to_the_default_task(box):
    """A device whose own task goes with its share is served by the default task."""
    front = front_box(box)
    front.mount()
    tree.write(front.path("a"), tree.rng(1))
    box.add_share("own")
    box.start()
    default_task = add_default_task("photos")
    own = box.add_mirror(front, share="own", name="Own")
    assert box.status(default_task) == "unmounted"
    hook("pre_delete", "own")
    assert box.task(own) is None
    assert box.task(default_task)["is_usb_mounted"] == 1
    assert run(box, default_task) == "successful"
    assert os.listdir("/volume1/photos") == ["a"] and os.listdir("/volume1/own") == []


class Party:
    """A share, a device and a task of one strategy, which strange things happen to."""

    def __init__(self, box, number, strategy):
        self.box, self.strategy, self.number = box, strategy, number
        self.share = Share(box, f"share{number}", number)
        self.device = box.add_device(f"device{number}")
        self.device.mount()
        self.rng = tree.rng(number)
        for file in range(200):
            tree.write(self.device.path(f"img{file:03}"), self.rng)
        self.task = None
        self.renamed = 0

    def add_task(self):
        self.task = self.box.add_mirror(self.device, share=self.share.name, run_when_plug_in=False,
                                        copy_strategy=self.strategy, name=f"Party {self.number}")

    def start(self):
        """Asks for a run that has something to do. It is refused only while the share is away."""
        tree.write(self.device.path(f"img{self.rng.randrange(200):03}"), self.rng)
        done(self.box.ask("run_task", task_id=self.task))

    def assert_taken_out(self):
        answer = self.box.task(self.task)
        assert answer["is_usb_mounted"] == 0 and answer["task_status"] in (
            "unmounted", "failed"), answer
        assert_still(self.box, self.task, self.device, 0.1)

    def assert_in(self):
        answer = self.box.task(self.task)
        assert answer["destination_path"].split("/")[1] == self.share.name, answer
        assert (answer["is_usb_mounted"], answer["is_hub_mounted"]) == (1, 1), answer

    def rename(self, chance):
        self.renamed += 1
        old, new = self.share.name, f"share{self.number} number {self.renamed}"
        hook("pre_path_change", old)
        self.assert_taken_out()
        if chance.random() < 0.3:
            self.device.hook("post_mount")
        self.share.move(new)
        if chance.random() < 0.3:
            self.device.hook("post_mount")
        hook("post_path_change", new, old)

    def lock(self, chance):
        hook("pre_encrypt", self.share.name)
        self.share.lock()
        assert_still(self.box, self.task, self.device, chance.random() * 0.2)
        refused(self.box.ask("run_task", task_id=self.task), 11, "Task is not runnable")
        self.share.unlock()
        hook("post_decrypt", self.share.name)

    def restore(self, chance):
        kind = chance.choice(("snapshot_restore", "transform"))
        hook("pre_" + kind, self.share.name)
        self.assert_taken_out()
        self.share.lock()
        if self.strategy == MIRROR:
            self.share.empty()
        self.share.unlock()
        hook("post_" + kind, self.share.name)

    def delete(self, _):
        hook("pre_delete", self.share.name)
        assert self.box.task(self.task) is None
        assert str(self.task) not in os.listdir("/volume1/@Ferrix/task")
        self.share.lock()
        self.share.empty()
        self.share.unlock()
        old = self.task
        self.add_task()
        assert self.task > old

    def replug(self, _):
        self.device.unplug()
        self.device.plug()

    def assert_copied(self):
        if self.strategy == VERSION:
            newest = max(name for name in os.listdir(self.share.path) if not name.endswith(".Bad"))
            same(self.device, f"{self.share.path}/{newest}")
        else:
            same(self.device, self.share.path)


def move_at_random(box, rounds):
    """Three tasks run again and again, one of each strategy, while their shares are renamed, locked,
    restored and deleted and their devices pulled. Nothing hangs, and nothing is left behind."""
    parties = [Party(box, n, s) for n, s in enumerate((MIRROR, INCREMENTAL, VERSION))]
    box.start()
    for party in parties:
        party.add_task()
    chance = random.Random(rounds)
    running = 0
    for _ in range(rounds):
        party = chance.choice(parties)
        for each in parties:
            each.start()
        time.sleep(chance.random() * 0.4)
        running += box.status(party.task) == "copying"
        chance.choice((party.rename, party.lock, party.restore, party.delete, party.replug))(chance)
        party.assert_in()
        assert len(box.ask("list_task")["task_list"]) == 3
        assert sorted(os.listdir("/volume1/@Ferrix/task")) == sorted(str(p.task) for p in parties)
    assert running > rounds // 10, running
    for party in parties:
        done(box.ask("cancel_task", task_id=party.task))
        assert run(box, party.task) == "successful"
        party.assert_copied()
    assert {row[0] for row in box.log_rows(ENDED)} == {101, 102}


def test_shares_move_at_random_during_runs(box):
    """Shares are renamed, locked, restored and deleted at random under running tasks."""
    move_at_random(box, 60)


def test_shares_move_at_random_for_long(box):
    """The same, twice as long."""
    move_at_random(box, 120)


test_shares_move_at_random_for_long.long = True
