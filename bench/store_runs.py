#!/usr/bin/env python3
"""Counts the bytes that changes of the statistics store write to a block device.

    bench/store_runs.py BIN_DIRECTORY

The device's store holds two weeks of seven values a second. Counted are a single call of tavrelctl,
several calls in a row, and days that are folded into the store every hour. Bytes are counted at a
loop device, including the file system's own blocks and journal; where loop devices are not allowed,
nothing is measured. Exits with 1 when a wanted figure (bench/wanted.py) is missed.
"""

import random
import sys

from flash import BlockDevice
from wanted import Wanted
from whole_runs import DAY, Device

HOURS = 24
RECORD_BYTES = 12  # a value and its offset


def value_lines(day, keys, values, second):
    """`values` values for each of `keys` keys, one a second."""
    generator = random.Random(second)
    return "".join(
        f"value\t{day}\tcom.example.{key:04}\t{second + i}\t{generator.gauss(0, 9):.17g}\n"
        for key in range(keys) for i in range(values))


class Flash:
    def __init__(self, device, block_device):
        self.device = device
        self.block_device = block_device

    def written(self, change):
        before = self.block_device.written()
        change()
        return self.block_device.written() - before

    def take(self, *arguments):
        self.device.tool("stat", "import", "-", text=value_lines(*arguments))

    def day(self, keys, values):
        """Bytes of a day of hourly folds, each with `values` values per key."""
        return sum(self.written(lambda: self.take(DAY, keys, values, hour * 3600))
                   for hour in range(HOURS))


def main():
    wanted = Wanted()
    block_device = BlockDevice()
    with block_device as mounted:
        if mounted is None:
            print(f"Bytes that the store writes: no loop device: {block_device.reason}")
            return
        origin = Device(sys.argv[1])
        device = origin.copy(mounted.mounted)
        origin.close()
        flash = Flash(device, mounted)
        for day in range(DAY - 14, DAY):
            flash.take(day, 7, 86400, 0)
        alone = flash.written(lambda: device.tool("stat", "add", "com.example.one", "1"))
        print(f"stat add, alone                      {alone:12,} bytes")
        many = flash.written(lambda: [device.tool("stat", "add", "com.example.one", "1")
                                      for _ in range(50)])
        print(f"stat add, each of 50                 {many // 50:12,} bytes")
        for label, keys, values in (("7 values a second", 7, 3600),
                                    ("10^6 records, 1,000 keys", 1000, 42)):
            written = flash.day(keys, values)
            ratio = written / (HOURS * keys * values * RECORD_BYTES)
            print(f"a day of 24 folds, {label:<24}  {written:12,} bytes, {ratio:.2f} of the content"
                  f"{wanted.judge('24 folds: ratio to the content', ratio)}")
            if keys == 7:
                judged = wanted.judge("24 folds of 7 values a second, MB", written / 1e6)
                print(f"  {written / 1e6:.1f} MB{judged}")
        device.close()
    sys.exit(wanted.status())


if __name__ == "__main__":
    main()
