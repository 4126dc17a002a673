"""A device in a folder, with statistics of several days, drives, drivers and hostile keys."""

import math
import os
import plistlib
import random
import shutil
import subprocess
import time

SCRIPT = "com.example.<script>document.title='hostile'</script>&amp;\"'"
OVERRIDE = "com.example.\u202egnp.exe\u202c\u2067\u05d0\u05d1"
LONG = "com.example." + "k" * 1000
HOSTILE = (SCRIPT, OVERRIDE, LONG)
TODAY = int(time.time() // 86400)


class Device:
    def __init__(self, root, tool):
        self.root, self.tool = root, tool
        random.seed(1)

    def run(self, *arguments, text=None):
        done = subprocess.run([self.tool, "--root", self.root, *arguments], input=text, text=True,
                              stdout=subprocess.PIPE, stderr=subprocess.PIPE, check=False)
        if done.returncode != 0:
            raise AssertionError(f"{arguments}: status {done.returncode}: {done.stderr}")
        return done

    def write(self, name, value):
        path = os.path.join(self.root, name)
        os.makedirs(os.path.dirname(path), exist_ok=True)
        with open(path, "wb") as file:
            if isinstance(value, str):
                file.write(value.encode())
            else:
                plistlib.dump(value, file)

    def statistics(self, days, hole):
        """Adds days up to yesterday, except those whose number, back from today, is in `hole`."""
        lines = []
        for back in range(days, 0, -1):
            day = TODAY - back
            if back in hole:
                continue
            wave = math.sin(day / 5)
            rows = {"com.norvane.usage.processes": 180 + int(40 * wave) + day % 7,
                    "com.norvane.usage.disk.free_mib": 77000 - 120 * (days - back),
                    "com.norvane.ioreport.nvme0.used_pct": 20 + (days - back) // 15}
            for i in range(5):
                rows[f"com.example.app{i}.starts"] = random.randrange(10 ** (i + 1))
            for key in HOSTILE if back < 3 else ():
                rows[key] = 1234567
            lines += [f"scalar\t{day}\t{key}\t{value}" for key, value in rows.items()]
            for i in range(3):
                key = "com.norvane.usage.memory.used_percent" if i == 0 else f"com.example.app{i}.ms"
                lines += [f"value\t{day}\t{key}\t{60 * n}\t{random.lognormvariate(3, 0.3 + 0.1 * wave):.4f}"
                          for n in range(48)]
        self.run("stat", "import", "-", text="\n".join(lines) + "\n")

    def furnish(self, examples):
        """Adds everything but statistics."""
        exact = {"bucket_interval": 1}
        self.write("Library/Application Support/Brimhold/Whitelist_Pellio.plist", {
            "Usage": {
                "ScalarKeys": {"com.norvane.usage.processes": {"bucket_interval": 10},
                               "com.example.app4.starts": {"sig_fig": 2}, OVERRIDE: exact,
                               SCRIPT: {"sig_fig": 1}},
                "DistributionKeys": {
                    "com.norvane.usage.memory.used_percent": {"intervals": [10, 15, 20, 25, 30, 50]}}}})
        self.write("etc/os-release", 'PRETTY_NAME="Example 12"\nVERSION_ID="12.4"\nID=example\n')
        for name, figures in (
                ("nvme0", {"used_pct": 23, "spare_pct": 100, "spare_threshold_pct": 10,
                           "temperature": 41500, "written": 87_654_321_000_000,
                           "power_on_hours": 9876, "media_errors": 0}),
                ("mmcblk0", {"life_a_pct": 30, "life_b_pct": 20, "pre_eol": 2})):
            self.write(f"run/tavrel/health/{name}.plist", {
                "version": 1, "name": name, "kind": "nvme" if name[0] == "n" else "emmc",
                "model": "A model & its <b>name</b>", "firmware": "1.2", "capacity": 512_110_190_592,
                "time": __import__("datetime").datetime.utcfromtimestamp(time.time() - 7200),
                "from": "log 02h", "figures": figures, "growth": {}})
        registry = os.path.join(self.root, "var/lib/tavrel/registry")
        os.makedirs(registry)
        shutil.copy(os.path.join(examples, "registry/report.plist"), registry)
        self.run("allow", "--from", "yesterday")
