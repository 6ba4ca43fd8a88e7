"""ferrixctl with the real daemon: the service, devices, tasks, the button, hooks, a run watched."""
import json
import os
import subprocess

from ferrix import ctl, tree
from ferrix.box import PACKAGE, sh, wait_until


def enable_package():
    with open(f"{PACKAGE}/enabled", "w", encoding="ascii"):
        pass


def adopt(box):
    """Lets the box see to the daemon that ferrixctl started."""
    with open("/run/ferrixd.pid", encoding="ascii") as pid_file:
        box.daemon_pid = int(pid_file.read())


def prepare(box, files=3):
    """A started box with the share "photos" and a mounted stick with some files."""
    share, stick = box.add_share("photos"), box.add_device("stick")
    stick.mount()
    rng = tree.rng(5)
    for number in range(files):
        tree.write(stick.path(f"img{number}.jpg"), rng)
    box.start()
    return share, stick


def test_a_service_from_nothing_to_its_end(box):
    """start makes the repository, status tells, a second start changes nothing, stop ends it."""
    os.unlink(f"{PACKAGE}/etc/setting.conf")
    os.rmdir("/volume1/@Ferrix/db")
    os.rmdir("/volume1/@Ferrix/task")
    os.rmdir("/volume1/@Ferrix")
    assert "switched off" in ctl.refused("service", "start")
    enable_package()
    assert ctl.read("service", "status")["pid"] == 0
    assert "service start" in ctl.refused("task", "list", status=ctl.NOT_REACHABLE)
    assert "/volume1/@Ferrix" in ctl.ok("service", "start")
    adopt(box)
    assert os.path.isdir("/volume1/@Ferrix/task")
    wait_until(lambda: ctl.read("service", "status")["state"] == 4, 20)
    status = ctl.read("service", "status")
    assert status["pid"] == box.daemon_pid and status["repo_vol_path"] == "/volume1"
    assert "running" in ctl.ok("service", "status")
    assert "already" in ctl.ok("service", "start")
    assert ctl.read("service", "status") == status
    report = json.loads(ctl.ok("service", "report"))
    assert report["collect_version"] == 1 and report["collect_data"] == []
    ctl.ok("service", "stop")
    wait_until(lambda: not box.is_running(), 20)
    assert "stopped" in ctl.ok("service", "status")
    assert "does not run" in ctl.ok("service", "stop")


def test_a_service_whose_daemon_has_crashed_is_stopped(box):
    """After a crash, with its process id left behind or lost with a power cut, status tells it and
    stop brings the service to its end; who is not root is told to be."""
    for pid_file_stays in (True, False):
        box.start()
        box.kill()
        if not pid_file_stays:
            os.unlink("/run/ferrixd.pid")
        status = ctl.read("service", "status")
        assert status["state_text"].startswith("not running") and status["pid"] == 0, status
        assert "service start" in ctl.ok("service", "status")
        assert "ended by itself" in ctl.ok("service", "stop")
        assert ctl.read("service", "status")["state"] == 6
        assert "does not run" in ctl.ok("service", "stop")
    box.start()
    for words, wanted in ((("service", "status"), ctl.REFUSED),
                          (("task", "list"), ctl.NOT_REACHABLE)):
        done = subprocess.run([ctl.PROGRAM, *words], check=False, text=True, user=65534, group=65534,
                              capture_output=True)
        assert done.returncode == wanted and "as root" in done.stderr, done


def test_a_repository_is_made_and_moved(box):
    """repo init makes an empty repository; service move takes it to another volume, tasks and all."""
    os.makedirs("/volume2")
    sh("mount", "-t", "tmpfs", "-o", "mode=755", "tmpfs", "/volume2")
    box.extra_conf = "[volume /volume2]\ninternal = yes\n"
    box.add_share("photos")
    stick = box.add_device("stick")
    enable_package()
    os.unlink(f"{PACKAGE}/etc/setting.conf")
    assert "no volume" in ctl.refused("repo", "init", "/volume9", status=ctl.USAGE)
    ctl.ok("repo", "init", "/volume1/")
    assert "already" in ctl.ok("repo", "init", "/volume1")
    assert "service move" in ctl.refused("repo", "init", "/volume2")
    ctl.ok("service", "start")
    adopt(box)
    stick.mount()
    task = int(ctl.ok("task", "add", "--to", "photos"))
    assert "no volume" in ctl.refused("service", "move", "/volume9", status=ctl.USAGE)
    assert box.is_running()
    assert "/volume2/@Ferrix" in ctl.ok("service", "move", "/volume2")
    adopt(box)
    assert ctl.read("service", "status")["repo_vol_path"] == "/volume2"
    assert [entry["id"] for entry in ctl.read("task", "list")] == [task]


