#!/usr/bin/env python3
"""Runs in a guest: plays the two days on a file system and records the writes to its block device.

    record.py FILE-SYSTEM PROGRAMS DAY LOG AFTER

The log of writes goes to the disk LOG. AFTER gets a tar file with the device after each step,
and the kernel's version.
"""

import pathlib
import platform
import shutil
import subprocess
import sys

from days import Device, Server, prepare, steps
from file_systems import KINDS, Loop, call, mount, unmount

WORK = pathlib.Path("/dev/shm/crash")
NAME = "crash"


def mark(text):
    call("dmsetup", "message", NAME, "0", f"mark {text}")


def main():
    kind, programs, day = KINDS[sys.argv[1]], sys.argv[2], int(sys.argv[3])
    log, tar = sys.argv[4:]
    root = WORK / "device"
    root.mkdir(parents=True)
    call("cc", "-O1", "-shared", "-fPIC", "-o", str(WORK / "preload.so"),
         str(pathlib.Path(__file__).parent / "preload.c"))
    # Write back soon, so that much reaches the device in a different order than it was written.
    for name, value in (("dirty_writeback_centisecs", 10), ("dirty_expire_centisecs", 20)):
        pathlib.Path("/proc/sys/vm", name).write_text(str(value), encoding="ascii")
    with open(WORK / "data", "w+b") as file:
        file.truncate(kind.size)
        loop = Loop(file)
    call("dmsetup", "create", "--noudevrules", "--noudevsync", NAME, "--table",
         f"0 {kind.size // 512} log-writes {loop.path} {log}")
    path = "/dev/dm-0"  # no udev runs that could name it
    call(*kind.make, path)
    mount(path, root, kind)

    server = Server(lambda name: mark(f"received:{name}"))
    server.start()
    device = Device(root, programs, WORK / "preload.so")
    prepare(device, day, server.url)
    call("sync")
    shutil.copytree(root, WORK / "after/0", symlinks=True)
    mark("step:0")
    for number, step in enumerate(steps(day), 1):
        device.clock = step.clock
        step.action(device)
        mark(f"step:{number}")
        print(f"recorded: {step.name}", flush=True)
        shutil.copytree(root, WORK / f"after/{number}", symlinks=True)
    unmount(root)
    call("dmsetup", "remove", NAME)
    loop.close()
    (WORK / "kernel").write_text(platform.release(), encoding="ascii")
    subprocess.run(["tar", "--create", "--file", tar, "--directory", WORK, "after", "kernel"],
                   check=True)


if __name__ == "__main__":
    main()
