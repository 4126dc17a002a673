#!/usr/bin/env python3
"""Times a whole day of a busy device: one gated run of the daemon that does all of its tasks.

    bench/whole_day.py BIN_DIRECTORY

Prints the CPU time (median of several days, each on a new device), the peak memory, the bytes
written next to the bytes of content, and the number of flushes (if strace is installed).
Bytes are counted at a block device where loop devices are allowed, and otherwise taken from
the kernel's account of the process. Then each number of the day is increased separately, to
show the cost of one more.
"""

import collections
import os
import plistlib
import random
import shutil
import statistics
import struct
import subprocess
import sys
import tempfile

from flash import BlockDevice
from whole_runs import DAY, Device, STORE, peak_mebibytes, scalar_lines, value_lines

RUNS = 5
EXAMPLES = os.path.join(os.path.dirname(os.path.abspath(__file__)), "../docs/examples")
REGISTRY = "var/lib/tavrel/registry/day.plist"
ECC_FOLDER = "var/lib/tavrel/ecc-events"

Day = collections.namedtuple(
    "Day", "scalars distributions values channels telemetry defects ecc_events")
BUSY = Day(scalars=2000, distributions=200, values=5000, channels=500, telemetry=8, defects=1000,
           ecc_events=10)

STATISTICS, BAND_STATISTICS, DEFECTS, TELEMETRY = 13, 11, 15, 17  # the driver's selectors
SIZE_QUERY = 1  # a flag of a request
ASP_METHOD = 8


def telemetry_list(channels, generator):
    return generator.randbytes(channels * (4096 + 32))


def defects_list(count, generator):
    return struct.pack("<III", 0, 12, count) + generator.randbytes(28 * count)


def validity_list():
    records = [struct.pack("<Ii12x", i % 16, i) for i in range(64)]
    return struct.pack("<III", len(records), 0, 0) + b"".join(records)


def driver(day, generator):
    """A storage driver: the answer of each of its lists to a query of the size and to a fetch."""
    with open(os.path.join(EXAMPLES, "nand/statistics.bin"), "rb") as file:
        lists = {(STATISTICS, 0): file.read(), (BAND_STATISTICS, 0): validity_list(),
                 (DEFECTS, 0): defects_list(day.defects, generator)}
    for part in range(3):
        lists[TELEMETRY, part] = telemetry_list(day.telemetry, generator)
    methods = []
    for (selector, part), content in lists.items():
        flags = part << 2
        methods.append({"Method": ASP_METHOD, "Selector": selector, "Flags": flags | SIZE_QUERY,
                        "Output": struct.pack("<I", len(content))})
        methods.append({"Method": ASP_METHOD, "Selector": selector, "Flags": flags,
                        "Output": content})
    return {"Class": "ASPStorage", "EntryID": 1, "Methods": methods,
            "Properties": {"Device Characteristics": {
                "chip-id": "K4V", "manufacturer-id": "AD825223215F", "num-bus": day.telemetry}}}


def registry(day, generator):
    kind = 1 | 0x0100 << 16 | 1 << 32  # simple, storage category, one element
    identifiers = [i << 8 | 1 for i in range(day.channels)]
    legend = [{"IOReportGroupName": "Flash", "IOReportChannels":
               [[channel, kind, f"channel {channel}"] for channel in identifiers]}]
    reporter = {"Class": "FlashReporter", "EntryID": 2, "Properties": {
        "IOReportLegendPublic": True, "IOReportLegend": legend}}
    elements = [{"DriverID": 2, "ChannelID": channel,
                 "Elements": struct.pack("<QQQQqqqq", 2, channel, kind, 1, channel, 0, 0, 0)}
                for channel in identifiers]
    return {"Services": [driver(day, generator), reporter], "Hub": {"Channels": elements}}


def write(path, content):
    os.makedirs(os.path.dirname(path), exist_ok=True)
    with open(path, "wb") as file:
        file.write(content)


def make_store(bin_directory, scalars, distributions, values):
    """A device that has only statistics, all of them whitelisted."""
    device = Device(bin_directory)
    device.tool("stat", "import", "-", text="".join(
        scalar_lines(scalars) + value_lines(distributions, values)))
    device.whitelist(scalars=[f"com.example.scalar.{i:06}" for i in range(scalars)],
                     distributions=[f"com.example.distribution.{i:04}"
                                    for i in range(distributions)],
                     options={"intervals": [10.0 * i for i in range(1, 21)]})
    subprocess.run(["sqlite3", device.path(STORE), "PRAGMA wal_checkpoint(TRUNCATE)"], check=True,
                   stdout=subprocess.DEVNULL)
    return device


class Devices:
    """Makes devices. Importing is by far the slowest step, so stores are made once and copied."""

    def __init__(self, bin_directory):
        self.bin_directory = bin_directory
        self.stores = {}

    def __enter__(self):
        return self

    def __exit__(self, *_):
        for store in self.stores.values():
            store.close()

    def make(self, day, folder=None):
        statistics_of_day = day.scalars, day.distributions, day.values
        if statistics_of_day not in self.stores:
            self.stores[statistics_of_day] = make_store(self.bin_directory, *statistics_of_day)
        device = self.stores[statistics_of_day].copy(folder)
        write(device.path(REGISTRY),
              plistlib.dumps(registry(day, random.Random(7)), fmt=plistlib.FMT_BINARY))
        for i in range(day.ecc_events):
            write(device.path(f"{ECC_FOLDER}/{i:04}.event"),
                  struct.pack("<BB6x8Q", i % 256, 8, *range(8)))
        subprocess.run(["sync"], check=True)
        return device


