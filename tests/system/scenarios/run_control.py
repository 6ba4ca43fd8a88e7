"""Tasks under the user's control: run, cancel, the copy button, default tasks, settings."""
import contextlib
import fcntl
import mmap
import os
import random
import threading
import time

from ferrix import ctl, tree, wire
from ferrix.box import PACKAGE, sh, wait_until
from scenarios.default_tasks import add_default_task

FIFREEZE, FITHAW = 0xC0045877, 0xC0045878  # ioctl numbers of linux/fs.h
ENDED = "description_id IN (101, 102, 103)"


def refused(answer, code, text):
    assert (answer.get("error_code"), answer.get("error")) == (code, text), answer
    assert answer["ack"] == "ok"


def done(answer):
    assert "error" not in answer and answer["ack"] == "ok", answer
    return answer


def press_button():
    return wire.request({"notify": "post_ferrix", "type": "ferrix_hook"})


def start(box, files=60, size=None, device_mb=64, **add):
    """A stick with files, mounted, with a mirror task that nothing has run yet."""
    share = box.add_share("photos")
    stick = box.add_device("stick", "ext4", device_mb)
    stick.mount()
    rng = tree.rng(1)
    for number in range(files):
        tree.write(stick.path(f"img{number:04}"), rng, size)
    box.start()
    return share, stick, box.add_mirror(stick, **add)


def run(box, task):
    """Runs the task to its end; its status."""
    before = len(box.log_rows(ENDED))
    done(box.ask("run_task", task_id=task))
    return box.wait_run(task, before + 1)


def cancel(box, task):
    """Cancels the task: it is idle when the command returns."""
    done(box.ask("cancel_task", task_id=task))
    assert box.status(task) not in ("waiting", "copying", "canceling"), box.status(task)


def settings(task, **keys):
    """A request of settings of an import, with the three keys that each has to send."""
    return {"action": "set_task_setting", "task_id": task, "task_type": 1,
            "hub_share_name": "photos", "hub_folder_path": "/", **keys}


def same(stick, share):
    found = tree.differences(tree.listing(stick.mountpoint), tree.listing(share))
    assert not found, "\n".join(found)


def no_half_files(stick, share):
    """What stands under a final name is whole; nothing temporary is left."""
    for name in os.listdir(share):
        assert not name.startswith(".ferrix-tmp-"), name
        if os.path.isfile(f"{share}/{name}"):
            with open(f"{share}/{name}", "rb") as copy, open(stick.path(name), "rb") as source:
                assert copy.read() == source.read(), name


def test_a_task_runs_by_command(box):
    """run_task runs a task without a new plug-in; a second request while it is queued or runs
    succeeds and does not run it twice."""
    share, stick, task = start(box)
    done(box.ask("run_task", task_id=task))
    done(box.ask("run_task", task_id=task))
    assert box.wait_run(task, 1) == "successful"
    same(stick, share)
    time.sleep(6)
    assert len(box.log_rows(ENDED)) == 1
    assert box.log.expect(f"TaskEventManager: task '{task}' is already in")
    assert run(box, task) == "successful"


def test_refusals_of_run_and_cancel(box):
    """Each refusal of run_task and cancel_task with its code and text."""
    os.makedirs("/volume1/locked")
    share, stick, task = start(box, files=2)
    refused(box.ask("run_task"), 1, "Invalid parameter")
    refused(box.ask("cancel_task"), 1, "Invalid parameter")
    refused(box.ask("run_task", task_id=99), 11, "Task is not runnable")
    refused(box.ask("cancel_task", task_id=99), 8, "Task does not match")
    stick.unplug()
    refused(box.ask("run_task", task_id=task), 11, "Task is not runnable")
    refused(box.ask("cancel_task", task_id=task), 8, "Task does not match")
    stick.mount()
    box.add_share("locked", mount_point="yes")
    other = box.add_device("other")
    other.mount()
    locked = box.add_mirror(other, share="locked")
    refused(box.ask("run_task", task_id=locked), 11, "Task is not runnable")
    cancel(box, locked)  # it has an entry: nothing to do, with success
    assert box.status(locked) == "unmounted"
    assert os.listdir(share) == []


