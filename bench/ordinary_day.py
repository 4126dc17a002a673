#!/usr/bin/env python3
"""Counts the bytes that an unattended device writes to its flash on an ordinary day.

    bench/ordinary_day.py BIN_DIRECTORY

The device does what the installed timers do: it samples the machine each minute, folds each hour,
reads the health of the drives four times, and makes the daily run, the tidying and the upload of
the log once. Its store is as large as its limit of days allows, so each day removes one. Bytes
are counted at a loop device, including the file system's own blocks and journal, after each step
has been written back, as the kernel does by itself within half a minute; /run is a tmpfs. Where
loop devices are not allowed, nothing is measured. Exits with 1 when a wanted figure
(bench/wanted.py) is missed.
"""

import collections
import os
import plistlib
import subprocess
import sys

from flash import BlockDevice, call
from upload_runs import Server, permit_upload
from wanted import Wanted
from whole_runs import DAY, Device, STORE

HOURS = 24
SAMPLES_AN_HOUR = 60
DAYS_HELD = 90
DAYS = 2  # measured days; at 64 folds of one date the store would begin to join values

Step = collections.namedtuple("Step", "written cpu")


class OrdinaryDevice:
    """A device on the block device, which also unmounts its /run, and its server."""

    def __init__(self, bin_directory, block_device):
        self.flash = block_device
        origin = Device(bin_directory)
        self.device = origin.copy(block_device.mounted)
        origin.close()
        self.cpu = 0.0
        run_folder = self.device.path("run")
        os.makedirs(run_folder)
        call("mount", "-t", "tmpfs", "tmpfs", run_folder)
        for folder in ("run/tavrel/stat", "run/server"):
            os.makedirs(self.device.path(folder))
        self.server = Server(self.device.path("run/server"))
        self.upload_environment = permit_upload(self.device, self.server)

    def __enter__(self):
        self.server.__enter__()
        return self

    def __exit__(self, *_):
        self.server.__exit__()

    def program(self, name, *arguments, environment=None):
        with open(os.devnull, "r+b") as null:
            process = subprocess.Popen([os.path.join(self.device.bin, name), *arguments],
                                       env=environment or self.device.environment, stdin=null,
                                       stdout=null, stderr=null)
        _, status, usage = os.wait4(process.pid, 0)
        process.returncode = os.waitstatus_to_exitcode(status)
        if process.returncode != 0:
            raise SystemExit(f"{name} ended with status {process.returncode}")
        self.cpu += usage.ru_utime + usage.ru_stime

    def sample(self):
        for _ in range(SAMPLES_AN_HOUR):
            self.program("tavrelctl", "stat", "collect", "--once")

    def fold(self):
        self.program("tavrelctl", "stat", "fold")

    def health(self):
        self.program("tavrel-health")

    def daily_run(self):
        self.program("tavrel", "-d")

    def tidy(self):
        self.program("tavrelctl", "tidy", "--quiet")

    def upload(self):
        self.program("tavrel-upload", environment=self.upload_environment)
        if not self.server.take_logs():
            raise SystemExit("no log has arrived")

    def recorded(self, table):
        """The keys that the sampler records."""
        output = subprocess.run(
            ["sqlite3", "-readonly", self.device.path(STORE),
             f"SELECT DISTINCT CAST(key AS TEXT) FROM {table}"],
            check=True, capture_output=True, text=True).stdout
        return output.split()

    def hold(self, days):
        with open(self.device.path("etc/tavrel/limits.plist"), "wb") as file:
            file.write(plistlib.dumps({"Store": {"Days": days}}))

    def fill(self):
        """Gives the store a history, and permits each key in the log."""
        self.sample()
        self.fold()
        scalars, distributions = self.recorded("scalars"), self.recorded("distributions")
        for day in range(DAY - DAYS_HELD - DAYS + 2, DAY + 1):
            lines = [f"scalar\t{day}\t{key}\t{day * 31 % 977}\n" for key in scalars]
            lines += [f"value\t{day}\t{key}\t{second}\t{second * 31 % 977 + 0.1}\n"
                      for key in distributions for second in range(0, 86400, 60)]
            self.device.tool("stat", "import", "-", text="".join(lines))
        self.device.whitelist(scalars, distributions)
        self.hold(DAYS_HELD + DAYS)
        for step in (self.health, self.daily_run, self.tidy, self.upload):
            step()
        return len(scalars), len(distributions)

    def begin_day(self, days_held):
        """Makes it look as if the last daily run was a day ago."""
        self.device.tool("prefs", "set", "com.norvane.tallied.tavrel",
                         "LastCrashLogSerializationDateInDaysSince1970", str(DAY - 1), "--int")
        self.hold(days_held)
        self.flash.written()

    def measured(self, step):
        written, cpu = self.flash.written(), self.cpu
        step()
        return Step(self.flash.written() - written, self.cpu - cpu)

    def day(self):
        steps = collections.defaultdict(list)
        for hour in range(HOURS):
            steps["samples, 60 an hour"].append(self.measured(self.sample))
            steps["folds"].append(self.measured(self.fold))
            if hour % 6 == 0:
                steps["health of the drives"].append(self.measured(self.health))
        steps["daily run"].append(self.measured(self.daily_run))
        steps["tidying"].append(self.measured(self.tidy))
        steps["upload"].append(self.measured(self.upload))
        return steps


def total(steps):
    return Step(sum(step.written for step in steps), sum(step.cpu for step in steps))


def play(device, wanted):
    scalars, distributions = device.fill()
    print(f"An ordinary day of an unattended device, {DAYS_HELD} days in the store; a sample "
          f"gives {scalars} scalars and {distributions} measurements")
    for number in range(1, DAYS + 1):
        device.begin_day(DAYS_HELD + DAYS - number)
        steps = device.day()
        for name, figures in steps.items():
            written, cpu = total(figures)
            print(f"  {len(figures):2} x {name:24} {written:12,} bytes {cpu:8.2f} s CPU")
    written, cpu = total([step for figures in steps.values() for step in figures])
    megabytes = written / 1e6
    print(f"  the last day  {megabytes:16.2f} MB"
          f"{wanted.judge('ordinary day: written to flash, MB', megabytes)}\n"
          f"  CPU           {cpu:16.2f} s{wanted.judge('ordinary day: CPU, s', cpu)}")


def main():
    wanted = Wanted()
    block_device = BlockDevice()
    with block_device as mounted:
        if mounted is None:
            print(f"An ordinary day: not measured, no loop device: {block_device.reason}")
            return
        with OrdinaryDevice(sys.argv[1], block_device) as device:
            play(device, wanted)
    sys.exit(wanted.status())


if __name__ == "__main__":
    main()
