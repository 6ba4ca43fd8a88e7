"""Timetables: the scheduler's store, its cron file, and a real cron that runs an entry."""
import os
import re
import subprocess
import time

from ferrix.box import PACKAGE, wait_until

CRON_FILE = "/etc/cron.d/keld-sched"


def test_a_timetable_fires(box):
    """An enabled timetable stands in the cron file, cron runs its command, and it goes with the
    task. A small program stands in for the notifier."""
    box.add_share("photos")
    stick = box.add_device("stick")
    stick.mount()
    box.start()
    os.makedirs(f"{PACKAGE}/target/bin", exist_ok=True)
    program = f"{PACKAGE}/target/bin/ferrix-notifier"
    with open(program, "w", encoding="ascii") as out:
        out.write('#!/bin/sh\necho "$@" >> /tmp/fired\n')
    os.chmod(program, 0o755)
    now = time.localtime(time.time() + 75)
    schedule = ('{"date_type": 0, "week_day": "", "repeat_date": 0, '
                f'"hour": {now.tm_hour}, "minute": {now.tm_min}}}')
    task = box.add_mirror(stick, schedule_enabled=True, schedule_json_str=schedule)
    with open(CRON_FILE, encoding="utf-8") as cron:
        text = cron.read()
    assert re.search(rf"^{now.tm_min} {now.tm_hour} \S+ \S+ \S+ root {program} "
                     rf"--execute-task {task}$", text, re.M), text
    assert os.stat(CRON_FILE).st_mode & 0o7777 == 0o644
    os.makedirs("/run/crond", exist_ok=True)
    cron = subprocess.Popen(["/usr/sbin/cron", "-f"])
    try:
        wait_until(lambda: os.path.exists("/tmp/fired"), 150, 1, what="cron to run the entry")
    finally:
        cron.terminate()
        cron.wait()
    with open("/tmp/fired", encoding="ascii") as fired:
        assert fired.read() == f"--execute-task {task}\n"
    assert "error" not in box.ask("remove_task", task_id=task)
    with open(CRON_FILE, encoding="utf-8") as cron_file:
        assert "--execute-task" not in cron_file.read()


test_a_timetable_fires.long = True


def test_a_timetable_that_is_no_json_is_refused(box):
    """Bad schedule text makes add_task fail with its code; the rows stay until remove_task."""
    box.add_share("photos")
    stick = box.add_device("stick")
    stick.mount()
    box.start()
    task = box.add_mirror(stick)
    box.ask("remove_task", task_id=task)
    try:
        box.add_mirror(stick, schedule_json_str="{not json")
    except AssertionError as refusal:
        assert "Failed to CreateSchedule" in str(refusal)
    else:
        raise AssertionError("accepted")
    left = box.ask("list_task")["task_list"]
    assert [entry["schedule_id"] for entry in left] == [(1 << 64) - 1]
    assert "error" not in box.ask("remove_task", task_id=left[0]["id"])
    assert box.ask("list_task")["task_list"] == []


def test_names_cannot_break_the_cron_file(box):
    """A task name with newlines and percent signs does not get a line into the cron file."""
    box.add_share("photos")
    stick = box.add_device("stick")
    stick.mount()
    box.start()
    schedule = '{"date_type": 0, "week_day": "1,3", "repeat_date": 0, "hour": 3, "minute": 7}'
    name = "x\n* * * * * root touch /tmp/owned\n%s"
    task = box.add_mirror(stick, name=name, schedule_enabled=True, schedule_json_str=schedule)
    with open(CRON_FILE, encoding="utf-8") as cron:
        lines = [line for line in cron.read().splitlines() if line and line[0] not in "#"]
    commands = [line for line in lines if re.match(r"[\d*]", line)]
    assert len(commands) == 1 and commands[0].endswith(f"--execute-task {task}"), lines
    assert "touch" not in "".join(lines)
    assert box.task(task)["task_name"] == name
