"""Shares under ferrixctl: added, listed, renamed and removed, with the tasks that use them."""
import os
import threading

from ferrix import ctl, tree
from ferrix.box import sh, wait_until
from scenarios.default_tasks import add_default_task
from scenarios.run_control import front_box, no_half_files, same
from scenarios.schedule import CRON_FILE
from scenarios.shares import DAILY, begin, run

HOST_CONF = "/etc/keld/host.conf"
HOSTILE = "my pictures, 100%s 'new' \udcff"


def conf():
    with open(HOST_CONF, encoding="utf-8", errors="surrogateescape") as text:
        return text.read()


def listed():
    return {share["name"]: share for share in ctl.read("share", "list")}


def start(box, files=20, size=None, device_mb=64, with_section=True, **add):
    """A stick with files and a mirror task of it on the share "photos", beside a share "music"."""
    stick = box.add_device("stick", "ext4", device_mb)
    stick.mount()
    rng = tree.rng(1)
    for number in range(files):
        tree.write(stick.path(f"img{number:04}"), rng, size)
    for name in ("photos", "music"):
        if with_section:
            box.add_share(name)
        else:
            os.mkdir(f"/volume1/{name}")
    box.start()
    return stick, box.add_mirror(stick, **add)


def test_shares_are_added_and_listed(box):
    """Before the daemon runs and while it does; the rest of host.conf stays, and a task can use the
    new share at once."""
    box.extra_conf = "\n; keep this\n[hooks]\nnotify = /etc/keld/notify.d ; and this\n"
    box.add_share("photos", recycle_bin="yes")
    stick = box.add_device("stick")
    stick.mount()
    tree.write(stick.path("a"), tree.rng(1))
    before = conf()
    os.chmod(HOST_CONF, 0o640)
    os.makedirs("/volume1/films")
    tree.write("/volume1/films/film", tree.rng(2))
    assert ctl.ok("share", "add", "films") == "The folder /volume1/films is a share now.\n"
    assert conf() == before + "\n[share films]\npath = /volume1/films\n"
    assert os.stat(HOST_CONF).st_mode & 0o7777 == 0o640
    assert os.listdir("/volume1/films") == ["film"]
    assert {name: share["task_ids"] for name, share in listed().items()} == {
        "films": None, "photos": None}
    assert "tasks are not known" in ctl.ok("share", "list")
    box.start()
    ctl.ok("share", "add", "/volume1/new/")
    task = box.add_mirror(stick, share="new")
    assert run(box, task) == "successful"
    assert os.listdir("/volume1/new") == ["a"]
    assert listed() == {
        name: {"name": name, "path": f"/volume1/{name}", "volume": "/volume1", "state": "mounted",
               "can_be_locked": False, "recycle_bin": name == "photos",
               "recycle_bin_admin_only": False, "task_ids": [task] if name == "new" else []}
        for name in ("films", "new", "photos")}
    assert f"{task} Mirror" in ctl.ok("share", "list")
    assert "already" in ctl.refused("share", "add", "new")
    assert "does not lie on a volume" in ctl.refused("share", "add", "/etc", status=ctl.USAGE)


def test_names_that_no_share_can_have_are_refused(box):
    """Whatever is given, no folder is made and host.conf stays as it is."""
    start(box)
    before, folders = conf(), sorted(os.listdir("/volume1"))
    for name in ("", ".", "..", "@Ferrix2", "#recycle", ".hidden", "a]b", "a;b", "a\nb", " a", "a ",
                 "x/y", "n" * 256, "a\n[share evil]\npath = /etc"):
        ctl.refused("share", "add", name, status=ctl.USAGE)
        ctl.refused("share", "rename", "music", name, status=ctl.USAGE)
    assert "photos" in ctl.refused("share", "rename", "music", "photos")
    assert "no share" in ctl.refused("share", "rename", "none", "new", status=ctl.USAGE)
    assert "no share" in ctl.refused("share", "remove", "none", status=ctl.USAGE)
    assert (conf(), sorted(os.listdir("/volume1"))) == (before, folders)