def test_a_task_is_added_by_guessing_well(box):
    """With one device --to is enough; what is not said is what loses nothing."""
    _, stick = prepare(box)
    device = ctl.read("device", "list")
    assert [(d["mountpoint"], d["uuid"], d["task_id"]) for d in device] == [
        (stick.mountpoint, stick.uuid, None)]
    advice = ctl.refused("task", "add", "--to", "photos/inbox/2026")
    assert "Import destination path does not exist." in advice and "--make-folder" in advice
    # The daemon refused before it wrote anything.
    assert ctl.read("task", "list") == []
    task = int(ctl.ok("task", "add", "--to", "photos/inbox/2026", "--make-folder"))
    entry = ctl.read("task", "show", str(task))
    assert entry["uuid"] == stick.uuid and entry["destination_path"] == "/photos/inbox/2026"
    assert entry["source_path"] == "/" and entry["copy_strategy"] == 3
    assert entry["keep_dir_structure"] is True and entry["remove_src_file"] is False
    assert entry["conflict_policy"] == 1 and entry["run_when_plug_in"] is True
    assert entry["timetable"]["enabled"] is False
    assert ctl.read("device", "list")[0]["task_id"] == task
    assert "task list" in ctl.refused("task", "add", "--to", "photos/inbox")


def test_everything_that_can_be_said_about_a_new_task(box):
    """Each option reaches the daemon."""
    _, stick = prepare(box)
    other = box.add_device("other")
    other.mount()
    os.makedirs("/volume1/photos/inbox")
    os.makedirs(stick.path("DCIM"))
    assert "--device" in ctl.refused("task", "add", "--to", "photos", status=ctl.USAGE)
    task = int(ctl.ok("task", "add", "--device", stick.mountpoint, "--to", "photos/inbox",
                      "--strategy", "incremental", "--date-folders", "--rename", "--move",
                      "--name", "Anna's \"camera\"", "--conflict", "overwrite", "--eject",
                      "--not-on-plug-in", "--from", "DCIM", "--at", "02:30", "--days", "mon-fri",
                      "--only-ext", "jpg,.CR2", "--exclude", "private"))
    entry = ctl.read("task", "show", "Anna's \"camera\"")
    assert entry["id"] == task and entry["source_path"] == "/DCIM"
    assert entry["keep_dir_structure"] is False
    assert entry["smart_create_date_dir"] and entry["rename_photo_video"]
    assert entry["remove_src_file"] and entry["eject_when_task_done"]
    assert not entry["run_when_plug_in"] and entry["conflict_policy"] == 2
    assert entry["timetable"]["enabled"]
    assert entry["timetable"]["schedule"]["week_day"] == "1,2,3,4,5"
    assert "02:30 on Mon, Tue, Wed, Thu, Fri" in ctl.ok("task", "show", str(task))
    lists = ctl.read("task", "filter", "show", str(task))
    assert lists["white_ext"] == ["jpg", "CR2"] and lists["white_name"] == []
    assert lists["black_name"] == ["private"]
    backup = int(ctl.ok("task", "add", "--device", other.loop, "--export", "--from",
                        "/volume1/photos", "--to", "backup", "--strategy", "version",
                        "--versions", "30", "--rotation", "smart"))
    entry = ctl.read("task", "show", str(backup))
    assert entry["source_path"] == "/photos" and entry["destination_path"] == "/backup"
    assert entry["enable_rotation"] and entry["max_version_count"] == 30
    assert entry["rotation_policy"] == 2
    for words in (["--strategy", "mirror", "--rename"], ["--strategy", "mirror", "--versions", "3"],
                  ["--days", "mon"], ["--at", "25:00"], ["--strategy", "none"]):
        ctl.refused("task", "add", "--device", stick.loop, "--to", "photos", *words,
                    status=ctl.USAGE)


