"""Devices at a front port without a task of their own are served by a default task."""
import contextlib
import os
import sqlite3

from ferrix import tree
from ferrix.box import wait_until


def add_default_task(share):
    """The rows as the installer makes them; a mirror, so that it can run."""
    with contextlib.closing(sqlite3.connect("/volume1/@Ferrix/db/task-db.sqlite")) as db, db:
        db.execute("INSERT INTO usb_info_table (uuid, run_when_plug_in, eject_when_task_done,"
                   " producer, product) VALUES ('FERRIX_DEFAULT_USB_UUID', 1, 0,"
                   " 'FERRIX_DEFAULT_PRODUCER', 'FERRIX_DEFAULT_PRODUCT')")
        usb = db.execute("SELECT last_insert_rowid()").fetchone()[0]
        db.execute("INSERT INTO task_info_table (usb_id, is_enable, task_name, task_type,"
                   " usb_folder_path, hub_folder_path, hub_share_name, last_copied_time,"
                   " copy_strategy, keep_dir_structure, smart_create_date_dir,"
                   " rename_photo_video, remove_src_file, conflict_policy, enable_rotation,"
                   " max_version_count, rotation_policy, schedule_id, error) VALUES"
                   " (?, 1, 'Default Ferrix', 1, '/', '/', ?, 0, 2, 1, 0, 0, 0, 1, 0, 256, 1, -1, 0)",
                   (usb, share))
        task = db.execute("SELECT last_insert_rowid()").fetchone()[0]
    folder = f"/volume1/@Ferrix/task/{task}"
    os.makedirs(folder)
    for name, text in (
            ("user.config", '{"user_defined_extensions":[],"user_defined_names":[]}\n'),
            ("blacklist.filter", '[Version]\nmajor = 1\nminor = 0\n\n[Common]\n'
                                 'black_name = ".KeldoranFerrix.config"\n'),
            ("whitelist.filter", '[Version]\nmajor = 1\nminor = 0\n\n[Common]\nwhite_name = "*"\n\n'
                                 '[File]\nwhite_ext = "*"\n')):
        with open(f"{folder}/{name}", "w", encoding="ascii") as out:
            out.write(text)
    return task


def test_a_front_port_device_is_served_by_the_default_task(box):
    """An unknown device at a front port runs the default task; its own task takes over, and when
    that is removed the default task serves it again. A rear port gets nothing."""
    share = box.add_share("photos")
    box.add_share("own")
    os.makedirs("/etc.defaults", exist_ok=True)
    with open("/etc.defaults/keldinfo.conf", "w", encoding="ascii") as info:
        info.write('ferrix="yes"\n')
    front, rear = box.add_device("front"), box.add_device("rear")
    box.extra_conf = f"[location]\nfront_usb = {os.path.basename(front.loop)}\n"
    box.write_host_conf()
    box.start()
    task = add_default_task("photos")
    rear.plug()
    assert box.log.expect("NO matched usb info for")
    front.mount()
    tree.write(front.path("a.jpg"), tree.rng(1))
    front.hook("post_mount")
    assert box.wait_run(task, 1) == "successful"
    assert os.listdir(share) == ["a.jpg"]
    answer = box.task(task)
    assert answer["is_default_task"] == 1
    refusal = box.ask("remove_task", task_id=task)
    assert refusal["error"] == "Default Task can not be removed"

    own = box.add_mirror(front, share="own", name="Own")
    assert box.status(task) == "unmounted"
    front.hook("post_mount")
    wait_until(lambda: box.task(own)["latest_finish_time"] > 0, 60)
    assert os.listdir("/volume1/own") == ["a.jpg"]
    assert "error" not in box.ask("remove_task", task_id=own)
    assert box.status(task) == "successful"
    assert box.task(task)["is_usb_mounted"] == 1
