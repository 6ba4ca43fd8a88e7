"""The control side of the service: a repository of an older release is lifted at the start, the
service is stopped and moved."""
import contextlib
import glob
import os
import shutil
import signal
import sqlite3
import subprocess
import time

from ferrix.box import PACKAGE, sh, wait_until

TASK_DB = "/volume1/@Ferrix/db/task-db.sqlite"
OLD_TASK_SCHEMA = """
PRAGMA journal_mode = WAL;
PRAGMA recursive_triggers = true;
CREATE TABLE config_table ( key TEXT PRIMARY KEY, value TEXT NOT NULL );
INSERT INTO config_table VALUES ('version', 1);
CREATE TABLE usb_info_table ( id INTEGER PRIMARY KEY AUTOINCREMENT, uuid TEXT UNIQUE NOT NULL,
    run_when_plug_in INTEGER NOT NULL, eject_when_task_done INTEGER NOT NULL,
    producer TEXT NOT NULL, product TEXT NOT NULL );
CREATE TABLE task_info_table ( id INTEGER PRIMARY KEY AUTOINCREMENT, usb_id INTEGER NOT NULL,
    is_enable INTEGER NOT NULL, task_name TEXT NOT NULL, task_type INTEGER NOT NULL,
    usb_folder_path TEXT NOT NULL, hub_folder_path TEXT NOT NULL, hub_share_name TEXT NOT NULL,
    last_copied_time INTEGER NOT NULL, copy_strategy INTEGER NOT NULL,
    keep_dir_structure INTEGER NOT NULL, smart_create_date_dir INTEGER NOT NULL,
    rename_photo_file INTEGER NOT NULL, conflict_policy INTEGER NOT NULL,
    error INTEGER NOT NULL );
CREATE INDEX usb_info_table_uuid_idx on usb_info_table(uuid);
CREATE INDEX task_info_table_usb_id_idx on task_info_table(usb_id);
CREATE TRIGGER usb_info_delete_trigger AFTER DELETE ON usb_info_table BEGIN
    DELETE FROM task_info_table WHERE usb_id = OLD.id; END;
CREATE TRIGGER task_info_delete_trigger AFTER DELETE ON task_info_table BEGIN
    DELETE FROM usb_info_table WHERE id = OLD.usb_id AND
    (0 = (SELECT COUNT(*) FROM task_info_table WHERE usb_id = OLD.usb_id)); END;
"""
OLD_FILE_SCHEMA = """
PRAGMA journal_mode = WAL;
CREATE TABLE config_table ( key TEXT PRIMARY KEY, value TEXT NOT NULL );
INSERT INTO config_table VALUES ('version', 1);
CREATE TABLE file_info_table ( id INTEGER PRIMARY KEY, source_path TEXT UNIQUE NOT NULL,
    destination_path TEXT NOT NULL, file_type INTEGER NOT NULL, size INTEGER NOT NULL,
    mtime INTEGER NOT NULL );
CREATE INDEX file_info_table_src_path_idx on file_info_table(source_path);
CREATE INDEX file_info_table_dst_path_idx on file_info_table(destination_path);
"""
MIRROR, INCREMENTAL = 2, 3
FILTERS = {
    "user.config": '{"user_defined_extensions":[],"user_defined_names":[]}\n',
    "blacklist.filter": "[Version]\nmajor = 1\nminor = 0\n",
    "whitelist.filter": '[Version]\nmajor = 1\nminor = 0\n\n[Common]\nwhite_name = "*"\n',
}


def service(box, *args, check=True):
    """Runs an operation of the control side; its exit status and what it printed."""
    driver = f"{os.path.dirname(box.binaries)}/tests/service/service-driver"
    done = subprocess.run([driver, *args], check=False, text=True, timeout=120,
                          stdout=subprocess.PIPE)
    assert not check or done.returncode == 0, f"{args}: {done.returncode}"
    with contextlib.suppress(FileNotFoundError), \
            open("/run/ferrixd.pid", encoding="ascii") as pid_file:
        box.daemon_pid = int(pid_file.read())
    return done.returncode, done.stdout.strip()


