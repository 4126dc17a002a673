#!/usr/bin/env python3
"""Runs in a guest: plays the two days on UBIFS, on a partition of a simulated NAND chip. The device
stops before and after calls that a file system must keep in order; the content of the chip is then
what a power cut would leave. It is copied to another partition, mounted and checked there.

    ubifs.py PROGRAMS DAY STATES SECONDS SEED [FOLDER]

FOLDER has nand.ko and nandsim.ko if the kernel lacks them. Exits with 1 when a state breaks a
promise, or when there was no time to judge any.
"""

import os
import pathlib
import random
import shutil
import signal
import subprocess
import sys
import time

from contents import tree_digest
from days import Device, Server, prepare, steps
from file_systems import Kind, call, mount, unmount
from verdict import Undisturbed

WORK = pathlib.Path("/dev/shm/crash")
# A chip of 128 MiB with pages of 2 KiB; one partition is for the device, another for the states.
CHIP = ["first_id_byte=0xec", "second_id_byte=0xa1", "third_id_byte=0x00", "fourth_id_byte=0x15"]
BLOCKS = 96
PAGE, BLOCK, RAW_BLOCK = 2048, 1 << 17, 64 * (2048 + 64)
PAGES = WORK / "pages"  # nandsim's backing file; erased pages still have their old content there
BAD_BLOCKS = 1  # of 1024, for which UBI reserves blocks
ERASED = b"\xff" * PAGE
KIND = Kind("ubifs", [], "", 0, 0, [])
VOLUME = "crash"
SUDDEN = 0.5  # fraction of stops that another one at a random moment follows
LONGEST_RUN = 0.02  # seconds until then


