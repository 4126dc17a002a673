#!/usr/bin/env python3
"""Runs four monitors with the same duty at the same time, for script/compare.

    bench/compare.py BIN_DIRECTORY PACKAGES SECONDS

PACKAGES holds the unpacked packages; they are mounted over /usr, /etc and /var in this process's
mount namespace, and what programs write there goes to a tmpfs, so that all of it ends with the
process. CPU time is the kernel's for each process at its end, so it includes its start;
memory is the sum of the peaks of the processes that stay running; bytes written are those that
reached the block device of the monitor's own file system.
"""

import contextlib
import json
import os
import pathlib
import plistlib
import re
import signal
import subprocess
import sys
import time
import urllib.request

from flash import BlockDevice

EXPORTER = "127.0.0.1:9197"
PMCD_PORT = "44397"
NAMESPACE = "/var/lib/pcp/pmns"
PENDING = "var/mobile/Library/Logs/Submission/pending"
USAGE = "com.norvane.usage."


class Duty:
    """The processes of one monitor, and the disk on which it keeps its readings."""

    def __init__(self, name, disk):
        self.name = name
        self.disk = disk
        self.folder = pathlib.Path(disk.mounted)
        self.running = []
        self.seconds = 0.0
        self.memory = 0
        self.values = 0
        self.written = disk.written()

    def __enter__(self):
        return self

    def __exit__(self, kind, *_):
        """After a failure, ends what still runs, so that the disk can be unmounted."""
        for process in self.running:
            process.kill()
            process.wait()
        output = self.folder.parent / "output"
        if kind and output.exists():
            for line in output.read_text(errors="replace").splitlines()[-3:]:
                print(f"{self.name}: {line}", file=sys.stderr)

    def start(self, *command, environment=None):
        with open(self.folder.parent / "output", "ab") as output:
            self.running.append(subprocess.Popen(
                [str(word) for word in command], env={**os.environ, **(environment or {})},
                stdout=output, stderr=output))

    def stop(self):
        for process in reversed(self.running):
            if process.poll() is not None:
                sys.exit(f"{process.args[0]} ended early, with {process.returncode}")
            # Not the peak from wait4, which includes this program before the exec.
            status = pathlib.Path(f"/proc/{process.pid}/status").read_text(encoding="ascii")
            self.memory += int(re.search(r"VmHWM:\s+(\d+)", status)[1])
            process.send_signal(signal.SIGTERM)
            _, _, usage = os.wait4(process.pid, 0)
            process.returncode = 0
            self.seconds += usage.ru_utime + usage.ru_stime
        self.running = []

    def run(self, *command, environment=None):
        """Runs a program that ends by itself, and counts it as well."""
        self.start(*command, environment=environment)
        process = self.running.pop()
        _, status, usage = os.wait4(process.pid, 0)
        process.returncode = 0
        if status != 0:
            sys.exit(f"{command[0]} ended with {os.waitstatus_to_exitcode(status)}")
        self.seconds += usage.ru_utime + usage.ru_stime


def lay_over(packages):
    """Returns the folder of a tmpfs."""
    layers = packages.parent / "layers"
    layers.mkdir(exist_ok=True)
    subprocess.run(["mount", "-t", "tmpfs", "tmpfs", layers], check=True)
    for top in ["usr", "etc", "var"]:
        for folder in [packages / top, layers / top / "upper", layers / top / "work"]:
            folder.mkdir(parents=True, exist_ok=True)
        subprocess.run(["mount", "-t", "overlay", "overlay", f"/{top}", "-o",
                        f"lowerdir={packages / top}:/{top},upperdir={layers / top}/upper,"
                        f"workdir={layers / top}/work"], check=True)
    return layers


def text(command):
    return subprocess.run([str(word) for word in command], check=True, capture_output=True,
                          text=True, env={**os.environ, "PMCD_PORT": PMCD_PORT}).stdout


