#!/usr/bin/env python3
"""Takes one sample of all live channels of this machine, next to node_exporter if it is installed.

    bench/live_runs.py BIN_DIRECTORY
"""

import json
import os
import subprocess
import sys
import tempfile
import time
import urllib.request

from wanted import Wanted
from whole_runs import peak_mebibytes, run_once, summary

RUNS = 41
SCRAPES = 60
ADDRESS = "127.0.0.1:9199"


def values_of(report):
    """How many values a sample has: a table has one per element."""
    return sum(channel.get("elements") or 1 for channel in json.loads(report)["channels"])


def cpu_seconds(process):
    """CPU time of all threads of a running process."""
    folder = f"/proc/{process.pid}/task"
    nanoseconds = 0
    for thread in os.listdir(folder):
        with open(f"{folder}/{thread}/schedstat", encoding="ascii") as file:
            nanoseconds += int(file.read().split()[0])
    return nanoseconds / 1e9


def scrape():
    with urllib.request.urlopen(f"http://{ADDRESS}/metrics") as answer:
        return answer.read().decode()


def node_exporter():
    """Microseconds of CPU time per value that node_exporter serves; None if it is missing."""
    try:
        process = subprocess.Popen(["prometheus-node-exporter", f"--web.listen-address={ADDRESS}"],
                                   stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL)
    except FileNotFoundError:
        return None
    try:
        deadline = time.monotonic() + 20
        while True:
            try:
                text = scrape()
                break
            except OSError:
                if time.monotonic() > deadline:
                    raise SystemExit("prometheus-node-exporter does not answer")
                time.sleep(0.05)
        values = sum(1 for line in text.splitlines() if line and not line.startswith("#"))
        before = cpu_seconds(process)
        for _ in range(SCRAPES):
            scrape()
        return (cpu_seconds(process) - before) / SCRAPES / values * 1e6
    finally:
        process.kill()
        process.wait()


def main(bin_directory):
    wanted = Wanted()
    tool = os.path.join(bin_directory, "tavrelctl")
    with tempfile.TemporaryDirectory() as folder:
        environment = dict(os.environ, HOME=folder)
        command = [tool, "report", "sample", "--live", "--count", "1"]
        report = subprocess.run([*command, "--json"], env=environment, check=True,
                                stdout=subprocess.PIPE).stdout
        values = values_of(report)
        median, text = summary([run_once(command, environment)[0] for _ in range(RUNS)])
        memory = peak_mebibytes(command, environment)
    each = median * 1e3 / values
    print("One sample of everything live on this machine, as a process")
    print(f"  {values} values {text}")
    print(f"  {'CPU of a value':<28} {each:6.2f} us"
          f"{wanted.judge('live sample: CPU of one value, us', each)}")
    print(f"  {'memory':<28} {memory:6.1f} MiB{wanted.judge('live sample: memory, MiB', memory)}")
    peer = node_exporter()
    if peer is None:
        print("  prometheus-node-exporter is not installed: no figure beside")
    else:
        print(f"  {'a value of node_exporter':<28} {peer:6.2f} us, in its running process")
    sys.exit(wanted.status())


if __name__ == "__main__":
    main(sys.argv[1])
