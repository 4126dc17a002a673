#!/usr/bin/env python3
"""Measures the fleet's tables: filing logs of 300 rows in SQLite next to plain inserts of the same
rows, in ClickHouse next to clickhouse-client with the same rows from files, and reading them.

    bench/fleet_engine_runs.py BIN_DIRECTORY [LOGS]

The CPU time of ClickHouse includes the server's. LOGS, 100,000 by default, is
the size of the large file.
"""

import os
import socket
import statistics
import subprocess
import sys
import tempfile
import time
import urllib.request

from wanted import Wanted

LOGS = 10_000
RUNS = 3
TABLES = ("key", "scalar", "distribution", "cell", "log")
CONFIG = """<yandex><logger><level>warning</level><log>{folder}/log</log></logger>
<http_port>{http}</http_port><tcp_port>{native}</tcp_port><listen_host>127.0.0.1</listen_host>
<path>{folder}/data/</path><tmp_path>{folder}/tmp/</tmp_path>
<users_config>users.xml</users_config><default_profile>default</default_profile>
<default_database>default</default_database><mark_cache_size>67108864</mark_cache_size></yandex>"""
USERS = """<yandex><profiles><default/></profiles><quotas><default/></quotas><users><default>
<password/><networks><ip>127.0.0.1</ip></networks><profile>default</profile><quota>default</quota>
</default></users></yandex>"""


class Figure:
    """Medians over several runs."""

    def __init__(self):
        self.walls = []
        self.cpus = []

    def add(self, wall, cpu):
        self.walls.append(wall)
        self.cpus.append(cpu)

    @property
    def wall(self):
        return statistics.median(self.walls)

    @property
    def cpu(self):
        return statistics.median(self.cpus)


class Program:
    def __init__(self, binaries):
        self.path = os.path.join(binaries, "tavrel_fleet_rows")

    def __call__(self, *arguments):
        """Returns the count, wall seconds and CPU seconds that the program prints."""
        output = subprocess.run([self.path, *map(str, arguments)], check=True, text=True,
                                stdout=subprocess.PIPE).stdout.split()
        return int(output[1]), float(output[2]), float(output[3])


def free_port():
    with socket.create_server(("127.0.0.1", 0)) as free:
        return free.getsockname()[1]


class Server:
    def __init__(self, folder):
        self.http, self.native = free_port(), free_port()
        for name, text in (("config.xml", CONFIG), ("users.xml", USERS)):
            with open(f"{folder}/{name}", "w", encoding="ascii") as file:
                file.write(text.format(folder=folder, http=self.http, native=self.native))
        self.folder = folder
        self.process = subprocess.Popen(["clickhouse-server", f"--config-file={folder}/config.xml"],
                                        stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL)

    def __enter__(self):
        deadline = time.monotonic() + 30
        while True:
            try:
                self.ask("SELECT 1")
                return self
            except OSError:
                if time.monotonic() > deadline:
                    self.__exit__()
                    raise
                time.sleep(0.05)

    def __exit__(self, *_):
        self.process.kill()
        self.process.wait()

    def ask(self, statement):
        with urllib.request.urlopen(f"http://127.0.0.1:{self.http}/", statement.encode()) as answer:
            return answer.read()

    def address(self, database):
        return f"clickhouse://127.0.0.1:{self.http}/{database}"

    def cpu(self):
        with open(f"/proc/{self.process.pid}/stat", encoding="ascii") as file:
            fields = file.read().rsplit(")", 1)[1].split()
        return (int(fields[11]) + int(fields[12])) / os.sysconf("SC_CLK_TCK")

    def save(self, database):
        """Saves the rows of a database as files, ordered by log."""
        for table in TABLES:
            order = "name" if table == "key" else "log"
            with open(f"{self.folder}/{table}.rows", "wb") as file:
                file.write(self.ask(
                    f"SELECT * FROM {database}.{table} ORDER BY {order} FORMAT RowBinary"))

    def insert_saved(self, database):
        """Has clickhouse-client insert the saved rows. Returns wall and CPU seconds."""
        begin, before, server = time.monotonic(), os.times(), self.cpu()
        for table in TABLES:
            with open(f"{self.folder}/{table}.rows", "rb") as file:
                subprocess.run(["clickhouse-client", "--port", str(self.native), "--query",
                                f"INSERT INTO {database}.{table} FORMAT RowBinary"],
                               check=True, stdin=file)
        after = os.times()
        cpu = sum(after[2:4]) - sum(before[2:4]) + self.cpu() - server
        return time.monotonic() - begin, cpu


