#!/usr/bin/env python3
"""Measures questions about many logs: the merged distribution of one statistic, on both engines
next to the engine's own sum over the same column and connection, and the comparison of two
versions in 1,000 statistics.

    bench/fleet_question_runs.py BIN_DIRECTORY [LOGS]

With 100,000 logs, the default of LOGS, the comparison takes a file of 3.3 GB, which should fit in
memory. The CPU time of ClickHouse includes the server's.
"""

import contextlib
import os
import resource
import shutil
import sqlite3
import statistics
import subprocess
import sys
import tempfile
import time

from fleet_engine_runs import Program, Server
from wanted import Wanted

LOGS = 100_000
BLOCK_LOGS = 1000  # as many as a load files at once
RUNS = 7
TIMES = 20
KEY = "com.example.component.series_of_something.0"
SUM = f"SELECT sum(mean) FROM distributions WHERE key = '{KEY}'"
# Old servers apply a condition on a view's key late, so query the table.
SUM_ON_SERVER = f"SELECT sum(mean) FROM questions.distribution WHERE key = '{KEY}'"

# Statements that copy a block of logs, which is much faster than filing that many.
COPIES = (
    "INSERT INTO block SELECT id + :block, first_log + :logs FROM source.block",
    "INSERT INTO log SELECT id + :logs, randomblob(32), day, created, os_version, "
    "previous_os_version, config_number, whitelist_digest, task_id, language, preferred_language, "
    "region FROM source.log",
    "INSERT INTO scalar SELECT id + (:block << 39), (value * 31 + :block) % 100000 "
    "FROM source.scalar",
    "INSERT INTO distribution SELECT id + (:block << 39), minimum, maximum, mean + :block / 64.0, "
    "squared_deviations, count FROM source.distribution",
)


def medians(runs):
    """Milliseconds of wall and CPU time for one of TIMES operations."""
    return [statistics.median(column) / TIMES * 1e3 for column in zip(*runs)]


def children():
    """CPU seconds of all child programs that have ended."""
    used = resource.getrusage(resource.RUSAGE_CHILDREN)
    return used.ru_utime + used.ru_stime


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
            tables.executescript("PRAGMA cache_size = -32768; PRAGMA mmap_size = 2147418112")
            for _ in range(RUNS):
                merged.append(program("merge", f"{folder}/db", TIMES)[1:])
                wall, cpu = time.monotonic(), time.process_time()
                for _ in range(TIMES):
                    tables.execute(SUM).fetchall()
                own.append((time.monotonic() - wall, time.process_time() - cpu))
    show("SQLite", medians(merged), medians(own), wanted)


def merge_in_clickhouse(binaries, program, logs, wanted):
    merged, own, own_merge, show_all, client = [], [], [], [], []
    with tempfile.TemporaryDirectory() as folder, Server(folder) as server:
        address = server.address("questions")
        program("append", address, logs, 10_000, 4, 4)
        server.ask("OPTIMIZE TABLE questions.distribution FINAL")

        def measure(runs, work):
            before = server.cpu()
            wall, cpu = work()
            runs.append((wall, cpu + server.cpu() - before))

        def command(*words):
            before, started = children(), time.monotonic()
            for _ in range(TIMES):
                subprocess.run(words, check=True, stdout=subprocess.DEVNULL)
            return time.monotonic() - started, children() - before

        for _ in range(RUNS):
            measure(merged, lambda: program("merge", address, TIMES)[1:])
            measure(own, lambda: program("sum", address, TIMES)[1:])
            measure(own_merge, lambda: program("own", address, TIMES)[1:])
            measure(show_all, lambda: command(os.path.join(binaries, "tavrel-fleet"),
                                              "--database", address, "show", KEY))
            measure(client, lambda: command("clickhouse-client", "--port", str(server.native),
                                            "--query", SUM_ON_SERVER))
    show("ClickHouse", medians(merged), medians(own), wanted)
    ratio = medians(merged)[1] / medians(own_merge)[1]
    print(f"  its own merge of the five numbers, CPU  {medians(own_merge)[1]:.1f} ms, ratio {ratio:.2f}"
          f"{wanted.judge('fleet: merge in ClickHouse, ratio to its own merge', ratio)}\n"
          f"  whole commands, CPU: tavrel-fleet show {medians(show_all)[1]:.0f} ms, "
          f"clickhouse-client with the sum {medians(client)[1]:.0f} ms")


def copy_blocks(path, blocks):
    """Copies the only block of logs, with different values."""
    source = path + ".source"
    shutil.copy(path, source)
    with contextlib.closing(sqlite3.connect(path, isolation_level=None)) as tables:
        tables.execute("ATTACH ? AS source", (source,))
        for pragma in ("main.journal_mode = DELETE", "main.journal_mode = OFF",
                       "main.synchronous = OFF"):
            tables.execute("PRAGMA " + pragma).fetchall()
        tables.execute("BEGIN")
        for block in range(1, blocks):
            for statement in COPIES:
                tables.execute(statement, {"block": block, "logs": block * BLOCK_LOGS})
        tables.execute("COMMIT")
        tables.execute("PRAGMA main.journal_mode = WAL").fetchall()
    os.remove(source)


def check_copies(program):
    """Checks that copied logs have the same identifiers as loaded ones."""
    blocks = 3
    with tempfile.TemporaryDirectory() as folder:
        found = []
        for name, count in (("copied", 1), ("loaded", blocks)):
            program("append", f"{folder}/{name}", count * BLOCK_LOGS, BLOCK_LOGS, 5, 5)
            if name == "copied":
                copy_blocks(f"{folder}/{name}", blocks)
            with contextlib.closing(sqlite3.connect(f"{folder}/{name}")) as tables:
                found.append([tables.execute(f"SELECT id FROM {table} ORDER BY id").fetchall()
                              for table in ("block", "log", "key", "scalar", "distribution")])
        if found[0] != found[1]:
            raise SystemExit("copied logs are not as loaded ones")


def compare(binaries, program, logs, wanted):
    check_copies(program)
    with tempfile.TemporaryDirectory() as folder:
        program("append", f"{folder}/db", BLOCK_LOGS, BLOCK_LOGS, 500, 500)
        copy_blocks(f"{folder}/db", logs // BLOCK_LOGS)
        walls, cpus = [], []
        for _ in range(3):
            before, started = children(), time.monotonic()
            subprocess.run([os.path.join(binaries, "tavrel-fleet"), "--database", f"{folder}/db",
                            "compare", "4.2", "4.3"], check=True, stdout=subprocess.DEVNULL)
            walls.append(time.monotonic() - started)
            cpus.append(children() - before)
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
    merge_in_clickhouse(sys.argv[1], program, logs, wanted)
    compare(sys.argv[1], program, logs, wanted)
    sys.exit(wanted.status())


if __name__ == "__main__":
    main()
