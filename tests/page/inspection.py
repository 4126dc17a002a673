"""Looks in headless Chromium for faults of a page that readers would see."""

import os
import re

from device import OVERRIDE

WIDTHS = (320, 768, 1920)

with open(os.path.join(os.path.dirname(os.path.abspath(__file__)), "inspect.js"),
          encoding="utf-8") as source:
    INSPECT = source.read()

# Characters that change the direction of text are shown.
TURNED = re.sub("[\u202e\u202c\u2067]", "\ufffd", OVERRIDE)


def expect(actual, expected, what):
    if actual != expected:
        raise AssertionError(f"{what}: {actual!r}, expected {expected!r}")


def inspect(browser, file, charts):
    """Checks a page at all widths in both colour schemes. It must have `charts` charts."""
    for width in WIDTHS:
        for scheme in ("light", "dark"):
            what = f"{os.path.basename(file)}, {width} pixels, {scheme}"
            browser.open(file, width, scheme)
            expect(browser.evaluate(INSPECT), [], what)
            requests = [event["params"]["request"]["url"] for event in browser.events
                        if event.get("method") == "Network.requestWillBeSent"]
            expect(requests, ["file://" + file], what + ": requests")
    nodes = browser.call("Accessibility.getFullAXTree")["nodes"]
    names = [node["name"]["value"] for node in nodes
             if not node["ignored"] and node["role"]["value"] in ("img", "image")]
    expect((len(names), [name for name in names if ": " not in name]), (charts, []), "named charts")