class Chip:
    """The contents of the first partition. Blocks with equal content are stored once."""

    def __init__(self):
        self.raw, self.names, self.blocks = [None] * BLOCKS, [None] * BLOCKS, {}

    def read(self):
        """Reads what has changed. A block that is erased and not yet rewritten counts as unchanged,
        because its content no longer matters."""
        changed = True
        while changed:  # the file system may be writing what it holds in memory for seconds
            changed = False
            with open(PAGES, "rb") as pages, open("/dev/mtd0", "rb", buffering=0) as device:
                for number in range(BLOCKS):
                    raw = pages.read(RAW_BLOCK)
                    if raw != self.raw[number]:
                        changed = True
                        self.raw[number] = raw
                        device.seek(number * BLOCK)
                        block = device.read(BLOCK)
                        self.names[number] = hash(block)
                        self.blocks.setdefault(hash(block), block)
        return tuple(self.names)

    def between(self, before, after):
        """Yields what the chip held between two contents, where that is certain: pages of a block
        are written in order, and no other block has changed."""
        changed = [number for number in range(BLOCKS) if before[number] != after[number]]
        if len(changed) != 1 or before[changed[0]] is None:
            return
        number = changed[0]
        old, new = self.blocks[before[number]], self.blocks[after[number]]
        start, end = [-(-len(block.rstrip(b"\xff")) // PAGE) * PAGE for block in (old, new)]
        if old[:start] == new[:start]:
            for cut in range(start + PAGE, end, PAGE):
                block = new[:cut].ljust(BLOCK, b"\xff")
                self.blocks.setdefault(hash(block), block)
                yield (*before[:number], hash(block), *before[number + 1:])

    def write(self, names):
        """Writes a content to the second partition."""
        call("flash_erase", "--quiet", "/dev/mtd1", "0", "0")
        with open("/dev/mtd1", "r+b", buffering=0) as device:
            for number, name in enumerate(names):
                block = self.blocks[name]
                for start in range(0, BLOCK, PAGE):
                    if block[start:start + PAGE] != ERASED:
                        device.seek(number * BLOCK + start)
                        device.write(block[start:start + PAGE])


class Recorder:
    """Runs a device's programs and stops them again and again."""

    def __init__(self, chip, seed):
        self.chip, self.random = chip, random.Random(seed)
        self.states = []  # the step, the received logs, and the chip's content
        self.step, self.received = 0, set()

    def begin(self, step):
        self.step = step
        self.states.append((step, frozenset(self.received), self.chip.read()))

    def stopped(self):
        if self.step:
            before, after = tuple(self.chip.names), self.chip.read()
            received = frozenset(self.received)
            if before != after:
                same = self.states[-1][1] == received
                for names in (*(self.chip.between(before, after) if same else ()), after):
                    self.states.append((self.step, received, names))

    def run(self, command, environment, text):
        with open(WORK / "input", "w+", encoding="utf-8") as given, \
                open(WORK / "errors", "w+", encoding="utf-8") as errors:
            given.write(text)
            given.seek(0)
            process = subprocess.Popen(command, env={**environment, "CRASH_STOPS": "1"},
                                       stdin=given, stdout=subprocess.DEVNULL, stderr=errors)
            while True:
                _, status = os.waitpid(process.pid, os.WUNTRACED)
                if not os.WIFSTOPPED(status):
                    process.returncode = os.waitstatus_to_exitcode(status)
                    errors.seek(0)
                    return process.returncode, errors.read()
                self.stopped()
                os.kill(process.pid, signal.SIGCONT)
                if self.random.random() < SUDDEN:
                    time.sleep(self.random.random() * LONGEST_RUN)
                    os.kill(process.pid, signal.SIGSTOP)


def attach(partition):
    call("ubiattach", "-m", str(partition), "-d", str(partition), "-b", str(BAD_BLOCKS))


def record(device, recorder, day):
    call("ubiformat", "--quiet", "--yes", "/dev/mtd0")
    attach(0)
    call("ubimkvol", "/dev/ubi0", "--name", VOLUME, "--maxavsize")
    mount(f"ubi0:{VOLUME}", device.root, KIND)
    server = Server(recorder.received.add)
    server.start()
    prepare(device, day, server.url)
    call("sync")
    shutil.copytree(device.root, WORK / "after/0", symlinks=True)
    device.process = recorder.run
    for number, step in enumerate(steps(day), 1):
        recorder.begin(number)
        device.clock = step.clock
        step.action(device)
        shutil.copytree(device.root, WORK / f"after/{number}", symlinks=True)
        print(f"recorded: {step.name}, {len(recorder.states)} states", flush=True)
    device.process = device.run_to_end
    unmount(device.root)
    call("ubidetach", "-d", "0")


def fault_of(state, chip, device, undisturbed, seen):
    """Returns what is broken, and whether the content was new."""
    number, received, names = state
    chip.write(names)
    call("dmesg", "--clear")
    attach(1)
    try:
        mount(f"ubi1:{VOLUME}", device.root, KIND)
        try:
            digest = number, received, tree_digest(device.root)
            if digest not in seen:
                seen[digest] = undisturbed.fault(device, number, received)
        finally:
            unmount(device.root)
    except OSError as error:
        return f"the file system: {error}"
    finally:
        call("ubidetach", "-d", "1")
    errors = [line for line in call("dmesg").splitlines() if "UBIFS error" in line]
    return seen[digest] or (errors[0] if errors else None)


def main():
    programs, (day, most, seconds, seed) = sys.argv[1], map(int, sys.argv[2:6])
    deadline = time.monotonic() + seconds
    preload = WORK / "preload.so"
    for folder in ("device", "undisturbed"):
        (WORK / folder).mkdir(parents=True)
    call("cc", "-O1", "-shared", "-fPIC", "-o", str(preload),
         str(pathlib.Path(__file__).parent / "preload.c"))
    chip = [f"parts={BLOCKS},{BLOCKS}", f"cache_file={PAGES}", *CHIP]
    if len(sys.argv) > 6:
        call("insmod", f"{sys.argv[6]}/nand.ko")
        call("insmod", f"{sys.argv[6]}/nandsim.ko", *chip)
    else:
        call("modprobe", "nandsim", *chip)
    chip = Chip()
    recorder = Recorder(chip, seed)
    device = Device(WORK / "device", programs, preload)
    record(device, recorder, day)
    undisturbed = Undisturbed(WORK / "after", WORK, steps(day),
                              Device(WORK / "undisturbed", programs, preload))
    chosen = list(enumerate(recorder.states))
    random.Random(seed).shuffle(chosen)
    judged, broken, seen = 0, 0, {}
    for place, state in chosen[:most]:
        if time.monotonic() > deadline:
            break
        fault = fault_of(state, chip, device, undisturbed, seen)
        judged += 1
        if fault:
            broken += 1
            print(f"ubifs: state {place}, in '{undisturbed.steps[state[0] - 1].name}': {fault}: "
                  f"try again with script/crash-test --file-system ubifs --seed {seed}", flush=True)
        if judged % 20 == 0:
            print(f"ubifs: {judged} of {len(chosen)} states, {broken} broken", flush=True)
    print(f"ubifs: {judged} states of {len(chosen)} that were taken, of {len(seen)} different "
          f"contents, {broken} broken", flush=True)
    if not judged:
        sys.exit("ubifs: nothing was judged: give more --seconds or --states")
    sys.exit(broken > 0)


if __name__ == "__main__":
    main()