def test_a_renamed_share_takes_its_task_along(box):
    """The task's folder follows, the next run lands in the new place, and nothing is made in the
    old one."""
    os.makedirs("/volume1/photos/in/box")
    stick, task = start(box, folder="/in/box")
    assert run(box, task) == "successful"
    before = box.task(task)
    output = ctl.ok("share", "rename", "photos", HOSTILE)
    assert "100%s 'new' \\xff" in output, output
    assert box.task(task) == {**before, "destination_path": f"/{HOSTILE}/in/box"}
    assert f"[share {HOSTILE}]\npath = /volume1/{HOSTILE}\n" in conf()
    tree.write(stick.path("new"), tree.rng(2))
    assert run(box, task) == "successful"
    same(stick, f"/volume1/{HOSTILE}/in/box")
    assert not os.path.exists("/volume1/photos")
    ctl.ok("share", "rename", HOSTILE, "photos")
    assert listed()["photos"]["task_ids"] == [task]
    assert run(box, task) == "successful"
    same(stick, "/volume1/photos/in/box")


def test_a_renamed_folder_takes_its_task_along(box):
    """The same on a box whose shares are the folders of its volume: host.conf is left alone."""
    stick, task = start(box, with_section=False)
    before = conf()
    assert run(box, task) == "successful"
    ctl.ok("share", "rename", "photos", "pictures")
    assert conf() == before and box.task(task)["destination_path"] == "/pictures"
    tree.write(stick.path("new"), tree.rng(2))
    assert run(box, task) == "successful"
    same(stick, "/volume1/pictures")
    assert sorted(listed()) == ["music", "pictures"]
    assert "not empty" in ctl.refused("share", "remove", "pictures", "--with-tasks")
    assert box.task(task) is not None
    ctl.ok("share", "add", "films")
    assert os.listdir("/volume1/films") == []
    assert "no share any more" in ctl.ok("share", "remove", "films")
    assert sorted(listed()) == ["music", "pictures"]


def test_a_share_is_renamed_during_a_run(box):
    """The run ends with nothing half done, and goes to the new place when it is started again."""
    stick, task = start(box, files=150, size=1 << 20, device_mb=300)

    class Photos:
        path = "/volume1/photos"

    begin(box, task, Photos)
    ctl.ok("share", "rename", "photos", "pictures")
    assert len(os.listdir("/volume1/pictures")) < 150
    no_half_files(stick, "/volume1/pictures")
    assert run(box, task) == "successful"
    same(stick, "/volume1/pictures")
    assert not os.path.exists("/volume1/photos")


def test_a_refused_rename_disturbs_no_run(box):
    """Names that are taken are found out before the tasks are told."""
    stick, task = start(box, files=150, size=1 << 20, device_mb=300)
    os.makedirs("/volume1/private")

    class Photos:
        path = "/volume1/photos"

    begin(box, task, Photos)
    assert "already" in ctl.refused("share", "rename", "photos", "music")
    assert "nothing is ever replaced" in ctl.refused("share", "rename", "photos", "private")
    wait_until(lambda: box.status(task) not in ("waiting", "copying"), 120)
    assert box.status(task) == "successful"
    same(stick, "/volume1/photos")


def test_a_share_that_is_mounted_stays_where_it_is(box):
    """What is mounted on a share would not follow it: the task goes on working."""
    stick, task = start(box)
    os.makedirs("/volume1/.store")
    sh("mount", "--bind", "/volume1/.store", "/volume1/photos")
    assert "unmount it first" in ctl.refused("share", "rename", "photos", "pictures")
    assert run(box, task) == "successful"
    same(stick, "/volume1/photos")
    sh("umount", "/volume1/photos")


