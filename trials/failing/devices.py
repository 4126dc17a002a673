"""Devices for the programs to try, as each needs them."""

import json
import plistlib
import shutil
import time

from checks import PENDING
from programs import here, run, serve, tool

YESTERDAY = int(time.time() // 86400) - 1
WHITELIST = "Library/Application Support/Brimhold/Whitelist_Pellio.plist"

ALLOWED = """<?xml version="1.0" encoding="UTF-8"?>
<plist version="1.0">
<dict><key>Example</key><dict>
  <key>ScalarKeys</key><dict>
    <key>com.norvane.lumenhall.numAllInstalledApps</key><dict/>
    <key>com.norvane.lumenhall.numThirdPartyApps</key><dict/>
  </dict>
  <key>ScalarKeyPrefixes</key><dict><key>com.example.</key><dict/></dict>
  <key>DistributionKeyPrefixes</key><dict><key>com.example.</key><dict>
    <key>intervals</key><array><integer>5</integer><integer>20</integer></array>
  </dict></dict>
</dict></dict>
</plist>
"""

def as_it_is(_):
    pass


def make_device(root):
    """A device with a day of statistics to report and three values that wait to be folded."""
    (root / "run/tavrel/stat").mkdir(parents=True)
    tool(root, "prefs", "set", "com.norvane.zentrix", "DiagnosticSubmissionEnabled", "true",
         "--bool")
    lines = "".join(f"scalar\t{YESTERDAY}\tcom.example.s{i}\t{i * 11}\n" for i in range(5))
    lines += "".join(f"value\t{YESTERDAY}\tcom.example.d{i % 3}\t{i}\t{i}.5\n" for i in range(30))
    (here.work / "statistics").write_text(lines, encoding="ascii")
    tool(root, "stat", "import", str(here.work / "statistics"))
    path = root / WHITELIST
    path.parent.mkdir(parents=True)
    path.write_text(ALLOWED, encoding="ascii")
    for _ in range(3):
        tool(root, "stat", "add", "com.example.starts", "1")
    for folder in ("usr/share", "home/ann/.local/share", "home/eve/.local/share"):
        write_files(root, {f"{folder}/applications/kde/{folder[:8].replace('/', '-')}.desktop":
                           "[Desktop Entry]\nType=Application\n"})
    # The log's language is that of a folder; without the folder, it would be another one.
    (root / "usr/lib/locale/de_DE.utf8").mkdir(parents=True)
    write_files(root, {"etc/locale.conf": "LANG=de_DE.UTF-8\n",
                       "etc/locale.gen": "fr_FR.UTF-8 UTF-8\n"})


def file_logs(root):
    """Three logs that wait to be sent."""
    run(root, ["tavrel", "-d"])
    first = next((root / PENDING).glob("log-tallied-*.log"))
    metadata = first.with_suffix(".metadata.plist")
    for number in range(2):
        log = plistlib.loads(first.read_bytes())
        log["BHScalars"]["com.example.s0"] = number + 1
        name = f"log-tallied-2026010{number + 1}T000000Z-0011223{number}"
        (root / PENDING / f"{name}.log").write_bytes(plistlib.dumps(log))
        shutil.copy(metadata, root / PENDING / f"{name}.metadata.plist")


def exceed_limits(root):
    """Three logs, of which the limits keep one."""
    file_logs(root)
    (root / "etc/tavrel").mkdir(parents=True)
    (root / "etc/tavrel/limits.plist").write_bytes(plistlib.dumps({"Pending": {"Days": 1}}))


def write_statistics(root):
    (root / "statistics").write_text(
        f"scalar\t{YESTERDAY}\tcom.example.import.s\t1\n"
        f"value\t{YESTERDAY}\tcom.example.import.d\t7\t2.5\n", encoding="ascii")


def set_number(root):
    tool(root, "prefs", "set", "com.example", "number", "4", "--int")


def deny(root):
    tool(root, "deny")


def name_server(root):
    file_logs(root)
    (root / "etc/tavrel").mkdir(parents=True)
    (root / "etc/tavrel/upload.plist").write_bytes(plistlib.dumps(
        {"URL": f"http://127.0.0.1:{serve()}/logs", "AllowPlainHTTP": True}))


def schedule(root):
    """Schedules a tasking, and leaves the next one in a file."""
    for number in (1, 2):
        tasking = {"TaskingID": f"t{number}", "TaskingDigest": "d", "TaskingPayload": [
            {"Domain": "com.example", "Key": f"k{number}", "Value": number}]}
        (root / "tasking.json").write_text(json.dumps(tasking), encoding="ascii")
        if number == 1:
            tool(root, "tasking", "schedule", str(root / "tasking.json"))


def write_files(root, files):
    for path, text in files.items():
        (root / path).parent.mkdir(parents=True, exist_ok=True)
        (root / path).write_text(text, encoding="ascii")


def add_drives(root):
    """Drives whose counters have grown since the reading that the last daily run saw."""
    for day in (5, 6):
        write_files(root, {
            "proc/sys/kernel/random/boot_id": "0f2f4ee0-bb4f-4d5c-b1bb-5f1f2b0c6a01\n",
            "sys/class/mtd/mtd0/name": "flash\n",
            "sys/class/mtd/mtd0/size": "1048576\n",
            "sys/class/mtd/mtd0/ecc_failures": f"{day * 10}\n",
            "sys/class/mtd/mtd0/corrected_bits": f"{day * 100}\n",
            "sys/class/ubi/ubi0/max_ec": f"{day * 7}\n",
            "sys/class/ubi/ubi0/mtd_num": "0\n",
            "sys/block/mmcblk0/device/type": "MMC\n",
            "sys/block/mmcblk0/device/life_time": "0x02 0x01\n",
            "sys/block/sda/device/vendor": "ATA\n"})
        tool(root, "prefs", "set", "com.norvane.tallied.tavrel",
             "LastCrashLogSerializationDateInDaysSince1970", str(day), "--int")
        if day == 5:
            run(root, ["tavrel-health"])


def sample_machine(root):
    """A machine that has been busy since its last sample."""
    for number in (1, 2):
        write_files(root, {
            "proc/sys/kernel/random/boot_id": "0f2f4ee0-bb4f-4d5c-b1bb-5f1f2b0c6a01\n",
            "proc/stat": f"cpu  {number * 100} 0 0 {number * 1000} 0 0 0 0\ncpu0\n",
            "proc/uptime": f"{number * 60}.00 10.00\n",
            "proc/loadavg": "0.50 0.40 0.30 1/100 1234\n",
            "proc/meminfo": "MemTotal: 4096 kB\nMemAvailable: 2048 kB\n",
            "proc/net/dev": f"a\nb\n  eth0: {number * 2048} 0 0 0 0 0 0 0 {number * 4096} 0\n",
            "proc/diskstats": f"8 0 sda 1 0 {number * 20} 0 1 0 {number * 40} 0\n",
            "sys/class/thermal/thermal_zone0/temp": "40000\n"})
        (root / "sys/block/sda/device").mkdir(parents=True, exist_ok=True)
        if number == 1:
            tool(root, "stat", "collect", "--once")
