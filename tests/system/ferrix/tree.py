"""Trees of files: listings to compare, and seeded random changes."""
import hashlib
import os
import random
import shutil
import stat


def listing(top, with_times=True, skip=("#recycle", "lost+found")):
    """{relative path: description} of all files and folders below `top`, files with their dates;
    links are left out, as the daemon leaves them out. A folder's date is that of its last change:
    what is copied into it later moves it."""
    top = os.fsencode(top)
    entries = {}
    for folder, names, files in os.walk(top):
        names[:] = [n for n in names if os.fsdecode(n) not in skip or folder != top]
        for name in names[:]:
            path = os.path.join(folder, name)
            if os.path.islink(path):
                names.remove(name)
                continue
            entries[os.fsdecode(path[len(top):])] = ("folder",)
        for name in files:
            path = os.path.join(folder, name)
            info = os.lstat(path)
            if not stat.S_ISREG(info.st_mode):
                continue
            with open(path, "rb") as content:
                digest = hashlib.sha256(content.read()).hexdigest()
            time = int(info.st_mtime) if with_times else None
            entries[os.fsdecode(path[len(top):])] = ("file", time, info.st_size, digest)
    return entries


def differences(left, right, limit=20):
    """Readable lines on how two listings differ; empty when they are equal."""
    out = []
    for path in sorted(left.keys() | right.keys()):
        if left.get(path) != right.get(path):
            out.append(f"{path!r}: {left.get(path)} / {right.get(path)}")
    return out[:limit]


def fill(top, rng, files=200, folders=20, big=0):
    """Makes a random tree, hostile names among them."""
    odd = ["new\nline", "quote'\"", "100%s%n", "tab\t", "ümläut", "日本", "$(touch x)", "-rf",
           "..hidden", "trailing ", "back\\slash", "semi;colon", "name" + "x" * 240]
    paths = [top]
    for number in range(folders):
        base = rng.choice(paths)
        name = rng.choice(odd) + str(number) if number % 3 == 0 and len(odd) else f"folder{number}"
        path = os.path.join(base, name[:240])
        os.makedirs(path, exist_ok=True)
        paths.append(path)
    for number in range(files):
        name = f"{rng.choice(odd)[:200]}-{number}.jpg" if number % 7 == 0 else f"img{number}.jpg"
        write(os.path.join(rng.choice(paths), name), rng)
    for number in range(big):
        write(os.path.join(top, f"big{number}"), rng, 20 << 20)


def write(path, rng, size=None):
    with open(path, "wb") as out:
        out.write(rng.randbytes(rng.randrange(0, 60000) if size is None else size))
    when = 1_500_000_000 + rng.randrange(0, 100_000_000)
    os.utime(path, (when, when))


def mutate(top, rng, changes=40):
    """Edits, removes, adds, and swaps types at random. Returns the relative paths touched."""
    touched = []
    for _ in range(changes):
        files, folders = [], []
        for folder, names, names_of_files in os.walk(top):
            if folder == top and "lost+found" in names:
                names.remove("lost+found")
            folders += [os.path.join(folder, n) for n in names]
            files += [os.path.join(folder, n) for n in names_of_files]
        kind = rng.choice(("edit", "edit", "remove", "add", "rmdir", "file-to-folder",
                           "folder-to-file", "mkdir"))
        if kind in ("edit", "remove", "file-to-folder") and files:
            path = rng.choice(files)
            if kind == "edit":
                write(path, rng)
            else:
                os.unlink(path)
            if kind == "file-to-folder":
                os.mkdir(path)
                write(os.path.join(path, "inside"), rng)
        elif kind in ("rmdir", "folder-to-file") and folders:
            path = rng.choice(folders)
            shutil.rmtree(path)
            if kind == "folder-to-file":
                write(path, rng)
        elif kind == "add":
            path = os.path.join(rng.choice(folders + [top]), f"added{rng.randrange(10**9)}")
            write(path, rng)
        elif kind == "mkdir":
            path = os.path.join(rng.choice(folders + [top]), f"made{rng.randrange(10**9)}")
            os.mkdir(path)
        else:
            continue
        touched.append(path[len(top):])
    return touched


def rng(seed):
    return random.Random(seed)
