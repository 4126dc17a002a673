"""Checks what must hold after a power cut in a step, and after the run that follows it."""

import pathlib
import shutil
import subprocess

from contents import Broken, Contents
from days import LAST_DAY

# These counts of tidying are written when it ends.
COUNTS = "com.norvane.tavrel.limits."
PERMISSION = ("com.norvane.zentrix.plist", "DiagnosticSubmissionEnabled")


def differing(what, found, allowed):
    """Fails on entries that match none of the allowed ones."""
    keys = set(found).union(*allowed)
    wrong = [key for key in sorted(keys, key=str)
             if found.get(key) not in [one.get(key) for one in allowed]]
    if wrong:
        key = wrong[0]
        raise Broken(f"{what}: {len(wrong)} differ, such as {key}: {found.get(key)!r:.80}, not "
                     + " or ".join(f"{one.get(key)!r:.80}" for one in allowed))


def without_counts(statistics):
    return {key: value for key, value in statistics.items() if not key[1].startswith(COUNTS)}


def one_of(what, found, allowed):
    """Fails unless the whole matches one of the allowed ones."""
    if found not in allowed:
        differing(what, found, allowed)
        raise Broken(f"{what}: only a part of the changes is there")


def require(what, wanted, found):
    missing = sorted(map(str, set(wanted) - set(found)))
    if missing:
        raise Broken(f"{what}: {len(missing)} missing, such as {missing[0]:.200}")


def contents_of(logs):
    return {content for content, _, _ in logs}


class Undisturbed:
    """The device without a power cut: after each step, and after the run that follows a step."""

    def __init__(self, folder, work, steps, device):
        self.folder, self.work, self.steps, self.device = pathlib.Path(folder), work, steps, device
        self.after = [Contents(self.folder / str(number), work / "scratch")
                      for number in range(len(steps) + 1)]
        self.ends = {}
        self.known = {}  # the content of each log that ever existed
        for contents in self.after:
            self.known.update(contents.logs)

    def end(self, number, done):
        """The state after the next run, with the step's changes (done is 1) or without them (0)."""
        if (number, done) not in self.ends:
            shutil.rmtree(self.device.root)
            shutil.copytree(self.folder / str(number - 1 + done), self.device.root, symlinks=True)
            self.device.next_run(self.steps[number - 1])
            end = Contents(self.device.root, self.work / "scratch")
            if end.run is None or not end.run["Finished"] or end.run["Errors"]:
                raise RuntimeError(f"the undisturbed run after step {number} says {end.run}")
            self.ends[number, done] = end
        return self.ends[number, done]

    def fault(self, device, number, received):
        """Returns what is broken after a power cut in the step; performs the next run."""
        try:
            self.check_cut(number, Contents(device.root, self.work / "scratch"), received)
            device.next_run(self.steps[number - 1])
            self.check_end(number, Contents(device.root, self.work / "scratch"), received)
            return None
        except (Broken, RuntimeError, OSError, subprocess.TimeoutExpired) as error:
            return str(error)

    def check_cut(self, number, found, received):
        """Checks the device before anything runs again."""
        step, before, after = self.steps[number - 1], self.after[number - 1], self.after[number]
        compare = one_of if step.whole else differing
        compare("statistics", found.statistics, (before.statistics, after.statistics))
        compare("preferences", found.preferences, (before.preferences, after.preferences))
        for name, content in found.logs.items():
            if content != self.known.get(name):
                raise Broken(f"log {name} has another content")
        lost = set(before.logs) - set(found.logs) - received
        if lost and found.preferences.get(PERMISSION, True):
            raise Broken(f"{sorted(lost)[0]} is lost")
        require("records", before.records & after.records, found.records)
        require("records of the step", found.records, before.records | after.records)
        if found.torn and before.records == after.records:
            raise Broken(f"{found.torn[0]} has become torn")
        recorded = b"".join(line for name, line in found.records if name.startswith("172-"))
        for event in self.after[0].events - found.events:
            if b'"id":%d,' % int(event.split(".")[0]) not in recorded:
                raise Broken(f"the ECC event {event} is neither recorded nor waiting")
        if before.preferences.get(LAST_DAY) != found.preferences.get(LAST_DAY):
            done = "the day counts as done"
            one_of(f"{done}, statistics", found.statistics, (after.statistics,))
            one_of(f"{done}, preferences", found.preferences, (after.preferences,))
            require(f"{done}, records", after.records, found.records)
            require(f"{done}, logs", after.logs, set(found.logs) | received)

    def check_end(self, number, found, received):
        """Checks the device after the next run."""
        ends = [self.end(number, done) for done in (0, 1)]
        rows, *allowed = [{**without_counts(one.statistics), **one.preferences}
                          for one in (found, *ends)]
        compare = one_of if self.steps[number - 1].whole else differing
        compare("statistics and preferences at the end", rows, allowed)
        confirmed = [self.known[name] for name in received - set(found.logs)]
        every = [*found.logs.values(), *confirmed]
        logs, changes = [log[0] for log in every], [log[1] for log in every]
        wanted = [contents_of(end.logs.values()) for end in ends]
        require("logs at the end", wanted[0] & wanted[1], logs)
        # A repeated run finds its own tasking in force.
        require("taskings in logs", [log[2] for log in every],
                [log[2] for end in (*self.after, *ends) for log in end.logs.values()])
        require("logs of the end", logs, wanted[0] | wanted[1] | contents_of(self.known.values()))
        for content in set(logs):
            if logs.count(content) > 2 + (self.steps[number - 1].name == "forced run"):
                raise Broken(f"a log is there {logs.count(content)} times: {content:.80}")
        for change in {change for end in ends for _, change, _ in end.logs.values() if change}:
            allowed = [[told for _, told, _ in end.logs.values()].count(change) for end in ends]
            if "run" in self.steps[number - 1].name:
                allowed.append(0)  # a run notes a change before it files the log that reports it
            if changes.count(change) not in allowed:
                raise Broken(f"the change from {change} is reported {changes.count(change)} times")
        require("records at the end", ends[0].records & ends[1].records, found.records)
        require("records of the end", found.records, ends[0].records | ends[1].records)
        if found.torn:
            raise Broken(f"{found.torn[0]} is torn at the end")
        if found.run is None or found.run["Errors"] or (
                ends[0].preferences[LAST_DAY] != self.after[number].preferences.get(LAST_DAY)
                and not found.run["Finished"]):
            raise Broken(f"the next run: {found.run}")
