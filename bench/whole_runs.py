#!/usr/bin/env python3
"""Times whole processes, beside the sqlite3 tool on the same data where it can do the same.

    bench/whole_runs.py BIN_DIRECTORY

Each command runs several times; printed are the median CPU time (user and system), the peak memory
and the ratio to the baseline. Times of the machine's other work do not count. Instructions are
counted with valgrind, where it is installed.
"""

import copy
import os
import plistlib
import random
import re
import shutil
import statistics
import struct
import subprocess
import sys
import tempfile
import time

RUNS = 15
DAY = int(time.time() // 86400) - 1
STORE = "var/mobile/Library/Brimhold/BHDataStore.sqlitedb"
WHITELIST = "Library/Application Support/Brimhold/Whitelist_Pellio.plist"


class Device:
    """A device root in a temporary folder."""

    def __init__(self, bin_directory):
        self.bin = os.path.abspath(bin_directory)
        self.root = tempfile.mkdtemp(prefix="tavrel_whole_runs.")
        self.environment = {"PATH": os.environ["PATH"], "TAVREL_ROOT": self.root}
        self.tool("prefs", "set", "com.norvane.zentrix", "DiagnosticSubmissionEnabled", "true",
                  "--bool")

    def copy(self):
        """Another device with the same content."""
        twin = copy.copy(self)
        twin.root = tempfile.mkdtemp(prefix="tavrel_whole_runs.")
        twin.environment = {**self.environment, "TAVREL_ROOT": twin.root}
        shutil.copytree(self.root, twin.root, dirs_exist_ok=True)
        return twin

    def path(self, name):
        return os.path.join(self.root, name)

    def tool(self, *arguments, text=None):
        subprocess.run([os.path.join(self.bin, "tavrelctl"), *arguments], env=self.environment,
                       input=text, check=True, text=True, stdout=subprocess.DEVNULL)

    def whitelist(self, scalars=(), distributions=(), options=None):
        os.makedirs(os.path.dirname(self.path(WHITELIST)), exist_ok=True)
        group = {"ScalarKeys": {key: {} for key in scalars},
                 "DistributionKeys": {key: options or {} for key in distributions}}
        with open(self.path(WHITELIST), "wb") as file:
            file.write(plistlib.dumps({"Group": group}, fmt=plistlib.FMT_BINARY))

    def daemon(self, mode):
        return [os.path.join(self.bin, "tavrel"), mode]

    def close(self):
        shutil.rmtree(self.root)


def run_once(command, environment):
    """CPU and wall seconds of one run whose output is thrown away."""
    with open(os.devnull, "r+b") as null:
        started = time.monotonic()
        process = subprocess.Popen(command, env=environment, stdin=null, stdout=null, stderr=null)
        _, status, usage = os.wait4(process.pid, 0)
        wall = time.monotonic() - started
    process.returncode = os.waitstatus_to_exitcode(status)
    if process.returncode != 0:
        raise SystemExit(f"{command[0]} ended with status {process.returncode}")
    return usage.ru_utime + usage.ru_stime, wall


def peak_mebibytes(command, environment):
    """Of one run. GNU time starts it, since a process counts the memory of the one it came from."""
    with tempfile.NamedTemporaryFile("r") as file:
        subprocess.run(["/usr/bin/time", "-f", "%M", "-o", file.name, *command], env=environment,
                       check=True, stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL,
                       stderr=subprocess.DEVNULL)
        return int(file.read()) / 1024


def measure(label, command, environment, baseline=None, runs=RUNS):
    run_once(command, environment)
    results = [run_once(command, environment) for _ in range(runs)]
    cpu, wall = (statistics.median(column) for column in zip(*results))
    memory = peak_mebibytes(command, environment)
    ratio = f"   ratio {cpu / baseline:6.2f}" if baseline else ""
    print(f"  {label:<44} {cpu * 1e3:8.2f} ms CPU {wall * 1e3:8.2f} ms {memory:7.1f} MiB"
          f"{ratio}")
    return cpu


def scalar_lines(count):
    return [f"scalar\t{DAY}\tcom.example.scalar.{i:06}\t{i * 7919}\n" for i in range(count)]


def value_lines(keys, values):
    generator = random.Random(7)
    return [f"value\t{DAY}\tcom.example.distribution.{key:04}\t{i % 86400}\t"
            f"{generator.gauss(100, 40):.17g}\n" for key in range(keys) for i in range(values)]


def import_rates(device):
    print("tavrelctl stat import, lines per second of wall time")
    for label, lines in (("scalars", scalar_lines(200_000)), ("values", value_lines(1000, 1000))):
        path = device.path(f"{label}.tsv")
        with open(path, "w", encoding="ascii") as file:
            file.writelines(lines)
        command = [os.path.join(device.bin, "tavrelctl"), "stat", "import", path]
        _, wall = run_once(command, device.environment)
        print(f"  {label:<44} {len(lines) / wall:12,.0f} lines/s")


def daily_scalars(bin_directory):
    print("\nA day of 2,000 scalars, half of them whitelisted, beside 1,000,000 values not asked for")
    device = Device(bin_directory)
    device.tool("stat", "import", "-", text="".join(scalar_lines(2000) + value_lines(1000, 1000)))
    device.whitelist(scalars=[f"com.example.scalar.{i:06}" for i in range(0, 2000, 2)])
    query = f"SELECT key, value FROM scalars WHERE day = {DAY}"
    baseline = measure("sqlite3 reading the same scalars",
                       ["sqlite3", "-readonly", device.path(STORE), query], device.environment)
    measure("tavrel -f", device.daemon("-f"), device.environment, baseline)
    device.close()


def nothing_to_do(bin_directory):
    print("\nA gated run with nothing to do")
    device = Device(bin_directory)
    run_once(device.daemon("-d"), device.environment)
    measure("tavrel -d", device.daemon("-d"), device.environment, runs=50)
    measure("/bin/true", ["/bin/true"], device.environment, runs=50)
    device.close()


def distributions(bin_directory):
    print("\n1,000 distributions of 1,000 values, all whitelisted with 20 boundaries each")
    device = Device(bin_directory)
    lines = value_lines(1000, 1000)
    device.tool("stat", "import", "-", text="".join(lines))
    device.whitelist(distributions=[f"com.example.distribution.{i:04}" for i in range(1000)],
                     options={"intervals": [10.0 * i for i in range(1, 21)]})
    table = device.path("plain.sqlite")
    create = "CREATE TABLE plain (day INTEGER, key TEXT, seconds INTEGER, value REAL)"
    subprocess.run(["sqlite3", table, create, ".mode tabs", ".import /dev/stdin plain"], text=True,
                   check=True, input="".join(line.split("\t", 1)[1] for line in lines))
    subprocess.run(["sqlite3", table, "CREATE INDEX by_day ON plain (day, key, value); ANALYZE;"],
                   check=True)
    query = ("SELECT key, min(value), max(value), avg(value), count(*) FROM plain "
             f"WHERE day = {DAY} GROUP BY key")
    baseline = measure("sqlite3, one row per value, covering index", ["sqlite3", table, query],
                       device.environment, runs=7)
    measure("tavrel -f", device.daemon("-f"), device.environment, baseline, runs=7)
    device.close()


SIMPLE, STATE, HISTOGRAM, SIMPLE_ARRAY = 1, 2, 3, 4
ELEMENTS = {SIMPLE: 1, STATE: 4, HISTOGRAM: 8, SIMPLE_ARRAY: 2}


def report_channels(count, formats):
    """A recording of report channels, of which drivers have a hundred each."""
    services, hub = [], []
    for driver in range(1, count // 100 + 1):
        legend = []
        for kind in formats:
            info = {"IOReportChannelUnit": 0}
            if kind == HISTOGRAM:
                info["IOReportChannelConfig"] = struct.pack("<IIIi", 100, 0, 0, ELEMENTS[kind])
            legend.append({"IOReportGroupName": "Disk", "IOReportSubGroupName": f"Format {kind}",
                           "IOReportChannelInfo": info, "IOReportChannels": []})
        for channel in range(1, 101):
            position = channel % len(formats)
            elements = ELEMENTS[formats[position]]
            word = formats[position] | 1 << 16 | elements << 32
            legend[position]["IOReportChannels"].append(
                [channel, word, f"channel {channel} of driver {driver}"])
            content = b"".join(struct.pack("<QQQQ4q", driver, channel, word, 1, 100 * i, i, i, i)
                               for i in range(1, elements + 1))
            hub.append({"DriverID": driver, "ChannelID": channel, "Elements": content})
        services.append({"Class": "Disk", "EntryID": driver, "Properties": {
            "IOReportLegendPublic": True, "IOReportLegend": legend}})
    return {"Services": services, "Hub": {"Channels": hub}}


def channels_shown(command, environment):
    """How many channels the output tells of, each once."""
    output = subprocess.run(command, env=environment, check=True, capture_output=True,
                            text=True).stdout
    return len(set(re.findall(r"channel \d+ of driver \d+", output)))


def report_samples(bin_directory):
    count = 10_000
    print(f"\ntavrelctl report sample --count 1, {count:,} channels "
          "(wanted: <= 100 ms, < 64 MiB)")
    for label, formats in (("simple", [SIMPLE]), ("all formats", list(ELEMENTS))):
        recording = report_channels(count, formats)
        for encoding, form in (("binary", plistlib.FMT_BINARY), ("XML", plistlib.FMT_XML)):
            device = Device(bin_directory)
            path = device.path("var/lib/tavrel/registry/report.plist")
            os.makedirs(os.path.dirname(path))
            with open(path, "wb") as file:
                file.write(plistlib.dumps(recording, fmt=form))
            for options in ([], ["--json"]):
                command = [os.path.join(device.bin, "tavrelctl"), "report", "sample", "--count",
                           "1", *options]
                shown = channels_shown(command, device.environment)
                if shown != count:
                    raise SystemExit(f"report sample showed {shown} of {count} channels")
                measure(" ".join([label, encoding, *options]), command, device.environment)
            device.close()


def growth(bin_directory):
    if not shutil.which("valgrind"):
        print("\nInstructions by number of scalars: valgrind is not installed")
        return
    print("\nInstructions of tavrel -f by number of scalars, half of them whitelisted")
    counts = {}
    for count in (1000, 10_000, 100_000):
        device = Device(bin_directory)
        device.tool("stat", "import", "-", text="".join(scalar_lines(count)))
        device.whitelist(scalars=[f"com.example.scalar.{i:06}" for i in range(0, count, 2)])
        # One run first: it leaves what every later run finds.
        run_once(device.daemon("-f"), device.environment)
        output = subprocess.run(
            ["valgrind", "--tool=callgrind", "--callgrind-out-file=/dev/null", *device.daemon("-f")],
            env=device.environment, capture_output=True, text=True, check=True).stderr
        collected = next(line for line in output.splitlines() if "Collected" in line)
        counts[count] = int(collected.split(":")[1].replace(",", ""))
        device.close()
    slope = (counts[100_000] - counts[1000]) / 99_000
    for count, instructions in counts.items():
        straight = counts[1000] + slope * (count - 1000)
        print(f"  {count:>9,} scalars {instructions:15,} instructions, "
              f"{100 * (instructions / straight - 1):+5.1f} % off the straight line")
    print(f"  {slope:,.0f} instructions per scalar")


def main():
    bin_directory = sys.argv[1]
    device = Device(bin_directory)
    import_rates(device)
    device.close()
    daily_scalars(bin_directory)
    nothing_to_do(bin_directory)
    distributions(bin_directory)
    report_samples(bin_directory)
    growth(bin_directory)


if __name__ == "__main__":
    main()