def start_collectd(duty):
    plugins = ["cpu", "load", "memory", "swap", "disk", "interface", "df", "thermal", "uptime"]
    configuration = duty.folder.parent / "collectd.conf"
    configuration.write_text(
        f'BaseDir "{duty.folder}"\nPIDFile "{duty.folder.parent}/pid"\nInterval 1\n'
        'TypesDB "/usr/share/collectd/types.db"\n'
        + "".join(f"LoadPlugin {plugin}\n" for plugin in ["csv", *plugins])
        + f'<Plugin csv>\n  DataDir "{duty.folder}/csv"\n</Plugin>\n'
        '<Plugin df>\n  MountPoint "/"\n</Plugin>\n', encoding="ascii")
    duty.start("/usr/sbin/collectd", "-f", "-C", configuration)


def count_collectd(duty):
    for path in duty.folder.glob("csv/**/*-20??-??-??"):
        lines = path.read_text(encoding="ascii").splitlines()
        duty.values += (len(lines) - 1) * lines[0].count(",")


def start_exporter(duty):
    collectors = ["cpu", "loadavg", "meminfo", "diskstats", "netdev", "filesystem",
                  "thermal_zone", "uname", "time"]
    duty.start("/usr/bin/prometheus-node-exporter", "--collector.disable-defaults",
               *[f"--collector.{collector}" for collector in collectors],
               "--web.disable-exporter-metrics", f"--web.listen-address={EXPORTER}")


def scrape(duty):
    with urllib.request.urlopen(f"http://{EXPORTER}/metrics") as answer:
        duty.values += sum(1 for line in answer if line[:1] not in (b"#", b"\n"))


def start_pcp(duty):
    pmns = pathlib.Path(NAMESPACE)
    (pmns / "stdpmid").write_text(
        (pmns / "stdpmid.pcp").read_text() + (pmns / "stdpmid.local").read_text())
    subprocess.run(["/usr/lib/pcp/bin/pmnsmerge", "-a", "-f", "root_root", "root_pmcd",
                    "root_linux", "root"], cwd=pmns, check=True)
    os.makedirs("/run/pcp", exist_ok=True)
    agents = duty.folder.parent / "pmcd.conf"
    agents.write_text("linux 60 dso linux_init /var/lib/pcp/pmdas/linux/pmda_linux.so\n")
    duty.start("/usr/lib/pcp/bin/pmcd", "-f", "-A", "-n", pmns / "root", "-c", agents, "-l",
               duty.folder.parent / "pmcd.log", "-s", duty.folder.parent / "socket", "-U", "root",
               environment={"PMCD_PORT": PMCD_PORT})
    until("pmcd does not answer", lambda: succeeds(
        ["pminfo", "-h", "127.0.0.1", "-f", "kernel.all.load"], PMCD_PORT=PMCD_PORT))
    metrics = ["kernel.percpu.cpu", "kernel.all.load", "kernel.all.uptime", "mem.util", "swap",
               "disk.dev", "network.interface.in", "network.interface.out", "filesys"]
    wanted = duty.folder.parent / "pmlogger.conf"
    wanted.write_text("log mandatory on 1 sec {\n"
                      + "".join(f"  {metric}\n" for metric in metrics) + "}\n")
    # Metrics derived from others would add to the duty, and pmlogger prints all readings, over and
    # over, while it waits for the first values of some.
    duty.start("pmlogger", "-h", "127.0.0.1", "-c", wanted, "-l", duty.folder.parent / "log", "-U",
               "root", duty.folder / "archive",
               environment={"PMCD_PORT": PMCD_PORT, "PCP_DERIVED_CONFIG": ""})


def count_pcp(duty):
    if "check_inst" in (duty.folder.parent / "log").read_text():
        sys.exit("pmlogger printed readings, which takes far longer than taking them")
    # Each line of a result record that ends with a count is one metric with its instances.
    for line in text(["pmdumplog", duty.folder / "archive"]).splitlines():
        if re.match(r"\s+(inst \[.*\] value|60\.\S+ \(\S+\): .*\bvalue)", line):
            duty.values += 1


def prepare_tavrel(duty, programs, memory):
    """Sets up what the operator and the system do before the duty."""
    # Recording happens in memory, below the device's root.
    os.makedirs(memory / "run/tavrel/stat")
    os.symlink(memory / "run", duty.folder / "run")
    whitelist = duty.folder / "Library/Application Support/Brimhold/Whitelist_Pellio.plist"
    whitelist.parent.mkdir(parents=True)
    whitelist.write_bytes(plistlib.dumps({"Usage": {
        "ScalarKeyPrefixes": {USAGE: {"sig_fig": 2}},
        "DistributionKeyPrefixes": {USAGE: {"intervals": [1, 10, 25, 50, 75, 90, 1000]}}}}))
    text([programs / "tavrelctl", "--root", duty.folder, "allow", "--from", "yesterday"])
    duty.written = duty.disk.written()


