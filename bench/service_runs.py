#!/usr/bin/env python3
"""Times the service in a separate process, with this process as its client.

    bench/service_runs.py BIN_DIRECTORY

Prints its memory when idle and with many peers, the CPU time per message of a burst, and the time
from sending a list of applications to the finished log, each next to the wanted figure. Every
message of the burst names a different application; the run fails unless the service's log mentions
each exactly once, and nothing that was dropped or refused.
"""

import collections
import ctypes
import fcntl
import os
import plistlib
import re
import resource
import select
import signal
import socket
import statistics
import struct
import subprocess
import sys
import time

from wanted import Wanted
from whole_runs import PENDING, Device, scalar_lines

PEERS = 1000
MESSAGES_OF_PEER = 10
APPLICATIONS = 5000
DELIVERIES = 7
SCALARS = 2000

LONGEST = 60  # seconds to wait for anything
NAME = "com.norvane.tallied.tavrel"
SEALS = fcntl.F_SEAL_SHRINK | fcntl.F_SEAL_GROW | fcntl.F_SEAL_WRITE
IN_CREATE, IN_MOVED_TO = 0x100, 0x80


def application(name, number):
    return {"bundle_id": name, "version": f"1.{number}", "orbo_id": number, "arch": 12,
            "uuid": struct.pack("<QQ", 1, number)}


def message(**entries):
    return plistlib.dumps(entries, fmt=plistlib.FMT_BINARY)


class Service:
    """The daemon serving below the device root, with its log in a file."""

    def __init__(self, device):
        self.log_path = device.path("service.log")
        self.socket_path = device.path(f"run/tavrel/{NAME}.socket")
        with open(self.log_path, "wb") as log, open(os.devnull, "r+b") as null:
            self.process = subprocess.Popen([os.path.join(device.bin, "tavrel")], stdin=null,
                                            stdout=null, stderr=log, env=device.environment)
        self.wait_until("the service listens", self.listens)

    def __enter__(self):
        return self

    def __exit__(self, kind, *_):
        self.process.send_signal(signal.SIGTERM)
        status = self.process.wait(LONGEST)
        if status != 0 and kind is None:
            raise SystemExit(f"tavrel ended with status {status}")

    def wait_until(self, what, condition):
        deadline = time.monotonic() + LONGEST
        while not condition():
            if self.process.poll() is not None:
                raise SystemExit(f"tavrel ended before {what}")
            if time.monotonic() > deadline:
                raise SystemExit(f"not within {LONGEST} seconds: {what}")
            time.sleep(0.001)

    def listens(self):
        try:
            self.connect().close()
        except (FileNotFoundError, ConnectionRefusedError):
            return False
        return True

    def connect(self):
        connection = socket.socket(socket.AF_UNIX, socket.SOCK_SEQPACKET)
        connection.settimeout(LONGEST)
        connection.connect(self.socket_path)
        return connection

    def descriptors(self):
        return len(os.listdir(f"/proc/{self.process.pid}/fd"))

    def cpu(self):
        """CPU seconds of all threads, user and system."""
        clock = ~self.process.pid << 3 | 2  # as clock_getcpuclockid makes it
        return time.clock_gettime(clock)

    def mebibytes(self, name):
        with open(f"/proc/{self.process.pid}/status", encoding="ascii") as file:
            line = next(line for line in file if line.startswith(name + ":"))
        return int(line.split()[1]) / 1024

    def log(self):
        with open(self.log_path, encoding="utf-8") as file:
            return file.read()


class NewLogs:
    """Reports logs in the pending folder as soon as they appear."""

    def __init__(self, folder):
        os.makedirs(folder, exist_ok=True)
        libc = ctypes.CDLL(None, use_errno=True)
        descriptor = libc.inotify_init1(os.O_CLOEXEC)
        if descriptor < 0 or libc.inotify_add_watch(descriptor, folder.encode(),
                                                    IN_CREATE | IN_MOVED_TO) < 0:
            raise SystemExit(f"cannot watch {folder}: {os.strerror(ctypes.get_errno())}")
        self.file = os.fdopen(descriptor, "rb", buffering=0)
        self.folder = folder

    def next(self):
        """Returns the path of the next log, and when it appeared."""
        while select.select([self.file], [], [], LONGEST)[0]:
            now = time.monotonic()
            events = self.file.read(1 << 16)
            while events:
                (length,) = struct.unpack_from("<I", events, 12)
                name = events[16:16 + length].rstrip(b"\0").decode()
                events = events[16 + length:]
                if name.endswith(".log"):
                    return os.path.join(self.folder, name), now
        raise SystemExit(f"no log in {self.folder} within {LONGEST} seconds")


def allow_descriptors(count):
    soft, hard = resource.getrlimit(resource.RLIMIT_NOFILE)
    if soft < count:
        resource.setrlimit(resource.RLIMIT_NOFILE, (min(count, hard), hard))


