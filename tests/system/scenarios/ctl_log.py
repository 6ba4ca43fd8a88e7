"""ferrixctl log: what the service tells about its past, with the daemon and without it."""
import contextlib
import json
import os
import re
import select
import signal
import sqlite3
import subprocess
import sys
import time

from ferrix import ctl, tree

DATABASE = "/volume1/@Ferrix/db/log-db.sqlite"
LINE = re.compile(r"\d{4}-\d\d-\d\d \d\d:\d\d:\d\d  (info|task|file)  \S.*")
# As they are stored by the names of files that could not be copied.
HOSTILE = ("it's", 'say "no"', "C:\\temp", "100%", "IMG_1", "a'; DROP TABLE log_info_table;--",
           "two\nlines", "Büro", "photo 📷", "\u202egpj.exe", "[x,y]", "x" * 250)


def prepare(box, name="Camera", files=3):
    box.add_share("photos")
    stick = box.add_device("stick")
    stick.mount()
    rng = tree.rng(5)
    for number in range(files):
        tree.write(stick.path(f"img{number}.jpg"), rng)
    box.start()
    return stick, box.add_mirror(stick, name=name)


def run(box, task):
    before = len(box.log_rows("description_id IN (101, 102, 103)"))
    assert "error" not in box.ask("run_task", task_id=task)
    assert box.wait_run(task, before + 1) == "successful"


def add_rows(rows):
    """Rows (task_id, log_type, timestamp, description_id, parameters, error) beside the daemon's."""
    with contextlib.closing(sqlite3.connect(DATABASE, timeout=60)) as db, db:
        db.executemany("INSERT INTO log_info_table (task_id, log_type, timestamp, description_id,"
                       " description_param, error) VALUES (?, ?, ?, ?, ?, ?)", rows)


def failed_file(name, when=None, task=1):
    parameters = json.dumps(["Camera", name], separators=(",", ":"))
    return (task, 4, int(when or time.time()), 1000, parameters, -19)


def sentences(*args):
    return [row["sentence"] for row in ctl.read("log", *args)]


def names(*args):
    return [row["parameters"][1] for row in ctl.read("log", "--type", "file", *args)]


class Follower:
    """A running "ferrixctl log --follow", its lines read as they come."""

    def __init__(self, *args, stdout=subprocess.PIPE):
        self.process = subprocess.Popen([ctl.PROGRAM, "log", "--follow", *args],
                                        stdout=stdout, stderr=subprocess.PIPE)
        self.lines, self._rest = [], b""

    def wait_lines(self, count, timeout=20):
        """At least so many lines, in all."""
        deadline = time.monotonic() + timeout
        while len(self.lines) < count:
            left = deadline - time.monotonic()
            assert left > 0, f"only {self.lines}"
            if select.select([self.process.stdout], [], [], left)[0]:
                piece = os.read(self.process.stdout.fileno(), 65536)
                assert piece, f"ended with {self.lines}, {self.process.stderr.read()}"
                *lines, self._rest = (self._rest + piece).split(b"\n")
                self.lines += [line.decode() for line in lines]
        return self.lines

    def end(self, timeout=20):
        """What was written after the lines that have been read; the exit status."""
        self.process.send_signal(signal.SIGINT)
        rest, errors = self.process.communicate(timeout=timeout)
        assert errors == b"", errors
        return (self._rest + (rest or b"")).decode(), self.process.returncode


