#!/usr/bin/env python3
"""Times a device with a long history next to one with a single day.

    bench/history_runs.py BIN_DIRECTORY

The first holds 400 days of 10,000 scalars, half of them whitelisted, and 10,000 waiting logs; the
other holds yesterday and no log. Both run in turn; the output is medians of CPU time (user and
system). Then the limits are lowered to the defaults, and the time for that is printed. Exits with 1
when a wanted figure (bench/wanted.py) is missed.
"""

import os
import plistlib
import statistics
import subprocess
import sys
from datetime import datetime, timedelta

from wanted import Wanted
from whole_runs import DAY, PENDING, RUNS, STORE, Device, run_once

DAYS = 400
KEYS = 10_000
LOGS = 10_000


def keys():
    return [f"com.example.application.counter.{i:05}" for i in range(KEYS)]


def fill(device, days):
    """Uses a pipe, because the lines of 400 days do not fit in memory."""
    command = [os.path.join(device.bin, "tavrelctl"), "stat", "import", "-"]
    with subprocess.Popen(command, env=device.environment, stdin=subprocess.PIPE, text=True,
                          stdout=subprocess.DEVNULL) as process:
        for day in range(DAY - days + 1, DAY + 1):
            process.stdin.writelines(f"scalar\t{day}\t{key}\t{day * 7}\n" for key in keys())
    if process.returncode != 0:
        raise SystemExit("the import failed")
    device.whitelist(scalars=keys()[::2])


def file_logs(device):
    folder = device.path(PENDING)
    os.makedirs(folder)
    log = plistlib.dumps({"BHCrashLogVersion": 1, "BHScalars": {key: 70 for key in keys()[:40]}})
    for i in range(LOGS):
        filed = datetime(2024, 1, 1) + timedelta(hours=i)
        path = os.path.join(folder, f"log-tallied-{filed:%Y%m%dT%H%M%SZ}-{i:08x}")
        with open(path + ".log", "wb") as file:
            file.write(log)
        with open(path + ".metadata.plist", "wb") as file:
            file.write(plistlib.dumps({"LogType": "193", "LogName": "log-tallied", "Time": filed,
                                       "OSVersion": "Pellio 4.2 (16R349)"}))


def medians(*commands):
    """Returns the median CPU milliseconds of each command (arguments and device), run in turn."""
    for arguments, device in commands:
        run_once(arguments, device.environment)
    times = [[run_once(arguments, device.environment)[0] for arguments, device in commands]
             for _ in range(RUNS)]
    return [statistics.median(column) * 1e3 for column in zip(*times)]


def main():
    wanted = Wanted()
    full, single, empty = (Device(sys.argv[1]) for _ in range(3))
    fill(full, DAYS)
    file_logs(full)
    fill(single, 1)
    size = os.path.getsize(full.path(STORE)) / 2**20
    print(f"{DAYS} days of {KEYS:,} scalars ({size:.0f} MiB) and {LOGS:,} waiting logs, beside one "
          "day and no logs")
    long, short, least = medians((full.daemon("-f"), full), (single.daemon("-f"), single),
                                 (empty.daemon("-f"), empty))
    for device, waiting in ((full, LOGS), (single, 0)):
        device.require_logs(waiting + 1 + RUNS)
    print(f"  tavrel -f          {long:8.2f} ms CPU, one day {short:.2f} ms, empty {least:.2f} ms"
          f"{wanted.judge('long history: tavrel -f, ratio to one day', long / short)}")
    tool = os.path.join(full.bin, "tavrelctl")
    for name in ("status", "log list"):
        command = [tool, *name.split()]
        long, short = medians((command, full), (command, single))
        print(f"  tavrelctl {name:<8} {long:8.2f} ms CPU, one day {short:.2f} ms"
              f"{wanted.judge('long history: ' + name + ', ms', long)}")
    for label in ("beyond the limits", "within them"):
        cpu, wall = run_once([tool, "tidy", "--quiet"], full.environment)
        print(f"  tavrelctl tidy, {label:<18} {cpu * 1e3:8.0f} ms CPU, {wall:.1f} s")
    for device in (full, single, empty):
        device.close()
    sys.exit(wanted.status())


if __name__ == "__main__":
    main()