def start(box):
    service(box, "start")
    # pylint: disable=protected-access
    wait_until(box._answers, 60, 0.02, "the daemon's first answer")


def enable_package():
    with open(f"{PACKAGE}/enabled", "w", encoding="ascii"):
        pass


def write_old_database(path, schema, statements):
    """Leaves the rows in the write-ahead log, as a daemon that was killed does."""
    building = f"/tmp/{os.path.basename(path)}"
    with contextlib.closing(sqlite3.connect(building, isolation_level=None)) as db:
        db.execute("PRAGMA wal_autocheckpoint = 0")
        db.executescript(schema)
        for statement, values in statements:
            db.execute(statement, values)
        os.makedirs(os.path.dirname(path), exist_ok=True)
        for part in ("", "-wal"):
            shutil.copy(building + part, path + part)
            os.chmod(path + part, 0o600)
    for left in glob.glob(building + "*"):
        os.unlink(left)
    assert os.path.getsize(path + "-wal") > 0


def add_old_task(box, device, task, name, strategy, files=()):
    """A device with one task, as rows of the old schema; its folder and its file database."""
    folder = f"/volume1/@Ferrix/task/{task}"
    os.makedirs(folder)
    for file, text in FILTERS.items():
        with open(f"{folder}/{file}", "w", encoding="ascii") as out:
            out.write(text)
    if strategy == INCREMENTAL:
        write_old_database(f"{folder}/file-db.sqlite", OLD_FILE_SCHEMA, [
            ("INSERT INTO file_info_table VALUES (NULL, ?, ?, 0, ?, ?)", row) for row in files])
    return [("INSERT INTO usb_info_table VALUES (?, ?, 1, 0, 'Maker', 'Stick')",
             (task, device.uuid)),
            ("INSERT INTO task_info_table VALUES (?, ?, 1, ?, 1, '/', '/', ?, 0, ?, 1, 0, 0, 2, 0)",
             (task, task, name, next(iter(box.shares)), strategy))]


def rows(database, query):
    with contextlib.closing(sqlite3.connect(database)) as db:
        return db.execute(query).fetchall()


def test_an_old_repository_is_lifted_and_its_tasks_work(box):
    """Tasks of a version 1 repository run after the upgrade, remember what they have copied, and
    can be removed with their device."""
    share = box.add_share("photos")
    mirror, camera = box.add_device("mirror"), box.add_device("camera")
    camera.mount()
    for name in ("known.jpg", "new.jpg"):
        with open(camera.path(name), "wb") as out:
            out.write(name.encode() * 100)
        os.utime(camera.path(name), (1600000000, 1600000000))
    known = ("/known.jpg", "/known.jpg", os.path.getsize(camera.path("known.jpg")), 1600000000)
    camera.unmount()
    write_old_database(TASK_DB, OLD_TASK_SCHEMA,
                       add_old_task(box, mirror, 1, "Mirror", MIRROR)
                       + add_old_task(box, camera, 2, "Camera", INCREMENTAL, [known]))
    enable_package()
    start(box)
    assert box.log.expect("UpdaterV1: task_db_version (1)")
    assert service(box, "status")[1] == "4"
    assert rows(TASK_DB, "SELECT value FROM config_table WHERE key = 'version'") == [("2",)]
    assert not glob.glob("/volume1/@Ferrix/**/*.bkp*", recursive=True)
    schedules = rows(TASK_DB, "SELECT schedule_id FROM task_info_table ORDER BY id")
    assert len(set(schedules)) == 2 and all(number > 0 for (number,) in schedules)
    with contextlib.suppress(FileNotFoundError), \
            open("/etc/cron.d/keld-sched", encoding="ascii") as cron:
        assert "--execute-task" not in cron.read(), "nobody has asked for a timetable"
    assert [t["task_name"] for t in box.ask("list_task")["task_list"]] == ["Mirror", "Camera"]

    camera.plug()
    assert box.wait_run(2, 1) == "successful"
    assert os.listdir(share) == ["new.jpg"], "the known file counts as copied"
    camera.unplug()
    mirror.mount()
    with open(mirror.path("only.txt"), "w", encoding="ascii") as out:
        out.write("mirrored")
    mirror.hook("post_mount")
    assert box.wait_run(1, 2) == "successful"
    assert os.listdir(share) == ["only.txt"]

    for task in (1, 2):
        answer = box.ask("remove_task", task_id=task)
        assert "error" not in answer, answer
        assert rows(TASK_DB, f"SELECT COUNT(*) FROM usb_info_table WHERE id = {task}") == [(0,)]
    assert box.ask("list_task")["task_list"] == []
    added = box.add_mirror(mirror)
    assert added == 3, "numbers are not given again"
    service(box, "stop")
    assert not os.path.exists("/run/ferrixd.pid")
    assert service(box, "status")[1] == "6"