def size_of_open_copy(pid, share):
    """The size of the file that the daemon is writing below `share`; 0 when there is none."""
    sizes = [0]
    for number in os.listdir(f"/proc/{pid}/fd"):
        with contextlib.suppress(OSError):
            path = f"/proc/{pid}/fd/{number}"
            if os.readlink(path).startswith(share + "/") and os.path.isfile(path):
                sizes.append(os.stat(path).st_size)
    return max(sizes)


def test_a_task_is_cancelled_while_it_copies_a_large_file(box):
    """A cancel in the middle of a large file leaves no half file, and the task runs again at once.
    The destination is frozen when some of the file is written, until the cancel is on its way."""
    size = 400 << 20
    share, stick, task = start(box, files=0, device_mb=500)
    sh("truncate", "-s", "700M", "/tmp/destination.img")
    sh("mkfs.ext4", "-q", "-F", "/tmp/destination.img")
    sh("mount", "-o", "loop", "/tmp/destination.img", share)
    os.rmdir(share + "/lost+found")
    with open(stick.path("big"), "wb") as big:
        for number in range(size >> 20):
            big.write(bytes([number % 251]) * (1 << 20))
    sh("sync")
    folder = os.open(share, os.O_RDONLY)
    done(box.ask("run_task", task_id=task))
    wait_until(lambda: size_of_open_copy(box.daemon_pid, share) > 1 << 20, 60, 0.0005,
               "the first bytes of the copy")
    fcntl.ioctl(folder, FIFREEZE, 0)
    try:
        written = size_of_open_copy(box.daemon_pid, share)
        assert 0 < written < size, written
        assert box.task(task)["copy_file_path"] == stick.path("big")
        canceller = threading.Thread(target=cancel, args=(box, task))
        canceller.start()
        assert box.log.expect(f"Ferrixd: AbortTask '{task}'")
        assert canceller.is_alive()
    finally:
        fcntl.ioctl(folder, FITHAW, 0)
    begin = time.monotonic()
    canceller.join()
    assert time.monotonic() - begin < 10
    assert os.listdir(share) == [] and size_of_open_copy(box.daemon_pid, share) == 0
    answer = box.task(task)
    assert answer["task_status"] == "failed" and answer["copy_file_path"] == ""
    assert answer["error_code"] & 0xFFFFFFFF == (-1) & 0xFFFFFFFF
    assert box.log_rows(ENDED) == [(102, '["Mirror"]', 0)]
    assert run(box, task) == "successful"
    same(stick, share)
    os.close(folder)
    box.stop()
    sh("umount", share)


def test_a_task_is_cancelled_while_it_scans(box):
    """A cancel in the middle of thousands of folders; the next run completes them."""
    share, stick, task = start(box, files=0)
    for number in range(3000):
        os.makedirs(stick.path(f"d{number // 50}/s{number}"))
    tree.write(stick.path("d59/s2999/last"), tree.rng(1))
    mark = box.log.mark()
    done(box.ask("run_task", task_id=task))
    wait_until(lambda: sum("scaning directory" in line for line in box.log.since(mark)) > 300,
               60, 0.05, "some folders to be scanned")
    cancel(box, task)
    assert not os.path.exists(share + "/d59/s2999/last")
    mark = box.log.mark()
    time.sleep(2)
    assert box.log.lacks("scaning directory", mark), "the workers went on"
    assert run(box, task) == "successful"
    same(stick, share)


def test_a_task_is_cancelled_while_it_waits(box):
    """A task in the queue behind another one is cancelled; the other one is not disturbed."""
    share, stick, task = start(box, files=150, size=1 << 20, device_mb=300, folder="/")
    box.add_share("second")
    other = box.add_device("other")
    other.mount()
    tree.write(other.path("a"), tree.rng(1))
    behind = box.add_mirror(other, share="second", name="Behind")
    done(box.ask("run_task", task_id=task))
    box.wait_status(task, "copying")
    done(box.ask("run_task", task_id=behind))
    assert box.status(behind) == "waiting"
    cancel(box, behind)
    assert box.status(behind) == "initial"
    assert box.wait_run(task, 1) == "successful"
    same(stick, share)
    assert os.listdir("/volume1/second") == []
    assert run(box, behind) == "successful"
    assert os.listdir("/volume1/second") == ["a"]


