"""Mirror tasks: what a person sees who plugs in a device."""
import os
import shutil
import stat

from ferrix import tree, wire
from ferrix.box import wait_until


def prepare(box, fs="ext4", volume_share=None, **options):
    share = box.add_share("photos", **(volume_share or {}))
    stick = box.add_device("stick", fs)
    stick.mount()
    rng = tree.rng(7)
    if fs == "exfat":
        os.mkdir(stick.path("DCIM"))
        for number in range(30):
            tree.write(stick.path(f"DCIM/img{number}.jpg"), rng)
    else:
        tree.fill(stick.mountpoint, rng, **{"files": 120, "folders": 15, **options})
    stick.unmount()
    return share, stick


def equal(stick, share, folders=True):
    left, right = tree.listing(stick.mountpoint), tree.listing(share)
    if not folders:
        left = {k: v for k, v in left.items() if v[0] == "file"}
        right = {k: v for k, v in right.items() if v[0] == "file"}
    assert not (found := tree.differences(left, right)), "\n".join(found)
    return left


def test_a_plugged_in_device_is_mirrored(box):
    """A device is plugged in, its task is added and runs on the next plug-in; all is told."""
    share, stick = prepare(box)
    stick.mount()
    box.start()
    task = box.add_mirror(stick, name="My card")
    assert box.status(task) == "initial"
    stick.unplug()
    assert box.status(task) == "unmounted"
    stick.plug()
    assert box.wait_run(task, 1) == "successful"
    entries = equal(stick, share)
    for path, entry in entries.items():
        info = os.lstat(share + path)
        assert (info.st_uid, info.st_gid) == (1024, 100), path
        if entry[0] == "file":
            assert info.st_mode & 0o7777 == os.lstat(stick.mountpoint + path).st_mode & 0o0777
    answer = box.task(task)
    assert answer["latest_finish_time"] > 0 and answer["error_code"] == 0
    assert answer["source_path"] == "/photos" or answer["destination_path"] == "/photos"
    assert [row[0] for row in box.log_rows()] == [0, 100, 101]
    assert box.log_rows()[0][1] == '["My card"]'
    assert wait_until(box.notified) == ["FERRIXFinished|My card|"]
    with open("/tmp/indexed", encoding="utf-8") as indexed:
        assert indexed.read().splitlines() == [share]


def test_changes_are_followed_and_old_files_go_to_the_recycle_bin(box):
    """A second run copies what is new and changed; what was replaced or removed is recycled."""
    share, stick = prepare(box, volume_share={"recycle_bin": "yes"})
    stick.mount()
    box.start()
    task = box.add_mirror(stick)
    stick.hook("post_mount")
    box.wait_run(task, 1)
    before = equal(stick, share)
    assert not os.path.exists(share + "/#recycle")
    rng = tree.rng(11)
    tree.mutate(stick.mountpoint, rng, 30)
    after = tree.listing(stick.mountpoint, with_times=False)
    old = {path: entry for path, entry in before.items()}
    stick.hook("post_mount")
    assert box.wait_run(task, 2) == "successful"
    equal(stick, share)
    recycled = tree.listing(share + "/#recycle", with_times=False, skip=())
    for path, entry in old.items():
        if entry[0] == "file" and after.get(path) != ("file", None, *entry[2:]):
            assert recycled.get(path) == ("file", None, *entry[2:]), path
    for path, entry in recycled.items():
        if entry[0] == "file":
            assert path in old and entry[2:] == old[path][2:], path


def test_a_second_run_without_changes_touches_nothing(box):
    """Nothing is copied, removed or recycled when source and destination are equal."""
    share, stick = prepare(box)
    stick.mount()
    box.start()
    task = box.add_mirror(stick)
    stick.hook("post_mount")
    box.wait_run(task, 1)
    inodes = {path: os.lstat(share + path).st_ino for path in equal(stick, share)}
    mark = box.log.mark()
    stick.hook("post_mount")
    assert box.wait_run(task, 2) == "successful"
    assert inodes == {path: os.lstat(share + path).st_ino for path in equal(stick, share)}
    assert box.log.lacks("RemoveFile: remove path", mark)


