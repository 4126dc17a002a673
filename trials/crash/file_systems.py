"""The file systems under test, and how they are mounted."""

import collections
import ctypes
import fcntl
import os
import subprocess

# `atom` is what a drive writes atomically: f2fs relies on whole blocks, ext4 on sectors.
Kind = collections.namedtuple("Kind", "type make options size atom check")
MEBIBYTE = 1 << 20
EXT4 = ["mkfs.ext4", "-q", "-F", "-E", "lazy_itable_init=0,lazy_journal_init=0,nodiscard"]
CHECK_EXT4 = ["e2fsck", "-fn"]
KINDS = {
    "ext4": Kind("ext4", EXT4 + ["-b", "4096"], "", 48 * MEBIBYTE, 512, CHECK_EXT4),
    "ext4-1k": Kind("ext4", EXT4 + ["-b", "1024"], "", 48 * MEBIBYTE, 512, CHECK_EXT4),
    "ext4-writeback": Kind("ext4", EXT4 + ["-b", "4096"], "data=writeback", 48 * MEBIBYTE, 512,
                           CHECK_EXT4),
    "f2fs": Kind("f2fs", ["mkfs.f2fs", "-q", "-f"], "", 64 * MEBIBYTE, 4096,
                 ["fsck.f2fs", "--dry-run"]),
}

NO_ACCESS_TIMES, RECURSIVE, PRIVATE, NEW_NAMESPACE = 1024, 1 << 14, 1 << 18, 0x20000
LOOP_SET_FD, LOOP_CLEAR_FD, LOOP_GET_FREE = 0x4C00, 0x4C01, 0x4C82
libc = ctypes.CDLL(None, use_errno=True)


def call(*command):
    done = subprocess.run(command, capture_output=True, text=True, check=False)
    if done.returncode:
        raise RuntimeError(f"{command} ends with {done.returncode}: {done.stderr}")
    return done.stdout


def mount(device, folder, kind):
    if libc.mount(os.fsencode(device), os.fsencode(folder), kind.type.encode(), NO_ACCESS_TIMES,
                  kind.options.encode()):
        raise OSError(ctypes.get_errno(), os.strerror(ctypes.get_errno()), device)


def mount_in_private():
    """Makes mounts private: copies in other processes would keep file systems mounted."""
    if libc.unshare(NEW_NAMESPACE) or libc.mount(b"none", b"/", None, RECURSIVE | PRIVATE, None):
        raise OSError(ctypes.get_errno(), os.strerror(ctypes.get_errno()))


def unmount(folder):
    if libc.umount2(os.fsencode(folder), 0):
        raise OSError(ctypes.get_errno(), os.strerror(ctypes.get_errno()), folder)


class Loop:
    """A block device made of a file, without starting a process, because thousands are made."""

    def __init__(self, file):
        with open("/dev/loop-control", "rb") as control:
            while True:
                self.path = f"/dev/loop{fcntl.ioctl(control, LOOP_GET_FREE)}"
                self.device = os.open(self.path, os.O_RDWR)
                try:
                    fcntl.ioctl(self.device, LOOP_SET_FD, file.fileno())
                    return
                except OSError:  # another process took it
                    os.close(self.device)

    def close(self):
        fcntl.ioctl(self.device, LOOP_CLEAR_FD)
        os.close(self.device)