def test_a_task_is_cancelled_while_it_retries(box):
    """A cancel during the wait before another try: the file, which the device cannot read, is not
    tried again."""
    share = box.add_share("photos")
    stick = box.add_device("stick", "btrfs", 320)
    stick.mount()
    content = b"spoilt on the medium " * 5000
    with open(stick.path("spoilt"), "wb") as spoilt:
        spoilt.write(content)
    tree.write(stick.path("good"), tree.rng(1))
    stick.unmount()
    with open(stick.loop, "r+b") as medium, mmap.mmap(medium.fileno(), 320 << 20) as data:
        place = data.find(content[:4096])
        data[place:place + 6] = b"SPOILT"
    stick.mount()
    box.start()
    task = box.add_mirror(stick)
    done(box.ask("run_task", task_id=task))
    wait_until(lambda: box.log.has("HandleAction (1)"), 60, 0.05, "a retry")
    cancel(box, task)
    assert box.status(task) == "failed"
    mark = box.log.mark()
    time.sleep(5)
    assert box.log.lacks("FileProcessor (1): Copy", mark), "tried again"
    assert "spoilt" not in os.listdir(share)
    os.unlink(stick.path("spoilt"))
    assert run(box, task) == "successful"
    same(stick, share)


def run_and_cancel(box, times):
    """Starts and cancels a task at a random moment, again and again; every now and then its copy is
    taken away, so that there is always something to do."""
    share, stick, task = start(box, files=300, size=20000)
    box.add_share("second")
    idle = box.add_device("idle")
    idle.mount()
    other = box.add_mirror(idle, share="second")
    rng = random.Random(times)
    stages = {"copying": 0, "waiting": 0}
    for number in range(times):
        if number % 20 == 0:
            sh("find", share, "-mindepth", "1", "-delete")
        done(box.ask("run_task", task_id=task))
        # The worker looks for tasks every five seconds only; a pause makes it look at once.
        done(box.ask("cancel_task", task_id=other))
        time.sleep(rng.random() * 0.3)
        stage = box.status(task)
        stages[stage] = stages.get(stage, 0) + 1
        cancel(box, task)
        no_half_files(stick, share)
    assert stages["copying"] > times // 10, stages
    assert run(box, task) == "successful"
    same(stick, share)
    assert box.status(other) == "initial"


def test_a_task_is_run_and_cancelled_again_and_again(box):
    """Two hundred times run and cancelled at random moments; then it runs to a good end."""
    run_and_cancel(box, 200)


def test_a_task_is_run_and_cancelled_a_thousand_times(box):
    """The same, a thousand times."""
    run_and_cancel(box, 1000)


test_a_task_is_run_and_cancelled_a_thousand_times.long = True


def test_the_destination_is_changed_during_a_run(box):
    """A run keeps the destination that it began with, whole; the next one takes the new one."""
    share, stick, task = start(box, files=150, size=1 << 20, device_mb=300)
    os.makedirs(share + "/old")
    os.makedirs(share + "/new")
    done(wire.request(settings(task, hub_folder_path="/old")))
    done(box.ask("run_task", task_id=task))
    wait_until(lambda: len(os.listdir(share + "/old")) > 10, 60, 0.01)
    done(wire.request(settings(task, hub_folder_path="/new", task_name="New name")))
    answer = box.ask("get_task_setting", task_id=task)
    assert (answer["destination_path"], answer["task_name"]) == ("/photos/new", "New name")
    assert box.wait_run(task, 1) == "successful"
    same(stick, share + "/old")
    assert os.listdir(share + "/new") == []
    assert run(box, task) == "successful"
    same(stick, share + "/new")
    rows = box.log_rows("description_id IN (10, 11)")
    assert (10, '["Mirror","New name"]', 0) in rows and (11, '["New name"]', 0) in rows


