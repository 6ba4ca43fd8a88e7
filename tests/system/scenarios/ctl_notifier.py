"""The program that other services of the box call: the scheduler, and whoever mounts a device."""
import os
import socket
import subprocess
import time

from ferrix.box import PACKAGE, wait_until

NOTIFIER = f"{PACKAGE}/target/bin/ferrix-notifier"
DONE, REFUSED, USAGE, NOT_REACHABLE = 0, 1, 2, 3


def notify(*arguments, status=DONE):
    """Calls the notifier; what it wrote to standard error. It never writes anything else."""
    done = subprocess.run([NOTIFIER, *map(str, arguments)], check=False, text=True,
                          stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, stderr=subprocess.PIPE)
    assert (done.returncode, done.stdout) == (status, ""), (arguments, done)
    assert bool(done.stderr) == (status != DONE), done
    return done.stderr


def stick_with_a_task(box, **add):
    """A mounted stick with one file, and a mirror task that nothing has run yet."""
    share = box.add_share("photos")
    stick = box.add_device("stick")
    stick.mount()
    with open(stick.path("picture"), "w", encoding="ascii") as out:
        out.write("a picture")
    box.start()
    return share, stick, box.add_mirror(stick, **add)


def has_picture(share):
    if not os.path.exists(f"{share}/picture"):
        return False
    with open(f"{share}/picture", encoding="ascii") as copy:
        return copy.read() == "a picture"


def test_a_task_is_run_by_its_id(box):
    """--execute-task runs the task of a plugged-in device, in silence."""
    share, _, task = stick_with_a_task(box)
    notify("--execute-task", task)
    assert box.wait_run(task, 1) == "successful"
    assert has_picture(share)
    assert box.log.expect("recieve msg >>> {\"action\": \"run_task\"")
    assert any("ferrix-notifier: " in line for line in box.log.since()), "nothing in the log"


def test_a_refusal_is_told(box):
    """An unknown task and one whose device is away: status 1, and the daemon's own words."""
    _, stick, task = stick_with_a_task(box)
    assert "Task is not runnable" in notify("--execute-task", task + 1, status=REFUSED)
    stick.unplug()
    assert "Task is not runnable" in notify("--execute-task", task, status=REFUSED)
    assert box.log_rows("description_id IN (101, 102, 103)") == []


def test_without_a_daemon_nothing_answers(box):
    """Status 3 before the daemon has started, after it has ended, and when it was killed."""
    notify("--execute-task", 1, status=NOT_REACHABLE)
    box.start()
    box.stop()
    notify("--hook", "post_ferrix", "--type", "ferrix_hook", status=NOT_REACHABLE)
    box.start()
    box.kill()  # the socket's file stays
    assert "does not answer" in notify("--execute-task", 1, status=NOT_REACHABLE)


def test_a_hook_is_passed_on(box):
    """--hook post_mount makes a task run on plug-in; pre_unmount lets the device go."""
    share, stick, task = stick_with_a_task(box)
    keys = ("--type", "volume_hook", f"mountpoint={stick.mountpoint}", f"device={stick.loop}")
    notify("--hook", "post_mount", *keys)
    assert box.wait_run(task, 1) == "successful"
    assert has_picture(share)
    notify("--hook", "pre_unmount", *keys)
    stick.unmount()
    assert box.status(task) == "unmounted"


def test_the_copy_button_is_passed_on(box):
    """A hook without keys: the copy button runs the task of a plugged-in device."""
    share, _, task = stick_with_a_task(box, run_when_plug_in=False)
    notify("--hook", "post_ferrix", "--type", "ferrix_hook")
    assert box.wait_run(task, 1) == "successful"
    assert has_picture(share)


def test_a_wrong_call_does_nothing(box):
    """Wrong usage is status 2, and the daemon hears nothing of it."""
    _, _, task = stick_with_a_task(box)
    mark = box.log.mark()
    for arguments in ([], ["--execute-task"], ["--execute-task", "x"], ["--execute-task", "-1"],
                      ["--execute-task", task, "--hook", "post_ferrix", "--type", "ferrix_hook"],
                      ["--hook", "post_ferrix"], ["--hook", "post_ferrix", "--type", "a_hook"],
                      ["--hook", "post_mount", "--type", "volume_hook", "mountpoint"],
                      ["--hook", "post_mount", "--type", "volume_hook", "_action=stop"],
                      ["--unknown"]):
        notify(*arguments, status=USAGE)
    assert box.log.lacks("recieve msg >>>", mark)
    assert box.is_running()


def test_a_timetable_copies(box):
    """Cron calls the notifier at the time of a task's timetable, and the task runs."""
    share, _, task = stick_with_a_task(box)
    box.ask("remove_task", task_id=task)
    now = time.localtime(time.time() + 75)
    stick = box.devices[0]
    task = box.add_mirror(stick, schedule_enabled=True, schedule_json_str=(
        '{"date_type": 0, "week_day": "", "repeat_date": 0, '
        f'"hour": {now.tm_hour}, "minute": {now.tm_min}}}'))
    os.makedirs("/run/crond", exist_ok=True)
    cron = subprocess.Popen(["/usr/sbin/cron", "-f"])
    try:
        wait_until(lambda: has_picture(share), 150, 1, what="cron to have the task run")
    finally:
        cron.terminate()
        cron.wait()
    assert box.wait_run(task, 1) == "successful"


test_a_timetable_copies.long = True


def test_a_silent_daemon_is_not_waited_for_ever(box):
    """Something listens and never answers: status 3 after a minute."""
    with socket.socket(socket.AF_UNIX, socket.SOCK_STREAM) as listener:
        listener.bind("/tmp/ferrix-socket")
        listener.listen()
        assert "does not answer" in notify("--execute-task", 1, status=NOT_REACHABLE)
    os.unlink("/tmp/ferrix-socket")
    assert not box.is_running()


test_a_silent_daemon_is_not_waited_for_ever.long = True
