"""A real tree nobody here made: mirrored, changed at random in several rounds, compared."""
import os

from ferrix import tree
from ferrix.box import sh

EXPECTED_ENTRIES = 20000


def test_usr_share_and_random_changes(box):
    """A copy of /usr/share is mirrored byte for byte with dates, and followed over three rounds of
    random changes, the recycle bin holding exactly what was replaced or removed."""
    share = box.add_share("photos", recycle_bin="yes")
    stick = box.add_device("stick", "ext4", 3500)
    stick.mount()
    os.mkdir(stick.path("share"))
    sh("rsync", "-a", "--no-links", "--max-size=2m", "/usr/share/", stick.path("share/"))
    box.start()
    task = box.add_mirror(stick)
    stick.hook("post_mount")
    assert box.wait_run(task, 1, 900) == "successful"
    previous = tree.listing(stick.mountpoint)
    assert len(previous) > EXPECTED_ENTRIES, len(previous)
    found = tree.differences(previous, tree.listing(share))
    assert not found, "\n".join(found)
    rng = tree.rng(20)
    for number in range(2, 5):
        tree.mutate(stick.mountpoint, rng, 150)
        stick.hook("post_mount")
        assert box.wait_run(task, number, 900) == "successful"
        current = tree.listing(stick.mountpoint)
        found = tree.differences(current, tree.listing(share))
        assert not found, "\n".join(found)
        gone = {path: entry[2:] for path, entry in previous.items()
                if entry[0] == "file" and current.get(path) != entry}
        recycled = tree.listing(share + "/#recycle", with_times=False, skip=())
        files = {path: entry[2:] for path, entry in recycled.items() if entry[0] == "file"}
        assert files == gone, (len(files), len(gone), list(files.items() ^ gone.items())[:5])
        sh("rm", "-rf", share + "/#recycle")
        previous = current


test_usr_share_and_random_changes.long = True