def test_settings_race_runs(box):
    """Two clients change settings without pause while a task runs again and again: every run ends
    well, and the settings are those that were sent last."""
    share, stick, task = start(box, files=40)
    stop = threading.Event()
    failures = []

    def change(make):
        number = 0
        while not stop.is_set():
            number += 1
            answer = wire.request(make(number))
            if "error" in answer:
                failures.append(answer)

    clients = [
        threading.Thread(target=change, args=(lambda n: settings(
            task, task_name=f"Name {n}", conflict_policy=n % 3, max_version_count=n),)),
        threading.Thread(target=change, args=(lambda n: {
            "action": "set_trigger_time_setting", "task_id": task, "schedule_json_str": "{}",
            "run_when_plug_in": n % 2, "eject_when_task_done": False},))]
    for client in clients:
        client.start()
    try:
        for number in range(6):
            tree.write(stick.path(f"new{number}"), tree.rng(number))
            before = len(box.log_rows(ENDED))
            done(box.ask("run_task", task_id=task))
            wait_until(lambda: len(box.log_rows(ENDED)) > before, 60, 0.1, "the end of the run")
    finally:
        stop.set()
        for client in clients:
            client.join()
    assert not failures, failures[:3]
    assert {row[0] for row in box.log_rows(ENDED)} == {101}
    same(stick, share)
    done(wire.request(settings(task, task_name="The last", max_version_count=7)))
    answer = box.ask("get_task_setting", task_id=task)
    assert (answer["task_name"], answer["max_version_count"]) == ("The last", 7)


def test_the_copy_button(box):
    """The button runs every task of every mounted device, and nothing when none is mounted."""
    box.add_share("photos")
    sticks, tasks = [], []
    box.start()
    assert press_button() == {"ack": "ok"}
    assert box.log.expect("HandleFerrix: ferrix button press")
    for name in ("one", "two", "three"):
        os.makedirs(f"/volume1/photos/{name}")
        stick = box.add_device(name)
        stick.mount()
        tree.write(stick.path(name + ".jpg"), tree.rng(1))
        sticks.append(stick)
        tasks.append(box.add_mirror(stick, folder="/" + name, name=name))
    sticks[2].unplug()
    assert press_button() == {"ack": "ok"}
    wait_until(lambda: len(box.log_rows(ENDED)) == 2, 60, 0.1, "two runs")
    for name, expected in (("one", ["one.jpg"]), ("two", ["two.jpg"]), ("three", [])):
        assert os.listdir(f"/volume1/photos/{name}") == expected
    assert [box.status(task) for task in tasks] == ["successful", "successful", "unmounted"]
    # The name of another hook's kind is as good; an unknown kind is none.
    for kind, runs in (("volume_hook", 4), ("other_hook", 4)):
        assert wire.request({"notify": "post_ferrix", "type": kind}) == {"ack": "ok"}
        wait_until(lambda: len(box.log_rows(ENDED)) == runs, 60, 0.1, f"{runs} runs")
    time.sleep(6)
    assert len(box.log_rows(ENDED)) == 4


def front_box(box):
    """A box with default tasks and a device at its front port, not plugged in yet."""
    box.add_share("photos")
    os.makedirs("/etc.defaults", exist_ok=True)
    with open("/etc.defaults/keldinfo.conf", "w", encoding="ascii") as info:
        info.write('ferrix="yes"\n')
    front = box.add_device("front", "ext4", 300)
    box.extra_conf = f"[location]\nfront_usb = {os.path.basename(front.loop)}\n"
    box.write_host_conf()
    return front


def test_the_copy_button_and_the_default_task(box):
    """The button runs the default task for a device that has none of its own; with the default task
    off, or the device at the rear, it runs nothing."""
    front = front_box(box)
    front.mount()
    tree.write(front.path("a.jpg"), tree.rng(1))
    box.start()
    task = add_default_task("photos")
    done(box.ask("set_trigger_time_setting", task_id=task, run_when_plug_in=False,
                 eject_when_task_done=False))
    done(box.ask("disable_task", task_id=task))
    front.hook("post_mount")
    press_button()
    assert box.status(task) == "disabled"
    refused(box.ask("run_task", task_id=task), 11, "Task is not runnable")
    done(box.ask("enable_task", task_id=task))
    assert box.status(task) == "initial"
    press_button()
    assert box.wait_run(task, 1) == "successful"
    assert os.listdir("/volume1/photos") == ["a.jpg"]
    assert [device["task_id"] for device in ctl.read("device", "list")] == [task]


