#!/usr/bin/env python3
"""Measures questions about many logs: the merged distribution of one statistic, on both engines
beside the engine's own sum over the same column, and the comparison of two versions in 1,000
statistics.

    bench/fleet_question_runs.py BIN_DIRECTORY [LOGS]

With 100,000 logs, unless LOGS says otherwise, the comparison takes a file of 3.3 GB, which should
fit into memory. The CPU time of ClickHouse includes the server's.
"""

import os
import resource
import sqlite3
import statistics
import subprocess
import sys
import tempfile
import time

from fleet_engine_runs import Program, Server
from wanted import Wanted

LOGS = 100_000
RUNS = 7
TIMES = 5
KEY = "com.example.component.series_of_something.0"
SUM = f"SELECT sum(mean) FROM distributions WHERE key = '{KEY}'"
# Old servers apply the condition on a view's key late.
SUM_ON_SERVER = f"SELECT sum(mean) FROM questions.distribution WHERE key = '{KEY}'"


def medians(runs):
    """Milliseconds of the clock and of the processors, of one of TIMES."""
    return [statistics.median(column) / TIMES * 1e3 for column in zip(*runs)]


def show(engine, merged, own, wanted):
    print(f"{engine}: merged distribution of one statistic, beside sum(mean)\n"
          f"  wall  {merged[0]:.1f} ms, {own[0]:.1f} ms, ratio {merged[0] / own[0]:.2f}\n"
          f"  CPU   {merged[1]:.1f} ms, {own[1]:.1f} ms, ratio {merged[1] / own[1]:.2f}"
          f"{wanted.judge(f'fleet: merge in {engine}, ratio to its sum', merged[1] / own[1])}")


def merge_in_sqlite(program, logs, wanted):
    merged, own = [], []
    with tempfile.TemporaryDirectory() as folder:
        program("append", f"{folder}/db", logs, 1000, 4, 4)
        with sqlite3.connect(f"{folder}/db") as tables:
            for _ in range(RUNS):
                merged.append(program("merge", f"{folder}/db", TIMES)[1:])
                wall, cpu = time.monotonic(), time.process_time()
                for _ in range(TIMES):
                    tables.execute(SUM).fetchall()
                own.append((time.monotonic() - wall, time.process_time() - cpu))
    show("SQLite", medians(merged), medians(own), wanted)


def merge_in_clickhouse(program, logs, wanted):
    merged, own = [], []
    with tempfile.TemporaryDirectory() as folder, Server(folder) as server:
        program("append", server.address("questions"), logs, 10_000, 4, 4)
        server.ask("OPTIMIZE TABLE questions.distribution FINAL")
        for _ in range(RUNS):
            before = server.cpu()
            _, wall, cpu = program("merge", server.address("questions"), TIMES)
            merged.append((wall, cpu + server.cpu() - before))
            wall, cpu, before = time.monotonic(), time.process_time(), server.cpu()
            for _ in range(TIMES):
                server.ask(SUM_ON_SERVER)
            own.append((time.monotonic() - wall,
                        time.process_time() - cpu + server.cpu() - before))
    show("ClickHouse", medians(merged), medians(own), wanted)


def compare(binaries, program, logs, wanted):
    with tempfile.TemporaryDirectory() as folder:
        program("append", f"{folder}/db", logs, 1000, 500, 500)
        walls, cpus = [], []
        for _ in range(3):
            before, started = resource.getrusage(resource.RUSAGE_CHILDREN), time.monotonic()
            subprocess.run([os.path.join(binaries, "tavrel-fleet"), "--database", f"{folder}/db",
                            "compare", "4.2", "4.3"], check=True, stdout=subprocess.DEVNULL)
            walls.append(time.monotonic() - started)
            after = resource.getrusage(resource.RUSAGE_CHILDREN)
            cpus.append(after.ru_utime + after.ru_stime - before.ru_utime - before.ru_stime)
    wall, cpu = statistics.median(walls), statistics.median(cpus)
    million = 1000 * logs / 1e6
    print(f"compare of 1,000 statistics over {logs:,} logs, SQLite, {os.cpu_count()} processors\n"
          f"  wall  {wall:.1f} s"
          f"{wanted.judge('fleet compare: wall of a million rows, s', wall / million)}\n"
          f"  CPU   {cpu:.1f} s, {cpu / million * 1e3:.0f} ms a million rows")


def main():
    wanted = Wanted()
    program = Program(sys.argv[1])
    logs = int(sys.argv[2]) if len(sys.argv) > 2 else LOGS
    merge_in_sqlite(program, logs, wanted)
    merge_in_clickhouse(program, logs, wanted)
    compare(sys.argv[1], program, logs, wanted)
    sys.exit(wanted.status())


if __name__ == "__main__":
    main()