def test_settings_are_changed_one_by_one(box):
    """What is not named stays, also what the daemon would forget if it were not sent again."""
    _, stick = prepare(box)
    os.makedirs("/volume1/photos/inbox")
    os.makedirs("/volume1/photos/other")
    task = ctl.ok("task", "add", "--to", "photos/inbox", "--at", "03:00", "--eject").strip()
    assert "help" in ctl.refused("task", "set", task, status=ctl.USAGE)
    ctl.ok("task", "set", task, "--name", "Camera")
    ctl.ok("task", "set", "Camera", "--to", "photos/other", "--conflict", "overwrite")
    entry = ctl.read("task", "show", "Camera")
    assert entry["destination_path"] == "/photos/other" and entry["conflict_policy"] == 2
    assert entry["keep_dir_structure"] is True
    assert "does not exist" in ctl.refused("task", "set", task, "--to", "photos/none")
    ctl.ok("task", "trigger", task, "--not-on-plug-in")
    entry = ctl.read("task", "show", task)
    assert not entry["run_when_plug_in"] and entry["eject_when_task_done"]
    assert entry["timetable"]["enabled"] and entry["timetable"]["schedule"]["hour"] == 3
    ctl.ok("task", "trigger", task, "--on-plug-in", "--no-eject", "--at", "04:15", "--days", "sun")
    entry = ctl.read("task", "show", task)
    assert entry["run_when_plug_in"] and not entry["eject_when_task_done"]
    assert entry["timetable"]["schedule"]["week_day"] == "0"
    ctl.ok("task", "trigger", task, "--no-timetable")
    assert not ctl.read("task", "show", task)["timetable"]["enabled"]
    ctl.ok("task", "filter", "set", task, "--exclude-ext", "tmp")
    assert "tmp" in ctl.ok("task", "filter", "show", task)
    ctl.ok("task", "filter", "set", task)
    assert "Everything else is copied" in ctl.ok("task", "filter", "show", task)
    assert "one of your own" in ctl.refused("task", "disable", task, status=ctl.USAGE)
    stick.unplug()
    assert "not plugged in" in ctl.refused("task", "run", task)
    ctl.ok("task", "remove", task)
    assert ctl.read("task", "list") == []
    assert "task list" in ctl.refused("task", "show", task, status=ctl.USAGE)


def test_a_run_is_watched_in_a_pipe_and_on_a_terminal(box):
    """watch shows the run to its end, and its exit status tells how it ended."""
    share, stick = prepare(box, files=60)
    task = ctl.ok("task", "add", "--to", "photos", "--name", "Camera").strip()
    ctl.ok("task", "run", task)
    status, output, errors = ctl.run("task", "watch", "Camera")
    assert (status, errors) == (ctl.DONE, ""), (output, errors)
    lines = output.splitlines()
    assert "successful" in lines[-1] and "60 files" in lines[-1], output
    assert any("waiting" in line for line in lines), output
    assert len(os.listdir(share)) == 60
    tree.write(stick.path("new.jpg"), tree.rng(1))
    ctl.ok("task", "run", task)
    status, screen = ctl.on_terminal("task", "watch", task)
    assert status == ctl.DONE and "\033[" in screen and "1 file," in screen, screen
    os.unlink(stick.path("new.jpg"))
    ctl.ok("task", "run", task)
    status, output, _ = ctl.run("task", "watch", "--json")
    last = json.loads(output.splitlines()[-1])
    assert status == ctl.DONE and last["task_status"] == "successful" and last["files"] == 0


def test_a_run_that_is_cancelled_is_not_a_success(box):
    """A task that ran well before is cancelled behind a long run; its watcher's exit status says
    so. One whose device is ejected at the end of a good run counts as well."""
    _, stick = prepare(box)
    box.add_share("big")
    other = box.add_device("other", size_mb=900)
    other.mount()
    sh("sh", "-c", f"for i in $(seq 200); do head -c 4M /dev/urandom > {other.path('f')}$i; done")
    task = ctl.ok("task", "add", "--device", stick.mountpoint, "--to", "photos", "--run").strip()
    assert ctl.run("task", "watch", task)[0] == ctl.DONE or box.wait_run(int(task), 1)
    long_run = ctl.ok("task", "add", "--device", other.mountpoint, "--to", "big", "--eject",
                      "--run").strip()
    ctl.ok("task", "run", task)
    with subprocess.Popen([ctl.PROGRAM, "task", "watch", task], stdout=subprocess.PIPE,
                          stderr=subprocess.PIPE, text=True) as watcher:
        assert "waiting" in watcher.stdout.readline()
        ctl.ok("task", "cancel", task)
        assert watcher.wait(60) == ctl.REFUSED
        assert "cancelled" in watcher.stderr.read()
    assert box.status(int(task)) == "successful"
    status, output, errors = ctl.run("task", "watch", long_run)
    assert (status, errors) == (ctl.DONE, ""), output + errors
    assert box.task(int(long_run))["error_code"] == 0


