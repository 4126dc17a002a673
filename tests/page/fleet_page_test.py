#!/usr/bin/env python3
"""Opens pages of a fleet in headless Chromium and looks for faults that readers would see.

    fleet_page_test.py TAVREL_FLEET
"""

import datetime
import math
import os
import plistlib
import random
import subprocess
import sys
import tempfile

from browser import Browser
from device import LONG, OVERRIDE, SCRIPT
from inspection import TURNED, expect, inspect

OLD, NEW = "Pellio 4.1 (16Q210)", f"Pellio 4.2 <b>{OVERRIDE}</b>"
WEAR = "com.norvane.ioreport.nvme0.used_pct"
BLANK = "\u00a0"
FIRST = datetime.datetime(2026, 11, 20)


def write_log(folder, number, device, day):
    """Half of the 40 devices have the new version, on which some statistics changed."""
    is_new = device % 2
    mean = random.gauss(300 if is_new else 200, 40)
    has_mean = number > 1
    five = [10.0, 900.0, mean, 5e4, 20] if has_mean else [10.0, math.inf, math.inf, math.nan, 20]
    name = os.path.join(folder, f"log-{number:04}")
    with open(name + ".log", "wb") as file:
        plistlib.dump({
            "BHCrashLogVersion": 1, "BHStartDate": FIRST + datetime.timedelta(days=day),
            "BHLogCreationDate": FIRST + datetime.timedelta(days=day + 2),
            "BHMetadata": {"BHUserSetRegionFormat": ("(other)", "AT", SCRIPT, "LI")[device % 31 // 10]},
            "BHScalars": {SCRIPT: 1000 + 500 * is_new + random.randrange(90), WEAR: device,
                          OVERRIDE: 10 + 5 * is_new, "com.norvane.usage.processes": 180 + day,
                          "com.example.number": number},
            "BHDistributions": {LONG: five, OVERRIDE: five},
            "BHDistributionsHistogram": {LONG: {"(-inf, 250]": 12, "(250, 500]": 5, "(500, inf)": 3}},
            "BHTasking": [], "BHTaskID": "", "BHTaskDigest": "", "BHWhitelistDigest": "a"},
            file, fmt=plistlib.FMT_BINARY)
    with open(name + ".metadata.plist", "wb") as file:
        plistlib.dump({"OSVersion": NEW if is_new else OLD}, file)


def check_content(browser):
    text = browser.evaluate("document.body.textContent")
    expect([key for key in (SCRIPT, TURNED, LONG, NEW[:14]) if key not in text], [], "hostile names")
    expect(browser.evaluate("document.title"), "Fleet", "title")
    for words in ("Regions\"(other)\"", "4 of 7 statistics changed", f"{TURNED} (daily mean): ",
                  f"{TURNED} (daily value): ", "is compared without a few logs that have no mean",
                  "The mean is without a few logs", "at least 40 devices",
                  f"is at most 19{BLANK}% in half of the daily logs, and above 37{BLANK}% in no more than"):
        expect(words in text, True, words)


def main():
    program = os.path.abspath(sys.argv[1])
    random.seed(1)
    with tempfile.TemporaryDirectory(prefix="tavrel_fleet_page.") as folder, Browser() as browser:
        logs, page = os.path.join(folder, "logs"), os.path.join(folder, "fleet.html")
        os.mkdir(logs)

        def fleet(*arguments):
            subprocess.run([program, "--database", os.path.join(folder, "fleet.db"), *arguments],
                           check=True, stdout=subprocess.DEVNULL)

        write_log(logs, 0, 0, 0)
        fleet("load", logs)
        fleet("page", "-o", page)
        inspect(browser, page, 0)
        for number in range(1, 160):
            write_log(logs, number, number % 40, number // 40)
        fleet("load", logs)
        fleet("page", "-o", page)
        # 7 changes, 2 bars of versions, 3 of regions, days, 28 of histograms.
        inspect(browser, page, 41)
        check_content(browser)
    print("no faults")


if __name__ == "__main__":
    main()