def test_every_file_system_of_a_device(box):
    """Devices with xfs, btrfs and exFAT are mirrored as ext4 is."""
    box.start()
    for fs in ("xfs", "btrfs", "exfat"):
        share = box.add_share(fs)
        stick = box.add_device(f"stick-{fs}", fs, 320)
        stick.mount()
        rng = tree.rng(3)
        for number in range(40):
            tree.write(stick.path(f"img{number}.jpg"), rng)
        task = box.add_mirror(stick, share=fs, name=fs)
        stick.hook("post_mount")
        box.wait_status(task, "successful")
        equal(stick, share)
        stick.unplug()
        assert box.status(task) == "unmounted"


def test_an_export_copies_from_the_share_to_the_device(box):
    """An export task mirrors a folder of a share onto a folder of the device; exFAT too."""
    share = box.add_share("photos")
    rng = tree.rng(5)
    os.mkdir(share + "/out")
    for number in range(40):
        tree.write(f"{share}/out/img{number}.jpg", rng)
    stick = box.add_device("stick", "exfat", 200)
    stick.mount()
    os.mkdir(stick.path("backup"))
    box.start()
    task = box.add_mirror(stick, folder="/out", usb_folder="/backup", export=True)
    stick.hook("post_mount")
    assert box.wait_run(task, 1) == "successful"
    left, right = tree.listing(share + "/out"), tree.listing(stick.path("backup"))
    assert not tree.differences(left, right), tree.differences(left, right)
    assert not os.path.exists("/tmp/indexed")
    answer = box.task(task)
    assert (answer["source_path"], answer["destination_path"]) == ("/photos/out", "/backup")


def test_an_export_follows_names_that_change_their_case_alone(box):
    """exFAT finds /a.txt under /A.txt too: renamed in case, files and folders stay on the device."""
    share = box.add_share("photos")
    rng = tree.rng(11)
    for name in ("A.txt", "Changed.txt", "GONE.txt", "DCIM/Img.jpg", "DCIM/Sub/x", "Note/below"):
        os.makedirs(os.path.dirname(f"{share}/out/{name}"), exist_ok=True)
        tree.write(f"{share}/out/{name}", rng, 5000)
    stick = box.add_device("stick", "exfat", 64)
    stick.mount()
    os.mkdir(stick.path("backup"))
    box.start()
    task = box.add_mirror(stick, folder="/out", usb_folder="/backup", export=True)
    stick.hook("post_mount")
    assert box.wait_run(task, 1) == "successful"
    for old, new in (("A.txt", "a.txt"), ("Changed.txt", "changed.TXT"),
                     ("DCIM/Img.jpg", "DCIM/img.JPG"), ("DCIM/Sub", "DCIM/sub"), ("DCIM", "dcim")):
        os.rename(f"{share}/out/{old}", f"{share}/out/{new}")
    tree.write(f"{share}/out/changed.TXT", rng, 6000)
    os.remove(share + "/out/GONE.txt")
    shutil.rmtree(share + "/out/Note")
    tree.write(share + "/out/note", rng, 100)
    for number in (2, 3):
        mark = box.log.mark()
        stick.hook("post_mount")
        assert box.wait_run(task, number) == "successful"
        left, right = tree.listing(share + "/out"), tree.listing(stick.path("backup"))
        assert not tree.differences(left, right), tree.differences(left, right)
        for line in ("CopyHandler: SetCopyFromFullPath", "RemoveFile: remove path"):
            assert box.log.lacks(line, mark) == (number == 3), (number, line)


def test_links_devices_and_pipes_are_left_alone(box):
    """Only files and folders are copied; a link is never followed, a pipe never waited for."""
    share, stick = prepare(box, files=5, folders=2)
    stick.mount()
    os.symlink("/etc/passwd", stick.path("link"))
    os.symlink("/etc", stick.path("link-to-folder"))
    os.symlink("nowhere", stick.path("dangling"))
    os.mkfifo(stick.path("pipe"))
    os.mknod(stick.path("node"), stat.S_IFCHR | 0o666, os.makedev(1, 3))
    os.mkdir(stick.path("@eaDir"))
    tree.write(stick.path("@eaDir/hidden"), tree.rng(1))
    box.start()
    task = box.add_mirror(stick)
    stick.hook("post_mount")
    assert box.wait_run(task, 1) == "successful"
    for name in ("link", "link-to-folder", "dangling", "pipe", "node", "@eaDir"):
        assert not os.path.lexists(f"{share}/{name}"), name


