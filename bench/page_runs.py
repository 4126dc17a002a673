#!/usr/bin/env python3
"""Times `tavrelctl page` over a year, and measures the size of the page.

    bench/page_runs.py BIN_DIRECTORY

One device has 365 days of 100 scalars and 20 distributions of 96 values, all of them drawn; the
other has 100 days of 3,000 scalars with long keys, most of which are left out. Prints medians of
CPU time, the page's size and the ratio to reading the same values with `tavrelctl stat export`.
Exits with 1 when a wanted figure (bench/wanted.py) is missed.
"""

import os
import sys
import zlib

from wanted import Wanted
from whole_runs import DAY, Device, measure


def number(*parts):
    return zlib.crc32(repr(parts).encode())


def rows(days, scalars, distributions):
    for day in range(DAY - days + 1, DAY + 1):
        for key in scalars:
            yield f"scalar\t{day}\t{key}\t{number(day, key) % 100_000}\n"
        for key in distributions:
            for i in range(96):
                yield f"value\t{day}\t{key}\t{900 * i}\t{number(day, key, i) % 10_000 / 7:.6f}\n"


def page_of(bin_directory, wanted, label, days, scalars, distributions):
    device = Device(bin_directory)
    device.tool("stat", "import", "-", text="".join(rows(days, scalars, distributions)))
    device.whitelist(scalars=scalars[::2], distributions=distributions[::2],
                     options={"intervals": [100.0 * i for i in range(1, 13)]})
    page = device.path("page.html")
    tool = os.path.join(device.bin, "tavrelctl")
    print(label)
    median, _, _ = measure("tavrelctl page", [tool, "page", "--days", str(days), "-o", page],
                           device.environment,
                           ("tavrelctl stat export", [tool, "stat", "export"]), runs=7)
    print(wanted.judge("page, ms", median))
    size = os.path.getsize(page) / 1e6
    print(f"  size of the page  {size:.2f} MB{wanted.judge('page, MB', size)}")
    device.close()


def main():
    wanted = Wanted()
    page_of(sys.argv[1], wanted, "365 days of 100 scalars and 20 distributions of 96 values", 365,
            [f"com.example.scalar.{i:03}" for i in range(100)],
            [f"com.example.distribution.{i:02}" for i in range(20)])
    page_of(sys.argv[1], wanted, "100 days of 3,000 scalars with keys of 120 characters", 100,
            [f"com.example.{'x' * 103}.{i:04}" for i in range(3000)], [])
    sys.exit(wanted.status())


if __name__ == "__main__":
    main()