def check_burst(log, expected):
    """Ends the run when a message was lost, or a peer was dropped, refused or made to wait."""
    times = collections.Counter(re.findall(r'"bundle": "(burst\.\d+)"', log))
    if len(times) != expected or set(times.values()) != {1}:
        raise SystemExit(f"{expected - len(times)} of {expected} messages were lost, "
                         f"{sum(times.values()) - len(times)} handled again")
    complaints = re.findall(r"^.*(?:dropped|refused|refusals|peers wait).*$", log, re.MULTILINE)
    if complaints:
        raise SystemExit("\n".join(complaints))


def burst(bin_directory, wanted):
    count = PEERS * MESSAGES_OF_PEER
    allow_descriptors(PEERS + 100)
    messages = [message(operation=2, app_data=[application(f"burst.{i:06}", i)])
                for i in range(count)]
    device = Device(bin_directory)
    with Service(device) as service:
        time.sleep(0.5)  # the memory when idle is that after a while without events
        idle = service.mebibytes("VmRSS")
        before = service.descriptors()
        peers = [service.connect() for _ in range(PEERS)]
        service.wait_until("all peers are taken", lambda: service.descriptors() == before + PEERS)
        connected = service.mebibytes("VmRSS")

        cpu, started = service.cpu(), time.monotonic()
        try:
            for i, content in enumerate(messages):
                peers[i % PEERS].send(content)
        except OSError as error:
            raise SystemExit(f"cannot send: {error}; the service's log is {service.log_path}")
        sent = time.monotonic() - started
        for peer in peers:
            peer.close()
        service.wait_until("all peers are released", lambda: service.descriptors() == before)
        wall, cpu = time.monotonic() - started, service.cpu() - cpu
        peak = service.mebibytes("VmHWM")
    check_burst(service.log(), count)
    device.close()
    print(f"The service, {PEERS:,} connections at once and {count:,} messages in a burst\n"
          f"  memory when idle       {idle:10.2f} MiB"
          f"{wanted.judge('service: memory when idle, MiB', idle)}\n"
          f"  with all connections   {connected:10.2f} MiB\n"
          f"  peak                   {peak:10.2f} MiB\n"
          f"  all sent after         {sent * 1e3:10.2f} ms\n"
          f"  all handled after      {wall * 1e3:10.2f} ms, none lost or refused\n"
          f"  CPU of a message       {cpu / count * 1e6:10.2f} us, its log line and its share of "
          f"the connection's end included")


def send_in_memory_file(connection, content):
    file = os.memfd_create("message", os.MFD_CLOEXEC | os.MFD_ALLOW_SEALING)
    with os.fdopen(file, "wb", buffering=0) as writer:
        writer.write(content)
        fcntl.fcntl(file, fcntl.F_ADD_SEALS, SEALS)
        socket.send_fds(connection, [b""], [file])


def deliver(bin_directory):
    """Returns wall and CPU seconds from sending the applications to the log in the folder."""
    device = Device(bin_directory)
    device.tool("stat", "import", "-", text="".join(scalar_lines(SCALARS)))
    device.whitelist(scalars=[f"com.example.scalar.{i:06}" for i in range(0, SCALARS, 2)])
    content = message(operation=2, app_data=[
        application(f"com.example.application.{i:06}", i) for i in range(APPLICATIONS)])
    logs = NewLogs(device.path(PENDING))
    subprocess.run(["sync"], check=True)
    with Service(device) as service, service.connect() as client:
        client.send(message(operation=0))
        service.wait_until("the announcement is logged",
                           lambda: "waiting for activate app info" in service.log())
        cpu, started = service.cpu(), time.monotonic()
        send_in_memory_file(client, content)
        path, appeared = logs.next()
        cpu = service.cpu() - cpu
    with open(path, "rb") as file:
        log = plistlib.load(file)
    delivered, scalars = len(log["BHActivatedAppInfo"]), len(log["BHScalars"])
    if delivered != APPLICATIONS or scalars < SCALARS // 2:
        raise SystemExit(f"the log has {delivered} applications and {scalars} scalars")
    device.close()
    return appeared - started, cpu


def deliveries(bin_directory, wanted):
    results = [deliver(bin_directory) for _ in range(DELIVERIES)]
    wall, cpu = (statistics.median(column) for column in zip(*results))
    fastest = min(results)[0]
    print(f"\nA delivery of {APPLICATIONS:,} applications, from its sending to the finished log, "
          f"with {SCALARS // 2:,} scalars\n"
          f"  wall time              {wall * 1e3:10.2f} ms, at best {fastest * 1e3:.2f} ms"
          f"{wanted.judge('service: delivery to log, wall ms', wall * 1e3)}\n"
          f"  CPU of the service     {cpu * 1e3:10.2f} ms")


def main():
    wanted = Wanted()
    burst(sys.argv[1], wanted)
    deliveries(sys.argv[1], wanted)
    sys.exit(wanted.status())


if __name__ == "__main__":
    main()