def test_the_log_of_a_run_by_every_option(box):
    """A run's entries are told newest last; task, time, kind, text and limit narrow them."""
    stick, task = prepare(box)
    run(box, task)
    lines = ctl.ok("log").splitlines()
    assert all(LINE.fullmatch(line) for line in lines), lines
    assert [line[21:] for line in lines] == ['info  Task "Camera" was added',
                                             'info  Task "Camera" started',
                                             'info  Task "Camera" finished']
    rows = ctl.read("log")
    assert [row["description_id"] for row in rows] == [0, 100, 101]
    for row in rows:
        assert set(row) == {"time", "timestamp", "task_id", "type", "description_id",
                            "parameters", "error", "error_text", "sentence"}
        assert abs(row["timestamp"] - time.time()) < 120 and row["task_id"] == task
        assert re.fullmatch(r"\d{4}-\d\d-\d\dT\d\d:\d\d:\d\d[+-]\d\d:\d\d", row["time"])
        assert (row["type"], row["parameters"], row["error"]) == ("info", ["Camera"], 0)

    day = 86400
    now = int(time.time())
    add_rows([failed_file("new.jpg", now), failed_file("old.jpg", now - 40 * day, task=77),
              (77, 2, now - 3 * day, 103, '["Gone"]', -22)])
    everything = len(sentences("--limit", "0"))
    assert everything == 6 and len(ctl.ok("log", "--limit", "0").splitlines()) == 6
    assert sentences("--task", "Camera") == sentences("--task", str(task))
    assert len(sentences("--task", str(task))) == 4
    assert sentences("--task", "77") == [
        '"old.jpg" could not be copied by task "Camera": the destination is full',
        'Task "Gone" failed: the source folder does not exist']
    assert sentences("--task", "78") == []
    assert ctl.ok("log", "--task", "78") == "The log has no such entry.\n"
    assert len(sentences("--since", "2d")) == 4 and len(sentences("--since", "4d")) == 5
    assert len(sentences("--until", "2d")) == 2
    assert sentences("--since", "10w", "--until", "20d") == sentences("--until", "20d")
    assert len(sentences("--since", "yesterday", "--until", "today")) == 4
    old_day = time.strftime("%Y-%m-%d", time.localtime(now - 40 * day))
    assert names("--since", old_day, "--until", old_day) == ["old.jpg"]
    assert len(sentences("--type", "info")) == 3
    assert sentences("--type", "task") == ['Task "Gone" failed: the source folder does not exist']
    assert names() == ["new.jpg", "old.jpg"] and names("--limit", "1") == ["old.jpg"]
    assert names("--grep", "NEW") == ["new.jpg"]
    assert sentences("--limit", "2") == sentences()[-2:]


def test_texts_with_quotes_are_safe_and_found(box):
    """--grep finds names with quotes, escapes and letters of any kind, and harms nothing."""
    prepare(box)
    add_rows([failed_file(name) for name in HOSTILE])
    for name in HOSTILE:
        assert names("--grep", name) == [name], name
        assert len(ctl.ok("log", "--type", "file", "--grep", name).splitlines()) == 1
    for text, found in (("'", 2), ('"', 1), ("\\", 1), ("%", 1), ("_", 2), (";--", 1), ("\n", 1),
                        ("BÜRO", 1), ("📷", 1), ("' OR '1'='1", 0), ("[", 1), ("\\x0a", 1),
                        ('say \\"no\\"', 1), ("x" * 251, 0)):
        assert len(names("--grep", text)) == found, text
    assert len(names("--limit", "0")) == len(HOSTILE), "the table is as it was"


def test_the_newest_100_unless_told_otherwise(box):
    """Without --limit the newest 100 entries are shown, in a terminal and in a pipe."""
    prepare(box)
    add_rows([failed_file(f"img{number:03}") for number in range(250)])
    assert names() == [f"img{number:03}" for number in range(150, 250)]
    assert len(names("--limit", "0")) == 250
    assert len(names("--grep", "img0", "--limit", "7")) == 7
    status, shown = ctl.on_terminal("log", "--type", "file")
    assert status == 0 and shown.count("\n") == 100 and "\033[33m" in shown
    assert "\033" not in ctl.on_terminal("log", NO_COLOR="1")[1]


def test_the_log_without_the_daemon(box):
    """The log is read while the service stands; a task is then given by its id."""
    assert "there is no log yet" in ctl.refused("log")
    assert "there is no log yet" in ctl.refused("log", "--follow", "--json")
    assert not os.path.exists(DATABASE)
    _, task = prepare(box)
    box.stop()
    assert sentences() == ['Task "Camera" was added'] == sentences("--task", str(task))
    assert "task's id" in ctl.refused("log", "--task", "Camera", status=ctl.NOT_REACHABLE)
    box.start()
    assert sentences("--task", "Camera") == ['Task "Camera" was added']


def test_what_makes_no_sense_is_refused(box):
    """Bad times, kinds, limits and tasks are told with what would be right; nothing is shown."""
    prepare(box)
    for args, part in ((("--since", "gestern"), "2026-11-21"), (("--until", ""), "30min"),
                       (("--since", "2026-02-30"), "yesterday"), (("--type", "error"), "file"),
                       (("--limit", "-1"), "limit"), (("--limit", "many"), "limit"),
                       (("--task", "Nobody"), "Nobody"), (("--task", "0"), "id"),
                       (("--task", ""), "id"), (("--task", "99999999999999999999"), "id"),
                       (("--since", "1h", "--until", "2h"), "--until"),
                       (("--follow", "--until", "today"), "--until")):
        assert part in ctl.refused("log", *args, status=ctl.USAGE), args