def run(device, prefix=()):
    """Returns CPU seconds, and the bytes written according to the kernel's account."""
    with open(os.devnull, "r+b") as null:
        process = subprocess.Popen([*prefix, *device.daemon("-d")], env=device.environment,
                                   stdin=null, stdout=null, stderr=null)
    # The account is readable until the process is reaped.
    os.waitid(os.P_PID, process.pid, os.WEXITED | os.WNOWAIT)
    with open(f"/proc/{process.pid}/io", encoding="ascii") as file:
        account = dict(line.split(": ") for line in file)
    _, status, usage = os.wait4(process.pid, 0)
    process.returncode = os.waitstatus_to_exitcode(status)
    if process.returncode != 0:
        raise SystemExit(f"tavrel ended with status {process.returncode}")
    device.require_logs(1)
    return usage.ru_utime + usage.ru_stime, int(account["write_bytes"])


def files_of(device):
    found = {}
    for folder, _, names in os.walk(device.root):
        for name in names:
            path = os.path.join(folder, name)
            found[path] = os.stat(path)
    return found


def content_bytes(before, after):
    """Bytes in files that are new or have grown, except the store's own."""
    total = 0
    for path, status in after.items():
        if STORE in path:
            continue
        old = before.get(path)
        if old is None or old.st_mtime_ns != status.st_mtime_ns:
            total += status.st_size
    return total


def scalar_rows(device, since):
    """Rows, and bytes of their content, that the run added to the store."""
    query = f"SELECT count(*), coalesce(sum(length(key) + 16), 0) FROM scalars WHERE day > {since}"
    output = subprocess.run(["sqlite3", device.path(STORE), query], check=True, text=True,
                            capture_output=True).stdout
    rows, size = output.strip().split("|")
    return int(rows), int(size)


def flushes(devices, day):
    device = devices.make(day)
    with tempfile.NamedTemporaryFile("r") as file:
        run(device, ["strace", "-f", "-y", "-e", "trace=fsync,fdatasync", "-o", file.name])
        calls = [line for line in file if "sync(" in line]
    device.close()
    print(f"  flushes                {len(calls):10}")
    for line in calls:
        path = line[line.index("<") + 1:line.index(">")]
        print(f"    {line.split()[1].split('(')[0]:<10} {path.replace(device.root, '')}")


def flash_writes(devices, content):
    block_device = BlockDevice()
    with block_device as flash:
        if flash is None:
            print(f"  written to the device: not counted, no loop device: {block_device.reason}")
            return
        written = []
        for _ in range(RUNS):
            device = devices.make(BUSY, flash.mounted)
            before = flash.written()
            run(device)
            written.append(flash.written() - before)
            device.close()
    median = statistics.median(written)
    print(f"  written to the device  {median:10,.0f} bytes ({min(written):,} to {max(written):,}), "
          f"{median / content:.2f} of the content")


def busy_day(devices):
    print("A gated day:", ", ".join(f"{count:,} {name}" for name, count in BUSY._asdict().items()))
    results = []
    for _ in range(RUNS):
        device = devices.make(BUSY)
        before = files_of(device)
        results.append(run(device))
        content = content_bytes(before, files_of(device))
        rows, size = scalar_rows(device, DAY)
        device.close()
    times, accounts = zip(*results)
    written = statistics.median(accounts)
    device = devices.make(BUSY)
    memory = peak_mebibytes(device.daemon("-d"), device.environment)
    device.require_logs(1)
    device.close()
    print(f"  CPU                    {statistics.median(times) * 1e3:10.2f} ms "
          f"({min(times) * 1e3:.2f} to {max(times) * 1e3:.2f})\n"
          f"  peak memory            {memory:10.2f} MiB\n"
          f"  content                {content + size:10,} bytes: {content:,} in files, {size:,} in "
          f"{rows:,} scalars")
    flash_writes(devices, content + size)
    print(f"  written, by account    {written:10,.0f} bytes, {written / (content + size):.2f} of the "
          "content")
    if shutil.which("strace"):
        flushes(devices, BUSY)


def growth(devices):
    print("\nCPU of the day when one of its numbers grows, ms")
    for name in Day._fields:
        figures = []
        for factor in (1, 2, 4, 8):
            day = BUSY._replace(**{name: getattr(BUSY, name) * factor})
            times = []
            for _ in range(3):
                device = devices.make(day)
                times.append(run(device)[0])
                device.close()
            figures.append(f"x{factor} {min(times) * 1e3:8.2f}")
        print(f"  {name:<16}" + "   ".join(figures))


def main():
    with Devices(sys.argv[1]) as devices:
        busy_day(devices)
        growth(devices)


if __name__ == "__main__":
    main()