def test_a_default_task_is_switched_off_and_on(box):
    """Off during a run: the run ends, the task serves nothing; on again without a new plug-in it is
    there and completes. Both commands leave a user's task alone, with success."""
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
    done(box.ask("disable_task", task_id=task))
    count = len(os.listdir("/volume1/photos"))
    assert box.status(task) == "disabled" and count < 150
    no_half_files(front, "/volume1/photos")
    front.hook("post_mount")
    time.sleep(7)
    assert len(os.listdir("/volume1/photos")) == count
    done(box.ask("disable_task", task_id=task))
    done(box.ask("enable_task", task_id=task))
    done(box.ask("enable_task", task_id=task))
    assert run(box, task) == "successful"
    same(front, "/volume1/photos")
    rows = [row[0] for row in box.log_rows("description_id IN (2, 3)")]
    assert rows == [3, 3, 2, 2]
    rear = box.add_device("rear")
    rear.mount()
    box.add_share("own")
    own = box.add_mirror(rear, share="own", name="Own")
    done(box.ask("disable_task", task_id=own))
    done(box.ask("enable_task", task_id=own))
    done(box.ask("enable_task", task_id=99))
    assert box.status(own) == "initial"
    refused(box.ask("enable_task"), 1, "Invalid parameter")
    refused(box.ask("disable_task"), 1, "Invalid parameter")


def test_an_enabled_default_task_needs_its_destination(box):
    """A default task without a share is refused until its settings name one."""
    front_box(box)
    box.start()
    task = add_default_task("")
    done(box.ask("disable_task", task_id=task))
    refused(box.ask("enable_task", task_id=task), 11, "Failed to resolve import destination path.")
    assert box.status(task) == "disabled"
    done(wire.request(settings(task)))
    done(box.ask("enable_task", task_id=task))
    assert box.task(task)["destination_path"] == "/photos"
    assert box.status(task) == "unmounted"


def test_the_texts_of_the_state_of_a_task(box):
    """What a client reads in the life of a task: initial, waiting, copying, successful, failed,
    unmounted, disabled. A task that is being cancelled is marked so until its workers let go."""
    front = front_box(box)
    front.mount()
    os.makedirs("/volume1/photos/own")
    rng = tree.rng(1)
    for number in range(240):
        tree.write(front.path(f"img{number:04}"), rng, 1 << 20)
    box.start()
    default = add_default_task("photos")
    assert box.status(default) == "unmounted"
    done(box.ask("disable_task", task_id=default))
    assert box.status(default) == "disabled"
    task = box.add_mirror(front, folder="/own")
    assert box.status(task) == "initial"
    done(box.ask("run_task", task_id=task))
    assert box.status(task) in ("waiting", "copying")
    entry = wait_until(lambda: (e := box.task(task))["copy_file_path"].startswith(front.mountpoint)
                       and e, 20, 0.002)
    assert entry["task_status"] == "copying"
    mark = box.log.mark()
    cancel(box, task)
    assert box.log.has(f"Set task '{task}' state (2)", mark)
    assert box.log.has(f"Set task '{task}' state (0)", mark)
    assert box.status(task) == "failed"
    time.sleep(1)  # the worker has looked, and looks again in five seconds
    done(box.ask("run_task", task_id=task))
    assert box.status(task) == "waiting"
    box.wait_run(task, 2)
    assert box.status(task) == "successful"
    front.unplug()
    assert box.status(task) == "unmounted"
    refused(box.ask("get_task_setting", task_id=99), 6, "Task id does not exist")
    assert box.ask("get_task_setting", task_id=task).keys() == {*box.task(task), "ack"}


