"""Incremental tasks: photos sorted by date, duplicates numbered, the card emptied, and a destination
that its owner changes by hand."""
import contextlib
import glob
import os
import shutil
import sqlite3

from ferrix import tree
from ferrix.box import sh, wait_until

OVERWRITE, RENAME = 2, 1
MAY_6 = 1683356889  # 2023-05-06 07:08:09 UTC


def prepare(box, **options):
    """A started box with a share, a mounted card and an incremental task; nothing has run."""
    # The private world has no zone of its own: the daemon reads this one.
    if os.path.lexists("/etc/localtime"):
        os.unlink("/etc/localtime")
    share = box.add_share("photos", **options.pop("share_options", {}))
    card = box.add_device("card", options.pop("fs", "ext4"), options.pop("size_mb", 64))
    card.mount()
    box.start()
    task = box.add_mirror(card, name="Holiday", copy_strategy=3,
                          **{"conflict_policy": OVERWRITE, **options})
    box.runs = 0
    return share, card, task


def run(box, card, task, wanted="successful"):
    box.runs += 1
    card.hook("post_mount")
    status = box.wait_run(task, box.runs)
    assert status == wanted, status


def write(path, content, time=MAY_6):
    os.makedirs(os.path.dirname(path), exist_ok=True)
    with open(path, "wb") as out:
        out.write(content)
    os.utime(path, (time, time))


def files(top):
    """{relative path: content} of the regular files below a folder, recycle bin left out."""
    found = {}
    for path in glob.glob(f"{top}/**", recursive=True, include_hidden=True):
        relative = path[len(top):]
        if os.path.isfile(path) and not os.path.islink(path) and not relative.startswith("/#recycle"):
            with open(path, "rb") as content:
                found[relative] = content.read()
    return found


def records(task):
    """{source path: (destination path, type)} of the task's file database."""
    path = f"/volume1/@Ferrix/task/{task}/file-db.sqlite"
    with contextlib.closing(sqlite3.connect(path)) as db:
        return {source: (destination, kind) for source, destination, kind in db.execute(
            "SELECT source_path, destination_path, file_type FROM file_info_table")}


def same(found, wanted):
    assert found == wanted, f"\nfound  {sorted(found.items())}\nwanted {sorted(wanted.items())}"


def landing(box, wanted, **options):
    share, card, task = prepare(box, **options)
    write(card.path("DCIM/IMG_0001.JPG"), b"picture")
    write(card.path("DCIM/notes.txt"), b"text")
    run(box, card, task)
    same(files(share), wanted)
    assert int(os.stat(share + next(iter(wanted))).st_mtime) == MAY_6
    mark = box.log.mark()
    run(box, card, task)
    same(files(share), wanted)
    assert box.log.lacks("CopyHandler: SetCopyFromFullPath", mark), "nothing is copied twice"


def test_the_folders_of_the_card_are_kept(box):
    """With the folders kept a file lands where it lay, whatever the other options say."""
    landing(box, {"/DCIM/IMG_0001.JPG": b"picture", "/DCIM/notes.txt": b"text"},
            keep_dir_structure=True, smart_create_date_dir=True, rename_photo_video=True)


def test_date_folders_and_names_by_time(box):
    """Photos lie in a folder of their day and are named by their time; other files keep their name."""
    landing(box, {"/2023-05-06/2023-05-06_070809.JPG": b"picture", "/2023-05-06/notes.txt": b"text"},
            keep_dir_structure=False, smart_create_date_dir=True, rename_photo_video=True)


def test_date_folders_alone(box):
    """Files keep their names in folders of their day."""
    landing(box, {"/2023-05-06/IMG_0001.JPG": b"picture", "/2023-05-06/notes.txt": b"text"},
            keep_dir_structure=False, smart_create_date_dir=True, rename_photo_video=False)


def test_names_by_time_alone(box):
    """Photos are named by their time, all in one folder."""
    landing(box, {"/2023-05-06_070809.JPG": b"picture", "/notes.txt": b"text"},
            keep_dir_structure=False, smart_create_date_dir=False, rename_photo_video=True)


def test_all_files_in_one_folder(box):
    """Without any option the folders are dropped and the names kept."""
    landing(box, {"/IMG_0001.JPG": b"picture", "/notes.txt": b"text"},
            keep_dir_structure=False, smart_create_date_dir=False, rename_photo_video=False)


