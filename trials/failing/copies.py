"""Copies of a device, and in what a device differs from the one that it is a copy of."""

import contextlib
import os
import re
import shutil
import sqlite3
import stat
import tempfile

# What differs between two runs that do the same: times, names that contain them, processes.
OF_THE_MOMENT = re.compile(rb"\d{4}-\d\d-\d\d[T ]\d\d:\d\d:\d\d(\.\d+)?|\d{8}T\d{6}Z-[0-9a-f]{8}|"
                           rb"<key>(Process|Started)</key>\s*<integer>\d+")
DATABASE = re.compile(r"(.*\.(?:sqlitedb|db))(?:-wal|-shm)?")


def data_of(path):
    """The ranges of a file that are no holes. A segment has 4 MiB, nearly all of them a hole."""
    with open(path, "rb", buffering=0) as file:
        size, at = os.fstat(file.fileno()).st_size, 0
        while at < size:
            try:
                at = os.lseek(file.fileno(), at, os.SEEK_DATA)
            except OSError:  # none is left
                return
            end = os.lseek(file.fileno(), at, os.SEEK_HOLE)
            yield at, os.pread(file.fileno(), end - at, at)
            at = end


def copy_sparsely(source, target):
    write_sparsely(target, data_of(source), os.stat(source))
    shutil.copystat(source, target)


def write_sparsely(path, parts, facts):
    with open(path, "wb", buffering=0) as file:
        for at, part in parts:
            os.pwrite(file.fileno(), part, at)
        os.ftruncate(file.fileno(), facts.st_size)


def copy(source, target):
    shutil.rmtree(target, ignore_errors=True)
    shutil.copytree(source, target, symlinks=True, copy_function=copy_sparsely)


def scan(root, below=""):
    """The facts of all files by their paths, each folder before what is in it."""
    found = {}
    with os.scandir(os.path.join(root, below)) as entries:
        for entry in entries:
            path = f"{below}{entry.name}"
            found[path] = entry.stat(follow_symlinks=False)
            if stat.S_ISDIR(found[path].st_mode):
                found |= scan(root, f"{path}/")
    return found


class Image:
    """All files of a device in memory. They must be folders and regular files."""

    def __init__(self, root):
        self.files = scan(root)
        self.content = {path: list(data_of(root / path)) for path, facts in self.files.items()
                        if stat.S_ISREG(facts.st_mode)}
        self.newest = max(facts.st_mtime_ns for facts in self.files.values())

    def is_changed(self, path, facts, device):
        former = self.files[path]
        if (facts.st_mode, facts.st_size, facts.st_mtime_ns) != (
                former.st_mode, former.st_size, former.st_mtime_ns):
            return True
        # Memory that is mapped can change without a trace.
        return path in self.content and (path.startswith("run/") or path.endswith("-shm")) and (
            list(data_of(device / path)) != self.content[path])

    def restore(self, device):
        """Makes a device like this one again, whatever happened to it."""
        device.mkdir(exist_ok=True)
        found = scan(device)
        for path, facts in reversed(list(found.items())):
            former = self.files.get(path)
            if former is None or stat.S_IFMT(facts.st_mode) != stat.S_IFMT(former.st_mode):
                (os.rmdir if stat.S_ISDIR(facts.st_mode) else os.unlink)(device / path)
                del found[path]
        for path, former in self.files.items():
            if path not in found or self.is_changed(path, found[path], device):
                self.write(device / path, path, former)
        for path, former in reversed(self.files.items()):
            if path not in self.content:  # a folder has the time of what was made in it or removed
                os.utime(device / path, ns=(former.st_atime_ns, former.st_mtime_ns))

    def write(self, target, path, facts):
        if path in self.content:
            write_sparsely(target, self.content[path], facts)
        elif not target.exists():
            target.mkdir()
        target.chmod(stat.S_IMODE(facts.st_mode))
        os.utime(target, ns=(facts.st_atime_ns, facts.st_mtime_ns))

    def changes(self, device):
        """What is no longer as it was; of times only whether they are later, for no program looks
        closer."""
        found = scan(device)
        changed = {path for path in self.files if path not in found}
        for path, facts in found.items():
            if path in self.files and not self.is_changed(path, facts, device):
                continue
            content = ()
            if database := DATABASE.fullmatch(path):
                changed.add(rows_of(device / database[1]))
            elif stat.S_ISREG(facts.st_mode):
                content = tuple((at, undated(part)) for at, part in data_of(device / path))
            changed.add((undated(os.fsencode(path)), facts.st_mode, facts.st_size,
                         facts.st_mtime_ns > self.newest, content))
        return frozenset(changed)


def rows_of(database):
    """All that a database has, wherever on its pages; of a damaged one, which does not open, the
    bytes."""
    files = [path for path in (database, f"{database}-wal") if os.path.exists(path)]
    with tempfile.TemporaryDirectory(dir="/dev/shm") as folder:
        for path in files:
            shutil.copy(path, folder)
        try:
            with contextlib.closing(sqlite3.connect(os.path.join(folder, database.name))) as rows:
                return tuple(rows.iterdump())
        except sqlite3.Error:
            return tuple(part for path in files for part in data_of(path))


def undated(data):
    return OF_THE_MOMENT.sub(b"", data)
