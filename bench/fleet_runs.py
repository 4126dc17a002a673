#!/usr/bin/env python3
"""Times the loading of logs into SQLite by tavrel-fleet next to Python's plistlib, which only reads
the same files, in one process.

    bench/fleet_runs.py BIN_DIRECTORY [LOGS]

Each log has 300 rows: 220 scalars, 30 distributions and 10 histograms of 5 buckets. A second load
of ten times as many logs shows how the time of a log grows. The run fails unless each log is in the
table.
"""

import datetime
import os
import plistlib
import random
import resource
import shutil
import sqlite3
import statistics
import subprocess
import sys
import tempfile
import time

from wanted import Wanted

LOGS = 2000
RUNS = 3
PYTHON_LOGS = 200
VARIANTS = 40
STARTS = "com.example.usage.scalar.0000"
MARK = 987654321


def histogram(values):
    bounds = [40, 80, 120, 160]
    counts = {}
    for value in values:
        place = next((i for i, bound in enumerate(bounds) if value <= bound), len(bounds))
        lower = bounds[place - 1] if place else "-inf"
        label = f"({lower}, {bounds[place]}]" if place < len(bounds) else f"({lower}, inf)"
        counts[label] = counts.get(label, 0) + 1
    return counts


def log_text(numbers):
    """A log in which MARK stands for the value that distinguishes logs."""
    scalars = {f"com.example.usage.scalar.{key:04}": numbers.randrange(1000) * 10
               for key in range(220)}
    scalars[STARTS] = MARK
    distributions, histograms = {}, {}
    for key in range(30):
        values = [numbers.uniform(0, 200) for _ in range(numbers.randrange(100, 400))]
        mean = statistics.fmean(values)
        name = f"com.example.timing.distribution.{key:03}"
        distributions[name] = [min(values), max(values), mean,
                               sum((value - mean) ** 2 for value in values), len(values)]
        if key < 10:
            histograms[name] = histogram(values)
    day = datetime.datetime(2026, 11, 24) + datetime.timedelta(days=numbers.randrange(30))
    text = plistlib.dumps({
        "BHCrashLogVersion": 1, "BHStartDate": day,
        "BHLogCreationDate": day + datetime.timedelta(hours=27),
        "BHMetadata": {"BHUserInterfaceLanguage": "de", "BHUserSetRegionFormat": "AT",
                       "BHPreferredUserInterfaceLanguage": "de-AT"},
        "BHScalars": scalars, "BHDistributions": distributions,
        "BHDistributionsHistogram": histograms, "BHTasking": [],
        "BHTaskID": "(no tasking id)", "BHTaskDigest": "(no tasking digest)",
        "BHWhitelistDigest": "4c322221a9e0e0eeb68ca791ecdcbaf8"})
    # Devices write no document type.
    lines = text.split(b"\n")
    return b"\n".join(line for line in lines if not line.startswith(b"<!DOCTYPE"))


def make_logs(folder, count):
    numbers = random.Random(1)
    variants = [log_text(numbers) for _ in range(VARIANTS)]
    for i in range(count):
        device = os.path.join(folder, f"device-{i // 1000}")
        if i % 1000 == 0:
            os.makedirs(device)
        with open(os.path.join(device, f"log-tallied-20261127T000000Z-{i:08x}.log"), "wb") as file:
            file.write(variants[i % VARIANTS].replace(str(MARK).encode(), str(i).encode()))


def paths_below(folder):
    return sorted(os.path.join(path, name) for path, _, names in os.walk(folder) for name in names)


def load(program, folder, database, count):
    """Returns wall and CPU seconds, and the peak memory in MiB."""
    for ending in ("", "-wal", "-shm"):
        if os.path.exists(database + ending):
            os.remove(database + ending)
    before = resource.getrusage(resource.RUSAGE_CHILDREN)
    started = time.monotonic()
    result = subprocess.run(["/usr/bin/time", "-f", "%M", program, "--database", database, "load",
                             folder], check=True, capture_output=True, text=True)
    wall = time.monotonic() - started
    after = resource.getrusage(resource.RUSAGE_CHILDREN)
    with sqlite3.connect(database) as tables:
        if tables.execute("SELECT count(*) FROM log").fetchone() != (count,):
            raise SystemExit("not each log is in the table")
    cpu = after.ru_utime + after.ru_stime - before.ru_utime - before.ru_stime
    return wall, cpu, int(result.stderr.split()[-1]) / 1024


def read_with_python(paths):
    """Returns wall and CPU seconds of one log. By then the files are in memory."""
    started, cpu = time.monotonic(), time.process_time()
    for path in paths:
        with open(path, "rb") as file:
            plistlib.load(file)
    return (time.monotonic() - started) / len(paths), (time.process_time() - cpu) / len(paths)


def main():
    wanted = Wanted()
    program = os.path.join(os.path.abspath(sys.argv[1]), "tavrel-fleet")
    count = int(sys.argv[2]) if len(sys.argv) > 2 else LOGS
    folder = tempfile.mkdtemp(prefix="tavrel_fleet_runs.")
    try:
        few, many = os.path.join(folder, "few"), os.path.join(folder, "many")
        database = os.path.join(folder, "fleet.db")
        make_logs(few, count)
        paths = paths_below(few)
        size = sum(map(os.path.getsize, paths)) / count
        loads, reads = [], []
        for _ in range(RUNS):
            reads.append(read_with_python(paths[:PYTHON_LOGS]))
            loads.append(load(program, few, database, count))
        table_size = os.path.getsize(database) / count
        shutil.rmtree(few)
        make_logs(many, 10 * count)
        many_wall, many_cpu, many_memory = load(program, many, database, 10 * count)
    finally:
        shutil.rmtree(folder)

    wall, cpu, memory = (statistics.median(column) for column in zip(*loads))
    python_wall, python_cpu = (statistics.median(column) for column in zip(*reads))
    cores = os.cpu_count()
    share = wall / count / python_wall
    growth = many_cpu / (10 * cpu)
    print(f"Loading of {count:,} logs of {size / 1024:.1f} KiB into SQLite, on {cores} processors\n"
          f"  tavrel-fleet    wall {count / wall:8,.0f} logs/s   CPU {cpu / count * 1e6:7.1f} us"
          f"{wanted.judge('fleet load: CPU of one log, us', cpu / count * 1e6)}\n"
          f"  Python, reading wall {1 / python_wall:8,.0f} logs/s   CPU {python_cpu * 1e6:7.1f} us\n"
          f"  wall time of a log, ratio to Python {share:6.3f}"
          f"{wanted.judge('fleet load: wall time of a log, ratio to plistlib', share)}\n"
          f"  of {10 * count:,} logs: wall {10 * count / many_wall:,.0f} logs/s   "
          f"CPU of a log, ratio {growth:.2f}"
          f"{wanted.judge('fleet load: CPU of a log among ten times as many, ratio', growth)}\n"
          f"  memory {memory:.0f} MiB, {many_memory:.0f} MiB; tables {table_size / 1024:.1f} KiB a log")
    sys.exit(wanted.status())


if __name__ == "__main__":
    main()