def test_duplicates_are_numbered(box):
    """Photos of one second, and files of one name from two folders, get a number; none is lost."""
    share, card, task = prepare(box, keep_dir_structure=False, rename_photo_video=True)
    for number in range(12):
        write(card.path(f"DCIM/IMG_{number}.JPG"), b"picture %d" % number)
    write(card.path("a/README"), b"a")
    write(card.path("b/README"), b"b")
    run(box, card, task)
    found = files(share)
    numbered = {f"/2023-05-06_070809{f' ({n})' if n else ''}.JPG" for n in range(12)}
    assert set(found) == numbered | {"/README", "/README (1)"}, sorted(found)
    assert sorted(found.values()) == sorted(files(card.mountpoint).values())
    run(box, card, task)
    same(files(share), found)


def test_what_is_done_is_done(box):
    """Copies may be sorted, renamed or removed; a known file comes back only when it changes."""
    share, card, task = prepare(box)
    for name in ("a", "b", "d/c"):
        write(card.path(name), name.encode())
    run(box, card, task)
    os.makedirs(f"{share}/sorted")
    os.rename(f"{share}/a", f"{share}/sorted/a")
    os.unlink(f"{share}/b")
    run(box, card, task)
    same(files(share), {"/sorted/a": b"a", "/d/c": b"d/c"})
    box.stop()
    box.start()  # and it is remembered
    run(box, card, task)
    same(files(share), {"/sorted/a": b"a", "/d/c": b"d/c"})
    write(card.path("b"), b"changed", MAY_6 + 10)
    run(box, card, task)
    same(files(share), {"/sorted/a": b"a", "/d/c": b"d/c", "/b": b"changed"})


def test_deleted_on_the_card_is_only_forgotten(box):
    """Deleting a file or a folder on the card removes nothing from the share."""
    share, card, task = prepare(box)
    for name in ("a", "d/b", "d/e/c"):
        write(card.path(name), name.encode())
    run(box, card, task)
    before = files(share)
    assert set(records(task)) == {"/a", "/d", "/d/b", "/d/e", "/d/e/c"}
    shutil.rmtree(card.path("d"))
    run(box, card, task)
    same(files(share), before)
    assert set(records(task)) == {"/a"}


def test_the_card_is_emptied(box):
    """With the source removed the card holds only its folders, and no record is kept."""
    share, card, task = prepare(box, remove_src_file=True)
    wanted = {}
    for name in ("a.jpg", "d/b.jpg", "d/big"):
        content = os.urandom(5 << 20) if name == "d/big" else name.encode()
        write(card.path(name), content)
        wanted["/" + name] = content
    run(box, card, task)
    same(files(share), wanted)
    assert files(card.mountpoint) == {}
    assert os.path.isdir(card.path("d"))
    assert {kind for _, kind in records(task).values()} == {1}
    write(card.path("a.jpg"), b"another")
    run(box, card, task)
    same(files(share), {**wanted, "/a.jpg": b"another"})


def test_two_cards_worth_of_one_name_both_live(box):
    """Moved one after the other under "rename", two pictures of one name are both kept."""
    share, card, task = prepare(box, remove_src_file=True, keep_dir_structure=False, conflict_policy=RENAME)
    write(card.path("DCIM/IMG_1.JPG"), b"first")
    run(box, card, task)
    write(card.path("DCIM/IMG_1.JPG"), b"second", MAY_6 + 60)
    run(box, card, task)
    found = files(share)
    assert found.pop("/IMG_1.JPG") == b"second"
    (name, content), = found.items()
    assert content == b"first" and name.startswith("/IMG_1_Ferrix_") and name.endswith("_Conflict.JPG")
    assert files(card.mountpoint) == {}


def test_a_burst_is_moved_whole(box):
    """Photos of one second that are moved do not take each other's place, under "overwrite" neither."""
    share, card, task = prepare(box, remove_src_file=True, keep_dir_structure=False,
                                rename_photo_video=True)
    for number in range(10):
        write(card.path(f"DCIM/IMG_{number}.JPG"), b"picture %d" % number)
    before = sorted(files(card.mountpoint).values())
    run(box, card, task)
    assert sorted(files(share).values()) == before
    assert files(card.mountpoint) == {}


def changed_by_hand(box, policy, how):
    """Copies /a, lets `how` change the copy, changes the source, and runs again."""
    share, card, task = prepare(box, conflict_policy=policy, share_options={"recycle_bin": "yes"})
    write(card.path("a"), b"first")
    run(box, card, task)
    how(f"{share}/a")
    before = files(share)
    run(box, card, task)
    same(files(share), before)  # as long as the source stays as it is nothing happens
    write(card.path("a"), b"second", MAY_6 + 60)
    run(box, card, task)
    with open(f"{share}/a", "rb") as content:
        assert content.read() == b"second"
    assert not os.path.islink(f"{share}/a")
    found = files(share)
    del found["/a"]
    return share, found