def measure_sqlite(program, wanted, large):
    append, floor, scan = Figure(), Figure(), Figure()
    for _ in range(RUNS):
        with tempfile.TemporaryDirectory() as folder:
            floor.add(*program("floor", f"{folder}/floor", LOGS)[1:])
            append.add(*program("append", f"{folder}/db", LOGS)[1:])
            size = os.path.getsize(f"{folder}/db")
            rows, *seconds = program("scan", f"{folder}/db")
            scan.add(*seconds)
    milliseconds = append.cpu / LOGS * 1e3
    per_thousand = scan.cpu / rows * 1e6
    print(f"SQLite, {LOGS:,} logs of 300 rows")
    print(f"  CPU of a log       {milliseconds:.3f} ms, {1e3 / milliseconds:,.0f} logs/s"
          f"{wanted.judge('fleet: filing a log, ms', milliseconds)}")
    print(f"  to plain inserts   {append.cpu / floor.cpu:.2f}"
          f"{wanted.judge('fleet: filing, ratio to plain inserts', append.cpu / floor.cpu)}")
    print(f"  wall               {LOGS / append.wall:,.0f} logs/s; plain inserts "
          f"{LOGS / floor.wall:,.0f}")
    print(f"  size of a log      {size / LOGS / 1e3:.2f} kB")
    print(f"  CPU of 1,000 rows read  {per_thousand:.3f} ms"
          f"{wanted.judge('fleet: 1,000 rows read, ms', per_thousand)}")
    with tempfile.TemporaryDirectory() as folder:
        _, _, cpu = program("append", f"{folder}/one", 500, 1)
        print(f"  CPU of a log that is appended alone  {cpu / 500 * 1e3:.2f} ms")
        _, wall, cpu = program("append", f"{folder}/db", large)
        print(f"  of {large:,} logs  CPU {cpu / large * 1e3:.3f} ms a log, wall "
              f"{large / wall:,.0f} logs/s")
        rows, wall, cpu = program("scan", f"{folder}/db", 2)
        print(f"  {rows / 1e6:.0f} million rows, two readers  wall {wall:.2f} s, CPU {cpu:.2f} s")


def measure_clickhouse(program, wanted):
    append, client, scan = Figure(), Figure(), Figure()
    with tempfile.TemporaryDirectory() as folder, Server(folder) as server:
        for run in range(RUNS):
            # Opening makes the tables, so do that before the measurement.
            for database in (f"ours{run}", f"client{run}"):
                program("append", server.address(database), 0)
            before = server.cpu()
            _, wall, cpu = program("append", server.address(f"ours{run}"), LOGS)
            append.add(wall, cpu + server.cpu() - before)
            server.save(f"ours{run}")
            client.add(*server.insert_saved(f"client{run}"))
            rows, *seconds = program("scan", server.address(f"ours{run}"))
            scan.add(*seconds)
        size = int(server.ask("SELECT sum(bytes) FROM system.parts WHERE active AND "
                              "database = 'ours0'"))
    ratio = append.cpu / client.cpu
    print(f"ClickHouse, {LOGS:,} logs of 300 rows")
    print(f"  CPU, ratio to its client  {ratio:.2f}"
          f"{wanted.judge('fleet: filing in ClickHouse, ratio to its client', ratio)}")
    print(f"  wall, ratio               {append.wall / client.wall:.2f}; {LOGS / append.wall:,.0f} "
          "logs/s")
    print(f"  size of a log             {size / LOGS / 1e3:.2f} kB")
    print(f"  wall of 1,000 rows read   {scan.wall / rows * 1e6:.3f} ms")


def main():
    wanted = Wanted()
    program = Program(sys.argv[1])
    measure_sqlite(program, wanted, int(sys.argv[2]) if len(sys.argv) > 2 else 100_000)
    measure_clickhouse(program, wanted)
    sys.exit(wanted.status())


if __name__ == "__main__":
    main()