def test_the_share_root_with_its_recycle_bin_is_a_destination(box):
    """A mirror onto a share's root leaves its recycle bin and a stick's own "#recycle" alone."""
    share, stick = prepare(box, volume_share={"recycle_bin": "yes"}, files=10, folders=2)
    stick.mount()
    os.mkdir(stick.path("#recycle"))
    tree.write(stick.path("#recycle/old"), tree.rng(1))
    os.mkdir(f"{share}/#recycle")
    tree.write(f"{share}/#recycle/kept", tree.rng(2))
    tree.write(f"{share}/surplus", tree.rng(3))
    box.start()
    task = box.add_mirror(stick)
    stick.hook("post_mount")
    assert box.wait_run(task, 1) == "successful"
    assert sorted(os.listdir(f"{share}/#recycle")) == ["kept", "surplus"]


def test_folder_with_a_mirror_below_the_share(box):
    """Source and destination folders below the roots; what lies beside them is not touched."""
    share, stick = prepare(box, files=10, folders=2)
    stick.mount()
    os.mkdir(stick.path("DCIM"))
    tree.write(stick.path("DCIM/a.jpg"), tree.rng(1))
    os.makedirs(share + "/in/box")
    tree.write(share + "/beside.txt", tree.rng(2))
    tree.write(share + "/in/box/surplus.txt", tree.rng(3))
    box.start()
    task = box.add_mirror(stick, folder="/in/box", usb_folder="/DCIM")
    stick.hook("post_mount")
    assert box.wait_run(task, 1) == "successful"
    assert os.listdir(share + "/in/box") == ["a.jpg"]
    assert os.path.exists(share + "/beside.txt")


def test_a_device_is_ejected_after_its_run(box):
    """With eject_when_task_done the device is unmounted when the run has ended."""
    share, stick = prepare(box, files=10, folders=2)
    stick.mount()
    box.start()
    task = box.add_mirror(stick, eject=True)
    stick.hook("post_mount")
    wait_until(lambda: not os.path.ismount(stick.mountpoint), 60, what="the eject")
    stick.mounted = False
    assert box.log.expect("Eject USB for usb")
    stick.hook("pre_unmount")
    assert box.status(task) == "unmounted"
    assert len(os.listdir(share)) > 0


def test_a_missing_source_folder_fails_the_run(box):
    """A source folder that is not there gives "failed" with its code, and nothing is removed."""
    share, stick = prepare(box, files=5, folders=1)
    tree.write(share + "/precious", tree.rng(1))
    stick.mount()
    box.start()
    task = box.add_mirror(stick, usb_folder="/not-there")
    stick.hook("post_mount")
    assert box.wait_run(task, 1) == "failed"
    assert box.task(task)["error_code"] & 0xFFFFFFFF == (-22) & 0xFFFFFFFF
    assert os.path.exists(share + "/precious")
    assert wait_until(box.notified) == ["FERRIXError|Mirror|-22"]
    rows = box.log_rows("description_id = 103")
    assert rows == [(103, '["Mirror"]', -22)]


def test_entries_are_loaded_for_devices_mounted_before_the_start(box):
    """At its start the daemon loads what is mounted already, but runs nothing."""
    share, stick = prepare(box, files=5, folders=1)
    stick.mount()
    box.start()
    task = box.add_mirror(stick)
    box.stop()
    box.start()
    assert box.status(task) == "initial"
    assert os.listdir(share) == []
    wire.request({"action": "list_entry"})
    assert box.log.expect("usb_share_path")


def test_a_locked_share_is_not_written_to(box):
    """A task whose share is locked stays idle when its device is plugged in."""
    os.makedirs("/volume1/photos")
    share, stick = prepare(box, volume_share={"mount_point": "yes"}, files=5, folders=1)
    stick.mount()
    box.start()
    task = box.add_mirror(stick)
    stick.hook("post_mount")
    assert box.log.expect(f"Task '{task}' is not runnable")
    assert box.task(task)["is_task_runnable"] == 0
    assert os.listdir(share) == []


def test_a_removed_task_is_gone(box):
    """remove_task takes rows, folder and schedule away, also while the task runs."""
    share, stick = prepare(box, files=400, folders=20)
    stick.mount()
    box.start()
    task = box.add_mirror(stick)
    stick.hook("post_mount")
    box.wait_status(task, "copying")
    answer = box.ask("remove_task", task_id=task)
    assert "error" not in answer, answer
    assert box.task(task) is None
    assert not os.path.exists(f"/volume1/@Ferrix/task/{task}")
    again = box.add_mirror(stick)
    assert again != task
    stick.hook("post_mount")
    wait_until(lambda: box.task(again)["latest_finish_time"] > 0, 120)
    equal(stick, share)