def test_damaged_and_unknown_entries(box):
    """Rows of a later version and damaged ones are shown for what they are."""
    prepare(box)
    now = int(time.time())
    add_rows([(1, 1, now, 105, '["Camera","more"]', 0), (1, 1, now, 1, "[" * 100000, 0),
              (1, 1, now, 1, '["Cam', 0), (1, 4, now, 1000, "\033[2J", -2), (1, 9, now, 0, "", 0)])
    rows = ctl.read("log")[1:]
    assert rows[0]["sentence"] == 'Unknown event 105 of task 1: "Camera", "more"'
    assert rows[0]["parameters"] == ["Camera", "more"]
    for row in rows[1:]:
        assert row["parameters"] is None
        assert row["sentence"].startswith("Damaged record of event ")
    lines = ctl.ok("log").splitlines()
    assert len(lines) == 6 and not any("\033" in line for line in lines)
    assert ctl.read("log", "--grep", '"Cam', "--limit", "1")[0]["parameters"] is None


def test_follow_shows_a_later_run_and_ends_on_an_interrupt(box):
    """--follow shows what there is, then each new entry at once; an interrupt is a good end."""
    _, task = prepare(box)
    plain, as_json = Follower(), Follower("--json", "--limit", "1")
    narrow = Follower("--type", "file", "--limit", "0")
    assert plain.wait_lines(1)[0].endswith('info  Task "Camera" was added')
    assert json.loads(as_json.wait_lines(1)[0])["description_id"] == 0
    run(box, task)
    lines = [line[21:] for line in plain.wait_lines(3)]
    assert lines[1:] == ['info  Task "Camera" started', 'info  Task "Camera" finished']
    run(box, task)
    rows = [json.loads(line) for line in as_json.wait_lines(5)]
    assert [row["description_id"] for row in rows] == [0, 100, 101, 100, 101]
    plain.wait_lines(5)
    # Many equal rows of one second, in pieces.
    now = int(time.time())
    for _ in range(10):
        add_rows([failed_file("Thumbs.db", now)] * 37)
        time.sleep(0.3)
    assert len(narrow.wait_lines(370)) == 370
    assert narrow.end() == ("", 0)
    assert len(plain.wait_lines(375)) == 375
    box.stop()
    box.start()
    assert len(as_json.wait_lines(375)) == 375
    run(box, task)
    assert len(plain.wait_lines(377)) == 377
    assert plain.end() == ("", 0)
    as_json.wait_lines(377)
    assert as_json.end() == ("", 0)


def test_follow_through_rotation(box):
    """Old rows that are rotated away neither hide new ones nor show any twice."""
    prepare(box)
    add_rows([failed_file(f"old{number}") for number in range(300)])
    follower = Follower("--json", "--limit", "2")
    follower.wait_lines(2)
    with contextlib.closing(sqlite3.connect(DATABASE, timeout=60)) as db, db:
        db.execute("PRAGMA recursive_triggers = true")
        db.execute("UPDATE config_table SET value = 5 WHERE key = 'log_rotate_count'")
    time.sleep(2.2)
    for number in range(12):
        add_rows([failed_file(f"new{number}")])
        follower.wait_lines(3 + number)
    shown = [json.loads(line)["parameters"][1] for line in follower.lines]
    assert shown == ["old298", "old299"] + [f"new{number}" for number in range(12)]
    assert follower.end() == ("", 0)


def test_follow_ends_with_its_reader(box):
    """When nobody reads its output any more, --follow ends by itself, news or not."""
    prepare(box)
    follower = Follower()
    follower.wait_lines(1)
    follower.process.stdout.close()
    assert follower.process.wait(timeout=20) is not None
    head = subprocess.run(f"{ctl.PROGRAM} log --follow | head -n 1",
                          shell=True, stdout=subprocess.PIPE, timeout=20, check=True)
    assert head.stdout.endswith(b'Task "Camera" was added\n')


def test_follow_that_waits_costs_next_to_nothing(box):
    """With a full log and no news, --follow does not read the log every second."""
    prepare(box)
    add_rows([failed_file(f"img{number}") for number in range(99000)])
    follower = Follower("--limit", "1")
    follower.wait_lines(1)
    time.sleep(4)  # a file that changed just now is looked into once more

    def used():
        with open(f"/proc/{follower.process.pid}/stat", encoding="ascii") as stat:
            return sum(int(field) for field in stat.read().rsplit(")", 1)[1].split()[11:13])

    before = used()
    time.sleep(5)
    ticks = used() - before
    print(f"ticks of 10 ms in 5 s: {ticks}", file=sys.stderr)
    assert ticks <= 2
    add_rows([failed_file("news")])
    follower.wait_lines(2)
    assert follower.end() == ("", 0)
