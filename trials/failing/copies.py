"""Copies of a device, and whether two devices are the same to a program."""

import functools
import hashlib
import os
import shutil
import stat


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
    with open(target, "wb", buffering=0) as file:
        for at, part in data_of(source):
            os.pwrite(file.fileno(), part, at)
        os.ftruncate(file.fileno(), os.stat(source).st_size)
    shutil.copystat(source, target)


def copy(source, target):
    shutil.rmtree(target, ignore_errors=True)
    shutil.copytree(source, target, symlinks=True, copy_function=copy_sparsely)


@functools.cache
def newest(root):
    return max(path.lstat().st_mtime_ns for path in root.rglob("*"))


def state_of(root, moment):
    """A digest of all files; of their times only whether they are later than `moment`, for no
    program looks closer."""
    state = hashlib.sha256()
    for path in sorted(root.rglob("*")):
        facts = path.lstat()
        state.update(repr((str(path), facts.st_mode, facts.st_size,
                           facts.st_mtime_ns > moment)).encode())
        if stat.S_ISREG(facts.st_mode):
            for part in data_of(path):
                state.update(repr(part).encode())
    return state.digest()
