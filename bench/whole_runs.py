#!/usr/bin/env python3
"""Times whole processes, each in turn with its floor: the cost of the libraries alone for the same
data, or an empty program.

    bench/whole_runs.py BIN_DIRECTORY

Each command runs several times. Prints the median CPU time (user and system) with the quartiles of
the runs, the peak memory and the ratio to the floor. Other work of the machine does not count.
Instructions are counted with valgrind if it is installed. Exits with 1 when a wanted figure
(bench/wanted.py) is missed.
"""

import copy
import glob
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

from wanted import Wanted

RUNS = 15
DAY = int(time.time() // 86400) - 1
STORE = "var/mobile/Library/Brimhold/BHDataStore.sqlitedb"
WHITELIST = "Library/Application Support/Brimhold/Whitelist_Pellio.plist"
PENDING = "var/mobile/Library/Logs/Submission/pending"


class Device:
    """A device root in a temporary folder, which goes at the end of the program at the latest."""

    def __init__(self, bin_directory):
        self.bin = os.path.abspath(bin_directory)
        self.folder = tempfile.TemporaryDirectory(prefix="tavrel_whole_runs.")
        self.root = self.folder.name
        self.environment = {"PATH": os.environ["PATH"], "TAVREL_ROOT": self.root}
        self.tool("prefs", "set", "com.norvane.zentrix", "DiagnosticSubmissionEnabled", "true",
                  "--bool")

    def copy(self, folder=None):
        """Makes another device with the same content, below a folder that the caller chooses."""
        twin = copy.copy(self)
        twin.folder = tempfile.TemporaryDirectory(prefix="tavrel_whole_runs.", dir=folder)
        twin.root = twin.folder.name
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
        group = {"ScalarKeys": {key: {"bucket_interval": 10} for key in scalars},
                 "DistributionKeys": {key: options or {} for key in distributions}}
        with open(self.path(WHITELIST), "wb") as file:
            file.write(plistlib.dumps({"Group": group}))

    def daemon(self, mode):
        return [os.path.join(self.bin, "tavrel"), mode]

    def require_logs(self, count):
        """Ends the benchmark unless runs have filed that many logs: one that files none is fast."""
        filed = len(glob.glob("log-tallied-*.log", root_dir=self.path(PENDING)))
        if filed != count:
            raise SystemExit(f"{filed} logs were filed, not {count}")

    def close(self):
        self.folder.cleanup()


def run_once(command, environment):
    """Returns CPU and wall seconds of one run, whose output is discarded."""
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
    """For one run. GNU time starts it, because a process's peak includes that of its parent."""
    with tempfile.NamedTemporaryFile("r") as file:
        subprocess.run(["/usr/bin/time", "-f", "%M", "-o", file.name, *command], env=environment,
                       check=True, stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL,
                       stderr=subprocess.DEVNULL)
        return int(file.read()) / 1024


def summary(times):
    """Returns the median, and a text with the quartiles, in milliseconds."""
    low, median, high = (value * 1e3 for value in statistics.quantiles(times, n=4))
    return median, f"{median:8.2f} ms CPU ({low:.2f} to {high:.2f})"


def measure(label, command, environment, floor=None, runs=RUNS):
    """Median CPU milliseconds of a command and of its floor (label, command), and peak MiB."""
    commands = [command] if floor is None else [command, floor[1]]
    for each in commands:
        run_once(each, environment)
    times = list(zip(*([run_once(each, environment)[0] for each in commands] for _ in range(runs))))
    memory = peak_mebibytes(command, environment)
    median, text = summary(times[0])
    floor_median = 0.0
    line = f"  {label:<34} {text:<34} {memory:6.1f} MiB"
    if floor is not None:
        floor_median, floor_text = summary(times[1])
        line += f"   {median / floor_median:.2f} x the floor"
        print(f"  {floor[0]:<34} {floor_text}")
    print(line, end="")
    return median, floor_median, memory


def measured_runs(runs):
    """How often `measure` runs a command: also to warm up, and for the peak."""
    return 1 + runs + 1


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


def floor_of(device, *arguments):
    return [os.path.join(device.bin, "tavrel_floor"), *arguments]


def daily_scalars(bin_directory, wanted):
    print("\nA day of 2,000 scalars, half of them whitelisted in XML with a bucket interval each, "
          "beside 1,000,000 values not asked for")
    device = Device(bin_directory)
    device.tool("stat", "import", "-", text="".join(scalar_lines(2000) + value_lines(1000, 1000)))
    device.whitelist(scalars=[f"com.example.scalar.{i:06}" for i in range(0, 2000, 2)])
    whitelist = device.path(WHITELIST)
    floor = floor_of(device, "xml", whitelist, "md5", whitelist, "scalars", device.path(STORE),
                     str(DAY))
    median, libraries, _ = measure("tavrel -f", device.daemon("-f"), device.environment,
                                   ("Expat, MD5 and SQLite alone", floor), runs=40)
    device.require_logs(measured_runs(40))
    wanted.calibrate(libraries)
    print(wanted.judge("2,000 scalars, ms", median))
    device.close()


def nothing_to_do(bin_directory, wanted):
    print("\nA gated run with nothing to do")
    device = Device(bin_directory)
    run_once(device.daemon("-d"), device.environment)
    said = subprocess.run(device.daemon("-d"), env=device.environment, check=True, text=True,
                          capture_output=True).stderr
    if "Day unchanged since last run" not in said:  # a failing run ends with 0, too
        raise SystemExit(f"tavrel -d does something else than nothing: {said}")
    empty = [os.path.join(device.bin, "tavrel_empty")]
    median, floor, _ = measure("tavrel -d", device.daemon("-d"), device.environment,
                               ("an empty program", empty), runs=200)
    print(wanted.judge("nothing to do: ratio to an empty program", median / floor))
    device.close()


def distributions(bin_directory, wanted):
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
    median, _, _ = measure("tavrel -f", device.daemon("-f"), device.environment,
                           ("sqlite3, a row per value, indexed", ["sqlite3", table, query]))
    device.require_logs(measured_runs(RUNS))
    print(wanted.judge("1,000 distributions, ms", median))
    device.close()


SIMPLE, STATE, HISTOGRAM, SIMPLE_ARRAY = 1, 2, 3, 4
ELEMENTS = {SIMPLE: 1, STATE: 4, HISTOGRAM: 8, SIMPLE_ARRAY: 2}


def report_channels(count, formats):
    """A recording of report channels, a hundred for each driver."""
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
    """How many different channels the output mentions."""
    output = subprocess.run(command, env=environment, check=True, capture_output=True,
                            text=True).stdout
    return len(set(re.findall(r"channel \d+ of driver \d+", output)))


def report_samples(bin_directory, wanted):
    count = 10_000
    print(f"\ntavrelctl report sample --count 1, {count:,} channels of all formats")
    recording = report_channels(count, list(ELEMENTS))
    for encoding, form in (("binary", plistlib.FMT_BINARY), ("XML", plistlib.FMT_XML)):
        device = Device(bin_directory)
        path = device.path("var/lib/tavrel/registry/report.plist")
        os.makedirs(os.path.dirname(path))
        with open(path, "wb") as file:
            file.write(plistlib.dumps(recording, fmt=form))
        floor = None
        if form == plistlib.FMT_XML:
            floor = ("Expat alone", floor_of(device, "xml", path))
        for options in ([], ["--json"], ["--delta"], ["--json", "--delta"]):
            command = [os.path.join(device.bin, "tavrelctl"), "report", "sample", "--count", "1",
                       "--interval", "0", *options]
            shown = channels_shown(command, device.environment)
            if shown != count:
                raise SystemExit(f"report sample showed {shown} of {count} channels")
            median, _, memory = measure(" ".join([encoding, *options]), command,
                                        device.environment, floor)
            floor = None
            print(wanted.judge("report sample of 10,000 channels, ms", median), end="")
            print(wanted.judge("report sample of 10,000 channels, MiB", memory))
        device.close()


def growth(bin_directory):
    if not shutil.which("valgrind"):
        print("\nInstructions by number of scalars: valgrind is not installed")
        return
    print("\nInstructions of tavrel -f by number of scalars, half of them whitelisted")
    counts = {}
    for count in (1000, 10_000, 50_000):
        device = Device(bin_directory)
        device.tool("stat", "import", "-", text="".join(scalar_lines(count)))
        device.whitelist(scalars=[f"com.example.scalar.{i:06}" for i in range(0, count, 2)])
        # A first run leaves the state that every later run finds.
        run_once(device.daemon("-f"), device.environment)
        output = subprocess.run(
            ["valgrind", "--tool=callgrind", "--callgrind-out-file=/dev/null", *device.daemon("-f")],
            env=device.environment, capture_output=True, text=True, check=True).stderr
        collected = next(line for line in output.splitlines() if "Collected" in line)
        counts[count] = int(collected.split(":")[1].replace(",", ""))
        device.require_logs(2)
        device.close()
    slope = (counts[50_000] - counts[1000]) / 49_000
    for count, instructions in counts.items():
        straight = counts[1000] + slope * (count - 1000)
        print(f"  {count:>9,} scalars {instructions:15,} instructions, "
              f"{100 * (instructions / straight - 1):+5.1f} % off the straight line")
    print(f"  {slope:,.0f} instructions per scalar")


def main():
    bin_directory = sys.argv[1]
    wanted = Wanted()
    device = Device(bin_directory)
    import_rates(device)
    device.close()
    daily_scalars(bin_directory, wanted)
    nothing_to_do(bin_directory, wanted)
    distributions(bin_directory, wanted)
    report_samples(bin_directory, wanted)
    growth(bin_directory)
    sys.exit(wanted.status())


if __name__ == "__main__":
    main()
