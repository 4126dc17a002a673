#!/usr/bin/env python3
"""Opens pages in headless Chromium and looks for faults that readers would see.

    page_test.py TAVRELCTL EXAMPLES
"""

import os
import sys
import tempfile

from browser import Browser
from device import LONG, SCRIPT, Device
from inspection import TURNED, expect, inspect

# The cells of a scalar's row, by key.
ROWS = """Object.fromEntries([...document.querySelectorAll('table[aria-label=Scalars] tbody tr')].map(
    row => [row.querySelector('bdi').textContent, [...row.cells].slice(1).map(c => c.textContent)]))"""


def check_content(browser):
    expect(browser.evaluate("document.title").startswith("Device on "), True, "title")
    text = browser.evaluate("document.body.textContent")
    expect([key for key in (SCRIPT, TURNED, LONG) if key not in text], [], "hostile keys as text")
    rows = browser.evaluate(ROWS)
    blank = "\u202f"
    million = f"1{blank}234{blank}567"
    for key, cells in ((SCRIPT, [million, f"1{blank}000{blank}000", ""]),
                       (TURNED, [million, million, ""]), (LONG, [million, "not in it", ""]),
                       ("com.norvane.usage.disk.free_mib", [f"73{blank}520", "not in it", "MiB"])):
        expect(rows.get(key), cells, key[:40])
    # The text direction of a hostile key does not extend beyond it.
    expect(browser.evaluate(f"""[...document.querySelectorAll('bdi')].filter(
        name => name.textContent === {TURNED!r}).length"""), 2, "isolated names")
    for words in ("About 3.8 years of operation at the pace of its life so far", "ACTV",
                  "Trends over 30 days", "worn, pre_eol is 2", "From 20"):
        expect(words in text, True, words)


def main():
    tool, examples = map(os.path.abspath, sys.argv[1:])
    with tempfile.TemporaryDirectory(prefix="tavrel_page.") as folder, Browser() as browser:
        device = Device(os.path.join(folder, "device"), tool)
        os.mkdir(device.root)
        page = os.path.join(folder, "page.html")
        device.run("page", "-o", page, "--days", "3")
        inspect(browser, page, 0)
        device.furnish(examples)
        device.statistics(30, hole=(5, 7, 20))
        device.run("page", "-o", page)
        # 3 histograms, 5 bars of the log, 14 trends, a channel, 2 drives.
        inspect(browser, page, 25)
        check_content(browser)
        expect(device.run("page", "-o", "-").stdout.count("</html>"), 1, "standard output")
    print("no faults")


if __name__ == "__main__":
    main()