def test_a_task_is_told_to_eject(box):
    """The trigger setting takes effect on the device that is plugged in: the next run ejects it.
    A request with one key clears the other flag until the next plug-in; the row keeps it."""
    share, stick, task = start(box, files=5, eject=False, run_when_plug_in=True)
    assert run(box, task) == "successful"
    assert os.path.ismount(stick.mountpoint)
    answer = done(box.ask("set_trigger_time_setting", task_id=task, eject_when_task_done=True,
                          schedule_enabled=False, schedule_json_str="{}"))
    assert answer["schedule_id"] == box.task(task)["schedule_id"]
    entry = box.task(task)
    assert (entry["run_when_plug_in"], entry["eject_when_task_done"]) == (1, 1)
    box.ask("list_entry")
    assert box.log.expect("\trun_when_plug_in: 0")
    done(box.ask("run_task", task_id=task))
    wait_until(lambda: not os.path.ismount(stick.mountpoint), 60, what="the eject")
    stick.mounted = False
    stick.hook("pre_unmount")
    stick.mount()
    stick.hook("post_mount")  # runs, by what the row has kept, and ejects
    wait_until(lambda: not os.path.ismount(stick.mountpoint), 60, what="the second eject")
    stick.mounted = False
    refused(box.ask("set_trigger_time_setting"), 1, "Invalid parameter")
    refused(box.ask("set_trigger_time_setting", task_id=99), 6, "Task id does not exist")
    refused(box.ask("set_trigger_time_setting", task_id=task, schedule_json_str="{not json"),
            11, "Failed to UpdateScheduleContent")


def test_settings_are_stored_and_refused(box):
    """Settings survive a restart; each refusal with its code and text; a rename of an unplugged
    task does not reach its timetable."""
    share, stick, task = start(box, files=2)
    os.makedirs(share + "/in")
    done(wire.request(settings(task, hub_folder_path="/in", task_name="New", conflict_policy=1,
                               max_version_count=5, rename_photo_video=True)))
    expected = {"task_name": "New", "conflict_policy": 1, "max_version_count": 5,
                "rename_photo_video": 1, "destination_path": "/photos/in"}
    box.stop()
    box.start()
    answer = box.ask("get_task_setting", task_id=task)
    assert {key: answer[key] for key in expected} == expected
    refused(box.ask("set_task_setting", task_id=task, task_name="x"), 11,
            "Failed to resolve import destination path.")
    refused(wire.request(settings(task, hub_folder_path="/none")), 10,
            "Import destination path does not exist.")
    refused(wire.request(settings(task, hub_folder_path="/../../etc")), 11,
            "FSStat import path failed.")
    refused(wire.request(settings(task, task_type=2, hub_folder_path="/../../etc")), 1,
            "Invalid parameter")
    refused(wire.request(settings(99, task_type=2)), 6, "Task id does not exist")
    done(wire.request(settings(task, hub_folder_path="/in", task_name="")))
    assert box.task(task)["task_name"] == "New"
    stick.unplug()
    done(wire.request(settings(task, hub_folder_path="/in", task_name="Unplugged")))
    timetables = sh("grep", "-r", "", "/var/lib/keld/sched")
    assert "New" in timetables and "Unplugged" not in timetables
    stick.plug()
    assert run(box, task) == "successful"
    same(stick, share + "/in")


def test_the_beep_is_switched_in_memory(box):
    """set_global_setting is answered and writes no file; a missing key is no error."""
    box.start()
    with open(f"{PACKAGE}/etc/setting.conf", encoding="ascii") as conf:
        before = conf.read()
    done(box.ask("set_global_setting", beep_on_task_start_end=False))
    done(box.ask("set_global_setting"))
    with open(f"{PACKAGE}/etc/setting.conf", encoding="ascii") as conf:
        assert conf.read() == before


def test_a_lowered_number_of_versions_prunes_at_once(box):
    """Lowering max_version_count of a version task takes effect without a run; for a device that is
    away it waits for the next one."""
    share, stick, task = start(box, files=1, copy_strategy=1, enable_rotation=True)
    versions = [f"Ferrix Copy_2024-03-0{day}_120000" for day in range(1, 7)]
    for version in versions:
        os.makedirs(f"{share}/{version}/folder")
        tree.write(f"{share}/{version}/folder/file", tree.rng(1))
    keep = {"enable_rotation": True, "rotation_policy": 1}
    done(wire.request(settings(task, max_version_count=4, **keep)))
    assert sorted(os.listdir(share)) == versions[2:]
    assert len(box.log_rows("description_id = 104")) == 2
    stick.unplug()
    done(wire.request(settings(task, max_version_count=2, **keep)))
    assert sorted(os.listdir(share)) == versions[2:]
    stick.plug()
    box.wait_run(task, 1)
    assert len(os.listdir(share)) == 2 and versions[5] in os.listdir(share)