def test_filters_of_a_task(box):
    """Filters set over the socket are read back, and decide what is copied and removed."""
    share, stick = prepare(box, files=0, folders=0)
    stick.mount()
    rng = tree.rng(1)
    os.makedirs(stick.path("keep/private"))
    for name in ("a.jpg", "b.TXT", "keep/c.jpg", "keep/private/d.jpg", "e.tmp"):
        tree.write(stick.path(name), rng)
    tree.write(share + "/old.tmp", rng)
    tree.write(share + "/old.jpg", rng)
    box.start()
    task = box.add_mirror(stick)
    lists = {"custom_name": ["mine"], "custom_ext": [], "black_name": ["private"],
             "black_ext": ["tmp", "txt"], "white_name": ["*"], "white_ext": ["jpg"]}
    answer = box.ask("set_filter_setting", task_id=task, **lists)
    assert answer == {"ack": "ok"}
    answer = box.ask("get_filter_setting", task_id=task)
    assert {key: answer[key] for key in lists} == lists and answer["id"] == task
    incomplete = {key: value for key, value in lists.items() if key != "white_ext"}
    answer = box.ask("set_filter_setting", task_id=task, **incomplete)
    assert (answer["error_code"], answer["error"]) == (11, "Failed to WriteFilterSetting")
    for bad in ("", "x" * 2000):
        answer = box.ask("set_filter_setting", task_id=task, **{**lists, "white_name": [bad]})
        assert answer["error_code"] == 11
    assert {key: box.ask("get_filter_setting", task_id=task)[key] for key in lists} == lists
    stick.hook("post_mount")
    assert box.wait_run(task, 1) == "successful"
    assert sorted(os.listdir(share)) == ["a.jpg", "keep", "old.tmp"]
    assert os.listdir(share + "/keep") == ["c.jpg"]


def test_refusals_of_add_and_remove(box):
    """Each refusal of add_task and remove_task with its code and text."""
    box.add_share("photos")
    os.makedirs("/volume1/photos/a/b")
    os.makedirs("/volume1/photos/ab")
    stick, other = box.add_device("stick"), box.add_device("other")
    stick.mount()
    other.mount()
    box.start()

    def refused(answer, code, text):
        assert (answer.get("error_code"), answer.get("error")) == (code, text), answer
        assert answer["ack"] == "ok"

    refused(box.ask("add_task", usb_share_path=stick.mountpoint), 1, "Invalid parameter")
    refused(box.ask("remove_task"), 1, "Invalid parameter")
    refused(box.ask("remove_task", task_id=99), 6, "Task id does not exist")
    task = box.add_mirror(stick, folder="/a")
    refused(box.ask("add_task", usb_share_path=stick.mountpoint, uuid=stick.uuid, task_type=1,
                    hub_share_name="photos", hub_folder_path="/ab"),
            3, "USB info has already existed")
    refused(box.ask("add_task", usb_share_path=other.mountpoint, uuid=other.uuid, task_type=1,
                    hub_share_name="photos", hub_folder_path="/a/b"),
            9, "Duplicated destination path")
    refused(box.ask("add_task", usb_share_path=other.mountpoint, uuid=other.uuid, task_type=1,
                    hub_share_name="photos", hub_folder_path="/none"),
            10, "Import destination path does not exist.")
    refused(box.ask("add_task", usb_share_path=other.mountpoint, uuid=other.uuid, task_type=1,
                    hub_share_name="no-share", hub_folder_path="/"),
            11, "Failed to resolve import destination path.")
    assert len(box.ask("list_task")["task_list"]) == 1
    second = box.add_mirror(other, folder="/ab")
    refused(box.ask("get_filter_setting", task_id=77), 11, "Failed to ReadFilterSetting")
    assert "error" not in box.ask("remove_task", task_id=task)
    assert [entry["id"] for entry in box.ask("list_task")["task_list"]] == [second]
    shutil.rmtree("/volume1/photos/ab")
    assert "error" not in box.ask("remove_task", task_id=second)
    assert box.ask("list_task")["task_list"] == []