def test_the_service_is_made_started_stopped_and_moved(box):
    """From no repository at all to one on a second volume, with the tasks following."""
    sh("mkdir", "-p", "/volume2")
    sh("mount", "-t", "tmpfs", "-o", "mode=755", "tmpfs", "/volume2")
    box.add_share("photos")
    box.extra_conf = "[volume /volume2]\ninternal = yes\n"
    box.write_host_conf()
    os.unlink(f"{PACKAGE}/etc/setting.conf")
    shutil.rmtree("/volume1/@Ferrix")
    os.makedirs("/etc.defaults", exist_ok=True)
    with open("/etc.defaults/keldinfo.conf", "w", encoding="ascii") as info:
        info.write('ferrix="yes"\n')
    assert service(box, "start")[0] == 0
    assert not os.path.exists("/run/ferrixd.pid"), "the package is not enabled"
    enable_package()
    start(box)
    first = box.daemon_pid
    assert [t["task_name"] for t in box.ask("list_task")["task_list"]] == ["Default Ferrix"]
    assert service(box, "start")[0] == 0
    assert box.daemon_pid == first
    assert service(box, "status")[1] == "4", "a start of what runs changes no state"
    stick = box.add_device("stick")
    stick.mount()
    task = box.add_mirror(stick)
    os.makedirs("/volume2/@Ferrix/db")
    with open("/volume2/@Ferrix/db/task-db.sqlite", "wb") as former:
        former.write(b"of former times")

    service(box, "move", "/volume1", "/volume2")
    wait_until(lambda: not os.path.exists("/volume1/@tmp/@Ferrix"), 30)
    assert not os.path.exists("/volume1/@Ferrix")
    # pylint: disable=protected-access
    wait_until(box._answers, 60, 0.02, "the daemon's first answer")
    assert box.daemon_pid != first
    assert box.task(task)["task_name"] == "Mirror"
    assert service(box, "status")[1] == "4"
    with open(f"{PACKAGE}/etc/keldpkg_conf/reg_volume", encoding="ascii") as volumes:
        assert volumes.read() == '["/volume2"]\n'
    with open("/volume2/@tmp/@Ferrix.replaced/db/task-db.sqlite", "rb") as former:
        assert former.read() == b"of former times"
    assert '"package_version" : "0037"' in service(box, "report")[1]

    service(box, "stop")
    assert service(box, "stop", check=False)[0] == 1, "there is nothing to stop"
    start(box)
    assert box.task(task)["task_name"] == "Mirror"
    box.stop()
    sh("umount", "-l", "/volume2")


def test_a_daemon_that_does_not_react_is_killed(box):
    """A daemon that takes no signal but the last one is gone after ten seconds."""
    enable_package()
    start(box)
    os.kill(box.daemon_pid, signal.SIGSTOP)
    begin = time.monotonic()
    service(box, "stop")
    assert 9 < time.monotonic() - begin < 40
    assert box.log.expect("forcelly kill daemon")
    wait_until(lambda: not box.is_running(), 20)
    assert service(box, "status")[1] == "6"
    start(box)
    assert box.ask("list_task")["ack"] == "ok"