def start_tavrel(duty, programs, seconds):
    duty.start(programs / "tavrelctl", "stat", "collect", "--seconds", seconds + 60,
               environment={"TAVREL_ROOT": str(duty.folder)})


def finish_tavrel(duty, programs):
    """Runs the rest of tavrel's duty: the hourly fold and the daily run, which here reports today,
    the day of all readings."""
    environment = {"TAVREL_ROOT": str(duty.folder)}
    duty.run(programs / "tavrelctl", "stat", "fold", environment=environment)
    duty.run(programs / "tavrel", "-t", environment=environment)


def count_tavrel(duty, programs):
    """Counts each value of a distribution, and a scalar for each sample, except for the processes,
    which are counted once a minute. The filed log must have all of these statistics."""
    statistics = json.loads(text([programs / "tavrelctl", "--root", duty.folder, "stat", "list",
                                  USAGE, "--json"]))
    logs = list(duty.folder.glob(f"{PENDING}/log-tallied-*.log"))
    if len(logs) != 1:
        sys.exit(f"tavrel has filed {len(logs)} logs")
    log = plistlib.loads(logs[0].read_bytes())
    for part, table in [("BHScalars", "scalars"), ("BHDistributions", "distributions")]:
        missing = {row["key"] for row in statistics[table]} - set(log[part])
        if missing:
            sys.exit(f"tavrel's log lacks {', '.join(sorted(missing))}")
    scalars = {row["key"].removeprefix(USAGE): row["value"] for row in statistics["scalars"]}
    duty.values = scalars["samples"] * (len(scalars) - ("processes" in scalars))
    duty.values += sum(row["count"] for row in statistics["distributions"])


def succeeds(command, **environment):
    return subprocess.run(command, env={**os.environ, **environment}, capture_output=True,
                          check=False).returncode == 0


def until(what, answer):
    deadline = time.monotonic() + 30
    while not answer():
        if time.monotonic() > deadline:
            sys.exit(what)
        time.sleep(0.05)


def main(programs, packages, seconds):
    memory = lay_over(packages)
    with contextlib.ExitStack() as stack:
        duties = []
        for name in ["collectd", "node_exporter", "PCP", "tavrel"]:
            device = BlockDevice()
            disk = stack.enter_context(device)
            if disk is None:
                sys.exit(f"script/compare: no disk for {name}: {device.reason}")
            duties.append(stack.enter_context(Duty(name, disk)))
        collectd, exporter, pcp, tavrel = duties
        prepare_tavrel(tavrel, programs, memory)
        start_collectd(collectd)
        start_exporter(exporter)
        start_pcp(pcp)
        start_tavrel(tavrel, programs, seconds)
        until("node_exporter does not answer", lambda: succeeds(
            ["python3", "-c", f"import urllib.request as r; r.urlopen('http://{EXPORTER}/')"]))
        began = time.monotonic()
        for second in range(seconds):
            time.sleep(max(0, began + second + 1 - time.monotonic()))
            scrape(exporter)
        for duty in duties:
            duty.stop()
        finish_tavrel(tavrel, programs)
        count_collectd(collectd)
        count_pcp(pcp)
        count_tavrel(tavrel, programs)
        print(f"{seconds} seconds, a reading a second, on {os.cpu_count()} CPUs")
        print(f"{'':16}{'CPU':>9}{'memory':>12}{'written':>12}{'values':>10}{'values/CPU s':>15}")
        for duty in duties:
            written = (duty.disk.written() - duty.written) / 1e6
            print(f"{duty.name:16}{duty.seconds:7.2f} s{duty.memory / 1024:8.1f} MiB"
                  f"{written:9.2f} MB{duty.values:10}{duty.values / duty.seconds:15.0f}")


if __name__ == "__main__":
    main(pathlib.Path(sys.argv[1]).resolve(), pathlib.Path(sys.argv[2]), int(sys.argv[3]))
