#!/usr/bin/env python3
"""Mounts states that a power cut could have left, and checks each.

    judge.py FILE-SYSTEM PROGRAMS RECORDING DAY [--states N] [--seconds N] [--seed N] [--state N]
             [--script COMMAND]

State numbers begin with the points after each flush, FUA write and mark; the others are torn. For a
broken state, prints COMMAND with the arguments that make the state again. Exits with 1 when a state
breaks a promise, or when there was no time to judge any.
"""

import argparse
import bisect
import collections
import hashlib
import pathlib
import random
import shutil
import signal
import subprocess
import sys
import tempfile
import time

from contents import tree_digest
from days import Device, steps
from f2fs import UnawaitedNodes, has_fault
from file_systems import KINDS, Loop, call, mount, mount_in_private, unmount
from verdict import Undisturbed
from write_log import FLUSH, FUA, MARK, Image, WriteLog, torn

ROUND = 500  # states that are made in one pass over the log
# Everything before `position` is there, and some of what is between it and `cut`, if any.
State = collections.namedtuple("State", "number position cut")


class Judge:
    def __init__(self, options, work):
        self.options, self.work, self.kind = options, work, KINDS[options.kind]
        self.log = WriteLog(options.recording / "writes")
        self.steps = steps(options.day)
        call("cc", "-O1", "-shared", "-fPIC", "-o", str(work / "preload.so"),
             str(pathlib.Path(__file__).parent / "preload.c"))
        for folder in ("undisturbed", "device"):
            (work / folder).mkdir()
        self.device = Device(work / "device", options.programs, work / "preload.so")
        self.undisturbed = Undisturbed(
            options.recording / "after", work, self.steps,
            Device(work / "undisturbed", options.programs, work / "preload.so"))
        kernel = (options.recording / "kernel").read_text("ascii")
        self.unawaited = UnawaitedNodes(self.log) if has_fault(self.kind, kernel) else None
        self.image = (work / "image").open("w+b")
        self.devices = {}  # verdicts, by step and content of the device
        self.seen = {}  # by step and content
        self.judged = collections.Counter()
        self.failures = 0
        self.find_points()

    def find_points(self):
        """Finds positions before which all is durable, and the windows between flushes. Up to a
        mark, unflushed writes are missing: they are logged only with the next flush."""
        self.marks, self.points, flushes, waiting = [], [], [], 0
        for number, entry in enumerate(self.log.entries):
            waiting = 0 if entry.flags & FLUSH else waiting + (not entry.flags & (FUA | MARK))
            if entry.flags & MARK:
                if waiting:
                    raise ValueError("a write stands in the log before it was flushed")
                self.marks.append((number, entry.data.split(":")))
            if self.marks:
                if entry.flags & FLUSH:
                    flushes.append(number)
                self.points += [number] if entry.flags & FLUSH else []
                self.points += [number + 1] if entry.flags & (FUA | MARK) else []
        self.points = sorted(set(self.points + [len(self.log.entries)]))
        ends = flushes[1:] + [len(self.log.entries)]
        self.windows = [(start, end) for start, end in zip(flushes, ends)
                        if any(entry.length for entry in self.log.entries[start:end])]
        self.weights = [end - start for start, end in self.windows]

    def state(self, number):
        if number < len(self.points):
            return State(number, self.points[number], None)
        choice = random.Random(f"{self.options.seed} {number}")
        start, end = choice.choices(self.windows, self.weights)[0]
        return State(number, start, choice.randint(start + 1, end))

    def where(self, position):
        """Returns the step in which the cut came, and the logs that the server had confirmed."""
        before = [words for place, words in self.marks[:bisect.bisect_left(
            self.marks, (position, []))]]
        done = [int(words[1]) for words in before if words[0] == "step"]
        received = frozenset(words[1] for words in before if words[0] == "received")
        return min((done[-1] if done else 0) + 1, len(self.steps)), received

    def judge(self, state):
        """Returns the step, what is broken, and whether f2fs's unawaited write explains it."""
        number, received = where = self.where(state.cut or state.position)
        pieces = () if state.cut is None else torn(
            self.log, state.position, state.cut,
            random.Random(f"{self.options.seed} {state.number} torn"), self.kind.atom)
        # A digest, because the pieces of a state take megabytes.
        device = *where, state.position, hashlib.sha256(repr(pieces).encode()).digest()
        if device not in self.devices:
            fault, lost = self.verdict(state, *where, pieces), False
            late = self.late(state, pieces) if fault and self.unawaited else None
            if late is not None:
                lost = not self.verdict(state, *where, (*pieces, (late, None)))
            self.devices[device] = number, fault, lost
        return self.devices[device]

    def late(self, state, pieces):
        """The position of a write that f2fs has lost, or None."""
        place = state.position - (state.cut is None)
        while place and not self.log.entries[place].flags & (FLUSH | FUA):
            place -= 1
        return self.unawaited.lost(place, state.cut or state.position,
                                   pieces[-1][0] if pieces else None)

    def verdict(self, state, number, received, pieces):
        """Returns what is broken, or None."""
        self.disk.advance(state.position)
        self.disk.tear(pieces, self.kind.atom)
        self.disk.write(self.image)
        self.disk.mend()
        loop = Loop(self.image)
        try:
            mount(loop.path, self.device.root, self.kind)
            try:
                digest = number, received, tree_digest(self.device.root)
                self.judged["mounted"] += 1
                if digest in self.seen:
                    return self.seen[digest]
                fault = self.undisturbed.fault(self.device, number, received)
            finally:
                unmount(self.device.root)
        except OSError as error:
            return f"the file system: {error}"
        finally:
            loop.close()
        self.judged["ran"] += 1
        checked = subprocess.run([*self.kind.check, self.work / "image"], capture_output=True,
                                 text=True, check=False)
        if checked.returncode and not fault:
            fault = f"{self.kind.check[0]}: {checked.stdout[-300:]}"
        self.seen[digest] = fault
        return fault

    def judge_all(self):
        deadline = time.monotonic() + self.options.seconds
        numbers = ([self.options.state] if self.options.state is not None
                   else range(self.options.first, self.options.states))
        told = 0
        for start in range(0, len(numbers), ROUND):
            self.disk = Image(self.log, self.kind.size)
            chosen = [self.state(number) for number in numbers[start:start + ROUND]]
            for state in sorted(chosen, key=lambda each: each.position):
                if time.monotonic() > deadline:
                    return
                number, fault, lost = self.judge(state)
                self.judged["states"] += 1
                self.judged["points" if state.cut is None else "torn"] += 1
                if lost:
                    self.judged["lost"] += 1
                    fault = f"{fault}: but not with the write that f2fs has not awaited"
                if fault:
                    self.failures += not lost
                    print(f"{self.options.kind}: state {state.number}, in "
                          f"'{self.steps[number - 1].name}': {fault}: look at it with "
                          f"{self.options.script} --file-system {self.options.kind} --again "
                          f"--seed {self.options.seed} --state {state.number}", flush=True)
                if self.judged["states"] // 100 != told:
                    told = self.judged["states"] // 100
                    print(self.summary(), flush=True)

    def summary(self):
        return (f"{self.options.kind}: {self.judged['states']} states ({self.judged['points']} "
                f"points of {len(self.points)}, {self.judged['torn']} torn), "
                f"{len(self.devices)} different ones with {self.judged['ran']} contents, "
                f"{self.failures} broken"
                + (f", {self.judged['lost']} by f2fs" if self.judged["lost"] else ""))


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("kind", choices=KINDS)
    parser.add_argument("programs", type=pathlib.Path)
    parser.add_argument("recording", type=pathlib.Path)
    parser.add_argument("day", type=int)
    parser.add_argument("--first", type=int, default=0)
    parser.add_argument("--states", type=int, default=2000)
    parser.add_argument("--seconds", type=float, default=1e9)
    parser.add_argument("--seed", type=int, default=1)
    parser.add_argument("--state", type=int)
    parser.add_argument("--script", default="script/crash-test")
    options = parser.parse_args()
    mount_in_private()
    # Detaches the loop device.
    signal.signal(signal.SIGTERM, lambda *_: sys.exit(128 + signal.SIGTERM))
    work = pathlib.Path(tempfile.mkdtemp(prefix="tavrel_crash.", dir="/dev/shm"))
    try:
        judge = Judge(options, work)
        judge.judge_all()
    finally:
        shutil.rmtree(work)
    print(judge.summary(), flush=True)
    if not judge.judged["states"]:
        sys.exit(f"{options.kind}: nothing was judged: give more --seconds or --states")
    sys.exit(judge.failures > 0)


if __name__ == "__main__":
    main()