def edit(path):
    write(path, b"edited by hand", MAY_6 + 30)


def by_folder(path):
    os.unlink(path)
    write(path + "/precious", b"inside")


def by_link(path):
    os.unlink(path)
    write("/volume1/photos/target", b"elsewhere")
    os.symlink("target", path)


def test_overwrite_an_edited_copy(box):
    """Under "overwrite" an edited copy is replaced by the changed source."""
    _, rest = changed_by_hand(box, OVERWRITE, edit)
    same(rest, {})


def test_rename_an_edited_copy(box):
    """Under "rename" an edited copy is moved aside."""
    _, rest = changed_by_hand(box, RENAME, edit)
    (name, content), = rest.items()
    assert name.startswith("/a_Ferrix_") and name.endswith("_Conflict") and content == b"edited by hand"


def test_overwrite_a_removed_copy(box):
    """Under "overwrite" a removed copy is made anew when the source changes."""
    _, rest = changed_by_hand(box, OVERWRITE, os.unlink)
    same(rest, {})


def test_rename_a_removed_copy(box):
    """Under "rename" a removed copy is made anew when the source changes."""
    _, rest = changed_by_hand(box, RENAME, os.unlink)
    same(rest, {})


def test_overwrite_a_folder_in_the_way(box):
    """Under "overwrite" a folder in the copy's place goes to the recycle bin."""
    share, rest = changed_by_hand(box, OVERWRITE, by_folder)
    same(rest, {})
    with open(f"{share}/#recycle/a/precious", "rb") as content:
        assert content.read() == b"inside"


def test_rename_a_folder_in_the_way(box):
    """Under "rename" a folder in the copy's place is moved aside with all it holds."""
    _, rest = changed_by_hand(box, RENAME, by_folder)
    (name, content), = rest.items()
    assert name.startswith("/a_Ferrix_") and name.endswith("_TypeConflict/precious")
    assert content == b"inside"


def test_overwrite_a_link_in_the_way(box):
    """Under "overwrite" a link in the copy's place makes way, and what it led to stays."""
    _, rest = changed_by_hand(box, OVERWRITE, by_link)
    same(rest, {"/target": b"elsewhere"})


def test_rename_a_link_in_the_way(box):
    """Under "rename" a link in the copy's place is moved aside, and what it led to stays."""
    share, rest = changed_by_hand(box, RENAME, by_link)
    same(rest, {"/target": b"elsewhere"})
    assert [name for name in os.listdir(share) if os.path.islink(f"{share}/{name}")
            and name.startswith("a_Ferrix_") and name.endswith("_TypeConflict")]


def test_a_changed_naming_gives_changed_files_new_names(box):
    """After a change of the options a known file keeps its copy; a changed one lands under the new name."""
    share, card, task = prepare(box, keep_dir_structure=True)
    write(card.path("DCIM/a.jpg"), b"a")
    write(card.path("DCIM/b.jpg"), b"b")
    run(box, card, task)
    answer = box.ask("set_task_setting", task_id=task, task_name="Holiday", keep_dir_structure=False,
                     smart_create_date_dir=True, rename_photo_video=True, copy_strategy=3,
                     remove_src_file=False, conflict_policy=OVERWRITE, task_type=1,
                     hub_share_name="photos", hub_folder_path="/", usb_folder_path="/")
    assert "error" not in answer, answer
    run(box, card, task)
    same(files(share), {"/DCIM/a.jpg": b"a", "/DCIM/b.jpg": b"b"})
    write(card.path("DCIM/b.jpg"), b"b2", MAY_6 + 1)
    run(box, card, task)
    same(files(share), {"/DCIM/a.jpg": b"a", "/DCIM/b.jpg": b"b",
                        "/2023-05-06/2023-05-06_070810.jpg": b"b2"})


