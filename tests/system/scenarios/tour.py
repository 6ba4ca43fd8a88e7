"""The README's tour, word for word, on a box where nothing is set up; and from an old repository."""
import os
import pathlib
import shutil
import subprocess

from ferrix import ctl
from ferrix.box import PACKAGE
from scenarios.upgrade import add_old_task, write_old_database
from scenarios.upgrade import MIRROR, OLD_TASK_SCHEMA, TASK_DB

README = pathlib.Path(__file__).resolve().parents[3] / "README.md"


def commands():
    """The lines of the tour that a person types."""
    text = README.read_text(encoding="utf-8").partition("## A tour\n")[2].partition("\n## ")[0]
    lines = [line[4:] for line in text.splitlines() if line.startswith("    ")]
    assert len(lines) > 25, lines
    return lines


def walk(lines):
    script = "set -eu\n" + "\n".join(lines) + "\n"
    done = subprocess.run(["bash", "-c", script], check=False, text=True, timeout=300,
                          stdout=subprocess.PIPE, stderr=subprocess.STDOUT)
    assert done.returncode == 0, done.stdout
    return done.stdout


def test_the_tour_of_the_readme(box):
    """Every line of it succeeds, and what it promises is there."""
    assert box is not None
    for path in (f"{PACKAGE}/etc", "/etc/keld", "/volume1/@Ferrix"):
        shutil.rmtree(path)
    output = walk(commands())
    assert "successful" in output and "4 files" in output, output
    assert "/pictures/inbox" in output and "/volume2/@Ferrix" in output, output
    assert "Only copied" in output and "jpg, mov" in output, output
    copied = [name for _, _, names in os.walk("/volume1/pictures/inbox") for name in names]
    assert sorted(copied) == ["IMG_0001.jpg", "IMG_0002.jpg", "IMG_0003.jpg", "notes.txt"]
    assert not os.path.exists("/volume1/photos") and not os.path.exists("/run/ferrixd.pid")
    assert ctl.read("service", "status")["state"] == 6


def test_a_start_lifts_an_old_repository(box):
    """Tasks of an older release are there after "service start", and run."""
    box.add_share("photos")
    stick = box.add_device("stick")
    write_old_database(TASK_DB, OLD_TASK_SCHEMA, add_old_task(box, stick, 1, "Old", MIRROR))
    with open(f"{PACKAGE}/enabled", "w", encoding="ascii"):
        pass
    stick.mount()
    with open(stick.path("a.jpg"), "w", encoding="ascii") as out:
        out.write("picture")
    ctl.ok("service", "start")
    with open("/run/ferrixd.pid", encoding="ascii") as pid_file:
        box.daemon_pid = int(pid_file.read())
    assert ctl.read("task", "list")[0]["task_name"] == "Old"
    ctl.ok("task", "run", "Old")
    ctl.ok("task", "watch", "Old")
    assert os.listdir("/volume1/photos") == ["a.jpg"]
    ctl.ok("task", "remove", "Old")
