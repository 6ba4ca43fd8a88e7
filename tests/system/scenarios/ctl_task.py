"""The task commands of ferrixctl with the real daemon: what a person means, and what is refused."""
import os

from ferrix import ctl, wire
from ferrix.box import wait_until
from scenarios.ctl_notifier import USAGE, notify


def prepare(box):
    """A started box with the share "photos" and a mounted stick with a picture in DCIM."""
    share, stick = box.add_share("photos"), box.add_device("stick")
    stick.mount()
    os.makedirs(stick.path("DCIM"))
    with open(stick.path("DCIM/img.jpg"), "w", encoding="ascii") as out:
        out.write("a picture")
    box.start()
    return share, stick


def test_a_full_path_on_the_device_is_understood(box):
    """--from and --to take what a shell completes; a source that is not there is refused."""
    share, stick = prepare(box)
    for source in ("DCMI", f"{stick.mountpoint}/DCMI", "DCIM/img.jpg", "/volume1/photos"):
        assert "has no folder" in ctl.refused("task", "add", "--to", "photos", "--from", source)
    assert ctl.read("task", "list") == []
    task = ctl.ok("task", "add", "--to", "photos", "--from", f"{stick.mountpoint}/DCIM").strip()
    assert ctl.read("task", "show", task)["source_path"] == "/DCIM"
    ctl.ok("task", "run", task)
    assert box.wait_run(int(task), 1) == "successful"
    assert os.listdir(share) == ["img.jpg"]
    ctl.ok("task", "remove", task)
    export = ctl.ok("task", "add", "--export", "--from", "photos", "--to",
                    f"{stick.mountpoint}/backup/new", "--strategy", "mirror").strip()
    assert ctl.read("task", "show", export)["destination_path"] == "/backup/new"
    ctl.ok("task", "set", export, "--to", f"{stick.mountpoint}/other")
    assert ctl.read("task", "show", export)["destination_path"] == "/other"


def test_options_that_would_do_nothing_are_refused(box):
    """add and set take no option of another strategy; who names a rotation gets one."""
    _, stick = prepare(box)
    ctl.refused("task", "add", "--to", "photos", "--strategy", "version", "--all-versions",
                "--rotation", "smart", status=ctl.USAGE)
    task = ctl.ok("task", "add", "--to", "photos", "--strategy", "version", "--rotation",
                  "oldest").strip()
    entry = ctl.read("task", "show", task)
    assert entry["enable_rotation"] and entry["max_version_count"] == 256, entry
    assert entry["rotation_policy"] == 1, entry
    assert "this is version" in ctl.refused("task", "set", task, "--rename", status=ctl.USAGE)
    ctl.ok("task", "set", task, "--all-versions")
    assert "--versions" in ctl.refused("task", "set", task, "--rotation", "smart",
                                       status=ctl.USAGE)
    ctl.ok("task", "set", task, "--rotation", "smart", "--versions", "9")
    entry = ctl.read("task", "show", task)
    assert entry["enable_rotation"] and entry["max_version_count"] == 9, entry
    ctl.ok("task", "remove", task)
    task = box.add_mirror(stick)
    ctl.refused("task", "set", str(task), "--versions", "5", status=ctl.USAGE)
    assert box.task(task)["enable_rotation"] == 0


def test_a_folder_is_made_for_a_task_only(box):
    """--make-folder leaves nothing behind when the task is refused or no daemon answers."""
    share, _ = prepare(box)
    assert "share list" in ctl.refused("task", "add", "--to", "nosuch/in", "--make-folder")
    task = ctl.ok("task", "add", "--to", "photos/in", "--make-folder").strip()
    for folder in ("photos/in/below", "photos/second/one"):
        ctl.refused("task", "add", "--to", folder, "--make-folder")
    assert os.listdir(share) == ["in"] and os.listdir(f"{share}/in") == []
    advice = ctl.refused("task", "set", task, "--to", "photos/none")
    assert "--to" in advice and "--make-folder" not in advice
    ctl.ok("task", "remove", task)
    box.stop()
    ctl.refused("task", "add", "--to", "photos/late", "--make-folder", status=ctl.NOT_REACHABLE)
    assert os.listdir(share) == ["in"]


def test_a_failure_is_shown_in_words(box):
    """show says what the log says; of a device that nobody knows the maker of there is no row."""
    _, stick = prepare(box)
    task = ctl.ok("task", "add", "--to", "photos", "--from", "DCIM", "--name", "Camera").strip()
    assert "\nDevice" not in ctl.ok("task", "show", task)
    os.rename(stick.path("DCIM"), stick.path("elsewhere"))
    ctl.ok("task", "run", task)
    wait_until(lambda: box.status(int(task)) == "failed")
    assert "the source folder does not exist" in ctl.ok("task", "show", task)


def test_a_misspelt_hook_is_told(box):
    """The daemon acknowledges any name; the programs know which there are."""
    prepare(box)
    mark = box.log.mark()
    for kind in ("volume_hook", "ferrix_hook", "share_hook"):
        assert "post_mount" in ctl.refused("hook", "post_moun", "--type", kind, status=ctl.USAGE)
        assert "post_mount" in notify("--hook", "post_moun", "--type", kind, status=USAGE)
    assert box.log.lacks("recieve msg >>>", mark)
    assert wire.request({"notify": "post_moun", "type": "volume_hook"}) == {"ack": "ok"}


def test_json_cannot_steer_the_terminal(box):
    """A name with control characters comes out of JSON whole, and none of them on the way."""
    _, stick = prepare(box)
    name = "\u009b31m\u202egpj.exe\U000e0001 \033[2J"
    box.add_mirror(stick, name=name)
    output = ctl.ok("task", "list", "--json")
    assert not any(character in output for character in "\u009b\u202e\U000e0001\033"), output
    assert ctl.read("task", "list")[0]["task_name"] == name