def test_names_that_differ_in_case_alone_all_live(box):
    """Moved to exFAT, which ignores case, files and folders of two spellings all arrive, whatever the
    policy is."""
    wanted = {"img.jpg": b"one", "IMG.JPG": b"two", "Img.jpg": b"three", "dcim/a": b"four",
              "DCIM/A": b"five", "DCIM/b": b"six", "note": b"a file", "NOTE/c": b"below a folder"}
    share = box.add_share("photos")
    box.start()
    for number, policy in enumerate((OVERWRITE, RENAME), 1):
        for position, (name, content) in enumerate(wanted.items()):
            write(f"{share}/out{number}/{name}", content, MAY_6 + 2 * position)
        stick = box.add_device(f"stick{number}", "exfat", 64)
        stick.mount()
        box.add_mirror(stick, folder=f"/out{number}", export=True, name=f"Move {number}",
                       copy_strategy=3, conflict_policy=policy, remove_src_file=True)
        stick.hook("post_mount")
        wait_until(lambda n=number: len(box.log_rows("description_id IN (101, 102, 103)")) >= n, 120)
        assert len(box.log_rows("description_id = 101")) == number, box.log_rows()
        same(files(f"{share}/out{number}"), {})
        found = files(stick.mountpoint)
        assert sorted(found.values()) == sorted(wanted.values()), found


def test_a_random_tree_of_hostile_names(box):
    """A tree of hostile names arrives whole, and its changes follow without a removal."""
    share, card, task = prepare(box)
    rng = tree.rng(5)
    tree.fill(card.mountpoint, rng, files=150, folders=20)
    run(box, card, task)
    left, right = tree.listing(card.mountpoint), tree.listing(share)
    assert not (found := tree.differences(left, right)), "\n".join(found)
    box.stop()
    box.start()
    mark = box.log.mark()
    run(box, card, task)
    assert box.log.lacks("CopyHandler: SetCopyFromFullPath", mark)


def test_a_killed_daemon_copies_the_rest(box):
    """After a kill in the middle the next run completes, and nothing is there twice."""
    share, card, task = prepare(box, size_mb=256, conflict_policy=RENAME)
    for number in range(2500):
        write(card.path(f"d{number % 20}/{number}.jpg"), b"%d" % number * 50)
    box.runs = 0
    card.hook("post_mount")
    wait_until(lambda: len(records(task)) > 800, 120, 0.02, "half of the run")
    box.kill()
    box.start()
    card.hook("post_mount")
    box.wait_run(task, 1)
    left, right = tree.listing(card.mountpoint), tree.listing(share)
    assert not (found := tree.differences(left, right)), "\n".join(found)
    assert len(records(task)) == 2520


def test_a_database_that_is_damaged_is_refused(box):
    """A file database that cannot be read keeps its task out, with a clear word, and stays as it is."""
    share, card, task = prepare(box)
    write(card.path("a"), b"a")
    run(box, card, task)
    card.unplug()
    path = f"/volume1/@Ferrix/task/{task}/file-db.sqlite"
    for suffix in ("-wal", "-shm"):
        with contextlib.suppress(FileNotFoundError):
            os.unlink(path + suffix)
    write(path, b"no database " * 1000)
    card.plug()
    wait_until(lambda: box.log.has("Failed to initiailize file db for task"), 20)
    assert box.status(task) in ("unmounted", "failed"), box.status(task)
    with open(path, "rb") as content:
        assert content.read() == b"no database " * 1000
    same(files(share), {"/a": b"a"})


def vanish(box, **options):
    """A card that goes in the middle of a run without a word, and comes back."""
    share, card, task = prepare(box, size_mb=300, conflict_policy=RENAME, **options)
    rng = tree.rng(17)
    wanted = {}
    for number in range(400):
        name = f"/DCIM/img{number:03}.jpg"
        wanted[name] = rng.randbytes(300000)
        write(card.path(name[1:]), wanted[name], MAY_6 + 2 * number)
    write(share + "/kept.txt", b"of the owner")
    card.hook("post_mount")
    wait_until(lambda: os.path.isdir(share + "/DCIM") and len(os.listdir(share + "/DCIM")) > 20,
               60, 0.002)
    sh("umount", "-l", card.mountpoint)
    card.mounted = False
    assert box.log.expect("HandleError: task_err_code = -22", timeout=120)
    wait_until(lambda: box.log_rows("description_id = 103"), 60)
    found = files(share)
    assert found.pop("/kept.txt") == b"of the owner" and len(found) < len(wanted)
    assert found.items() <= wanted.items(), "what is there is whole"
    card.hook("pre_unmount")
    card.mount()
    box.runs = 1
    run(box, card, task)
    same(files(share), {**wanted, "/kept.txt": b"of the owner"})
    return card


def test_a_card_that_vanishes_during_a_run(box):
    """The run fails, what was copied is whole, and the next run ends as an undisturbed one."""
    assert len(files(vanish(box).mountpoint)) == 400


def test_a_card_that_vanishes_while_it_is_emptied(box):
    """The same with files that are moved: none is lost, none comes twice, the card is empty after."""
    assert not files(vanish(box, remove_src_file=True).mountpoint)