def test_a_share_with_tasks_is_removed_when_asked_for(box):
    """Without --with-tasks nothing happens; with it the task goes, with its timetable, and the files
    stay."""
    stick, task = start(box, schedule_enabled=True, schedule_json_str=DAILY)
    assert run(box, task) == "successful"
    before = conf()
    refusal = ctl.refused("share", "remove", "photos")
    assert f"{task} Mirror" in refusal and "--with-tasks" in refusal
    assert conf() == before and box.status(task) == "successful"
    output = ctl.ok("share", "remove", "photos", "--with-tasks")
    assert "its files are in /volume1/photos" in output
    assert box.ask("list_task")["task_list"] == []
    with open(CRON_FILE, encoding="utf-8") as cron:
        assert "--execute-task" not in cron.read()
    same(stick, "/volume1/photos")
    assert "photos" not in conf() and list(listed()) == ["music"]
    assert "the only share" in ctl.refused("share", "remove", "music")
    # The device is free for another task.
    assert run(box, box.add_mirror(stick, share="music")) == "successful"
    same(stick, "/volume1/music")


def test_a_default_task_outlives_its_share(box):
    """It loses the share and is switched off."""
    front = front_box(box)
    front.mount()
    box.add_share("music")
    box.start()
    task = add_default_task("photos")
    assert "Default Ferrix" in ctl.refused("share", "remove", "photos")
    ctl.ok("share", "remove", "photos", "--with-tasks")
    answer = box.task(task)
    assert (answer["task_status"], answer["destination_path"]) == ("disabled", "/"), answer
    assert os.path.isdir("/volume1/photos") and list(listed()) == ["music"]


def test_without_the_daemon_no_task_is_left_behind(box):
    """Renaming and removing wait for the service; nothing has changed."""
    box.add_share("photos")
    box.add_share("music")
    before = conf()
    for words in (("rename", "photos", "pictures"), ("remove", "photos"),
                  ("remove", "photos", "--with-tasks")):
        assert "start the service first" in ctl.refused("share", *words, status=ctl.NOT_REACHABLE)
    assert conf() == before and sorted(os.listdir("/volume1")) == ["@Ferrix", "music", "photos"]


def test_a_broken_host_conf_is_told_and_not_touched(box):
    """The running daemon goes on with what it has read; ferrixctl does not guess."""
    stick, task = start(box)
    assert run(box, task) == "successful"
    with open(HOST_CONF, "a", encoding="utf-8") as text:
        text.write("[share broken\n")
    before = conf()
    line = before.count("\n")
    for words in (("list",), ("add", "new"), ("rename", "photos", "new"), ("remove", "photos")):
        assert f"broken in line {line}" in ctl.refused("share", *words)
    assert conf() == before
    assert run(box, task) == "successful"
    same(stick, "/volume1/photos")


def test_many_hands_at_host_conf(box):
    """Shares are added and renamed by several programs at once: each finds its place, and the daemon
    sees them all."""
    stick = box.add_device("stick")
    stick.mount()
    tree.write(stick.path("a"), tree.rng(1))
    box.add_share("photos")
    box.add_share("music")
    box.start()
    failures = []

    def work(number):
        for index in range(8):
            name = f"s{number}-{index}"
            for words in (("add", name), ("rename", name, name + "b")):
                status, output, errors = ctl.run("share", *words)
                if status != 0:
                    failures.append((words, output, errors))

    workers = [threading.Thread(target=work, args=(number,)) for number in range(4)]
    for worker in workers:
        worker.start()
    for worker in workers:
        worker.join()
    assert failures == []
    names = {f"s{number}-{index}b" for number in range(4) for index in range(8)}
    assert set(listed()) == names | {"photos", "music"}
    for name in names:
        assert os.path.isdir(f"/volume1/{name}")
    assert run(box, box.add_mirror(stick, share="s3-7b")) == "successful"
    same(stick, "/volume1/s3-7b")