def test_the_button_hooks_and_settings(box):
    """The copy button runs what is plugged in; hooks reach the daemon; the beep is kept."""
    share, stick = prepare(box)
    task = ctl.ok("task", "add", "--to", "photos", "--not-on-plug-in").strip()
    ctl.ok("button")
    assert box.wait_run(int(task), 1) == "successful"
    assert len(os.listdir(share)) == 3
    ctl.ok("hook", "pre_unmount", f"mountpoint={stick.mountpoint}", f"device={stick.loop}")
    assert box.status(int(task)) == "unmounted"
    ctl.ok("hook", "post_mount", f"mountpoint={stick.mountpoint}", f"device={stick.loop}")
    assert box.status(int(task)) == "successful"
    assert "post_mount" in ctl.refused("hook", "post_moun", status=ctl.USAGE)
    ctl.refused("hook", "post_mount", "mountpoint", status=ctl.USAGE)
    assert ctl.ok("setting", "beep") == "on\n"
    ctl.ok("setting", "beep", "off")
    assert ctl.read("setting", "beep") == {"beep": False}
    with open(f"{PACKAGE}/etc/setting.conf", encoding="utf-8") as settings:
        assert 'beep="no"' in settings.read()


def test_default_tasks_are_switched(box):
    """A task that comes with the box is enabled and disabled by its name, and not removed."""
    # pylint: disable-next=import-outside-toplevel
    from scenarios.default_tasks import add_default_task
    box.add_share("photos")
    box.start()
    add_default_task("photos")
    name = ctl.read("task", "list")[0]["task_name"]
    ctl.ok("task", "disable", name)
    assert ctl.read("task", "show", name)["task_status"] == "disabled"
    ctl.ok("task", "enable", name)
    assert ctl.read("task", "show", name)["task_status"] == "unmounted"
    assert "task disable" in ctl.refused("task", "remove", name)


def test_hostile_names_are_just_names(box):
    """Names from a device or another client cannot steer the terminal, and come out of JSON whole."""
    _, stick = prepare(box)
    name = "\033[2J'; DROP TABLE x; --\n\u202e%s"
    box.add_mirror(stick, name=name)
    for words in (["task", "list"], ["task", "show", "1"], ["device", "list"]):
        output = ctl.ok(*words)
        assert "\033" not in output and "\u202e" not in output, output
    assert ctl.read("task", "list")[0]["task_name"] == name
    status, screen = ctl.on_terminal("task", "list")
    assert status == ctl.DONE and "\033[2J" not in screen and "\033[1m" in screen
    status, screen = ctl.on_terminal("task", "list", NO_COLOR="1")
    assert status == ctl.DONE and "\033" not in screen


def test_help_stands_at_every_level(box):
    """Each command has a help with an example; a wrong word ends with 2 and points there."""
    assert box is not None

    def walk(words):
        output = ctl.ok(*words, "--help")
        assert "Example:" in output, output
        part = output.partition("Subcommands:\n")[2].partition("\n\n")[0]
        for line in part.splitlines():
            if line.startswith("  ") and line[2] != " ":
                yield (*words, line.split()[0])
                yield from walk((*words, line.split()[0]))

    commands = set(walk(()))
    for expected in ("service start", "service stop", "service status", "service move",
                     "service report", "repo init", "device list", "task list", "task show",
                     "task add", "task set", "task trigger", "task filter set", "task run",
                     "task cancel", "task enable", "task disable", "task remove", "task watch",
                     "button", "setting beep", "log", "share list", "share add", "share remove",
                     "share rename", "hook"):
        assert tuple(expected.split()) in commands, expected
    for words in ([], ["task"], ["task", "none"], ["task", "run"], ["--none"]):
        assert "--help" in ctl.refused(*words, status=ctl.USAGE)
