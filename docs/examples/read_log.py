#!/usr/bin/env python3
"""Prints tallied logs as text. docs/log.md describes the format.

    read_log.py LOG...
"""
import math
import plistlib
import sys


def load(path):
    with open(path, "rb") as file:
        return plistlib.load(file)  # XML or binary


def lower_end(bucket):
    return float(bucket[0][1:].split(",")[0])


for path in sys.argv[1:]:
    log, filed = load(path), load(path.removesuffix(".log") + ".metadata.plist")
    print(f"{log['BHStartDate']:%Y-%m-%d}  {filed['LogName']}, type {filed['LogType']}")
    print(f"  {filed['OSVersion']}, {filed.get('Options', {})}")
    print(f"  whitelist {log['BHWhitelistDigest']}")
    print(f"  tasking {log['BHTaskID']}, settings {log['BHTasking']}")  # of any type
    for key, value in [*log["BHMetadata"].items(), *log["BHScalars"].items()]:
        print(f"  {key} = {value}")
    for key, (low, high, mean, squares, count) in log["BHDistributions"].items():
        deviation = math.nan if squares < 0 else math.sqrt(squares / max(count, 1))
        print(f"  {key}: {count} from {low} to {high}, mean {mean}, deviation {deviation:.4g}")
        histogram = log["BHDistributionsHistogram"].get(key, {})
        for label, values in sorted(histogram.items(), key=lower_end):
            print(f"    {label} {values}")
    for app in log.get("BHActivatedAppInfo", []):
        print(f"  {app['bundle']} {app['version']} {app['uuid']}")
