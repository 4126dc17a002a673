#!/usr/bin/env python3
"""Times the upload of waiting logs to nginx on this machine, over TLS with a client certificate, in
turn with curl, which sends the same files unchanged over one connection.

    bench/upload_runs.py BIN_DIRECTORY

The server follows docs/examples/upload/nginx.conf. The run fails unless each log arrives.
"""

import gzip
import os
import plistlib
import random
import shutil
import socket
import statistics
import subprocess
import sys
import time

from wanted import Wanted
from whole_runs import Device

LOGS = 1000
RUNS = 5
KEYS = 200
EXAMPLE = os.path.join(os.path.dirname(__file__), "../docs/examples/upload/nginx.conf")
SUBMISSION = "var/mobile/Library/Logs/Submission"
LONGEST = 60  # seconds to wait for anything


def call(*command):
    subprocess.run(command, check=True, capture_output=True)


class Server:
    """Debian's nginx, with its files below `folder`; runs from entry to exit."""

    def __init__(self, folder):
        self.folder = folder
        os.makedirs(self.path("srv"))
        for name, extra in (("ca", ()), ("server", ("-addext", "subjectAltName=IP:127.0.0.1")),
                            ("device", ())):
            signed = () if name == "ca" else (
                "-CA", self.path("ca.crt"), "-CAkey", self.path("ca.key"), "-addext",
                "basicConstraints=critical,CA:FALSE")
            call("openssl", "req", "-x509", "-days", "2", "-nodes", "-newkey", "ec", "-pkeyopt",
                 "ec_paramgen_curve:P-256", "-subj", f"/CN={name}", "-out",
                 self.path(f"{name}.crt"), "-keyout", self.path(f"{name}.key"), *extra, *signed)
        shutil.copy(self.path("ca.crt"), self.path("devices-authority.crt"))
        with socket.create_server(("127.0.0.1", 0)) as free:
            self.port = free.getsockname()[1]
        with open(EXAMPLE, encoding="ascii") as file:
            site = file.read()
        for old, new in (("listen 443", f"listen 127.0.0.1:{self.port}"),
                         ("/etc/tavrel-server", folder), ("/srv/tavrel", self.path("srv")),
                         ("/var/log/nginx", folder)):
            site = site.replace(old, new)
        user = "user root;" if os.geteuid() == 0 else ""
        temporary = "".join(f"{name}_temp_path tmp-{name};" for name in (
            "client_body", "proxy", "fastcgi", "uwsgi", "scgi"))
        with open(self.path("nginx.conf"), "w", encoding="ascii") as file:
            file.write(f"{user} daemon off; pid nginx.pid; events {{}} "
                       f"http {{ access_log off; {temporary} {site} }}")

    def __enter__(self):
        self.process = subprocess.Popen(["nginx", "-p", self.folder, "-c", "nginx.conf", "-e",
                                         "error.log"])
        deadline = time.monotonic() + LONGEST
        while True:
            try:
                socket.create_connection(("127.0.0.1", self.port)).close()
                return self
            except ConnectionRefusedError:
                if time.monotonic() > deadline or self.process.poll() is not None:
                    self.__exit__()
                    with open(self.path("error.log"), encoding="utf-8") as log:
                        raise SystemExit(f"nginx does not listen: {log.read()}")
                time.sleep(0.01)

    def __exit__(self, *_):
        self.process.terminate()
        self.process.wait()

    def path(self, name):
        return os.path.join(self.folder, name)

    def url(self):
        return f"https://127.0.0.1:{self.port}/logs"

    def take_logs(self):
        """Returns the logs that have arrived, by name, and removes them."""
        folder = self.path("srv/device")
        logs = {}
        if os.path.isdir(folder):  # nginx makes it for the first log
            for name in os.listdir(folder):
                with open(os.path.join(folder, name), "rb") as file:
                    logs[name.removesuffix(".gz")] = file.read()
            shutil.rmtree(folder)
        return logs


def make_logs():
    numbers = random.Random(1)
    logs = {}
    for i in range(LOGS):
        name = f"log-tallied-20261127T{i // 3600:02}{i // 60 % 60:02}{i % 60:02}Z-{i:08x}.log"
        logs[name] = plistlib.dumps({"BHScalars": {
            f"com.example.usage.scalar.{key:04}": numbers.randrange(1000) * 10
            for key in range(KEYS)}})
    return logs


def fill(device, logs):
    outbox = device.path(f"{SUBMISSION}/outbox")
    os.makedirs(outbox, exist_ok=True)
    metadata = plistlib.dumps({"LogType": "193", "LogName": "log-tallied",
                               "OSVersion": "Pellio 4.2 (16R349)"})
    for name, content in logs.items():
        with open(os.path.join(outbox, name), "wb") as file:
            file.write(content)
        with open(os.path.join(outbox, name.replace(".log", ".metadata.plist")), "wb") as file:
            file.write(metadata)
    return outbox


def permit_upload(device, server):
    """Makes the device send its logs to the server; returns the environment of tavrel-upload."""
    os.makedirs(device.path("etc/tavrel"))
    with open(device.path("etc/tavrel/upload.plist"), "wb") as file:
        file.write(plistlib.dumps({"URL": server.url()}))
    credentials = device.path("credentials")
    os.makedirs(credentials)
    for credential, name in (("certificate", "device.crt"), ("key", "device.key"),
                             ("authority", "ca.crt")):
        shutil.copy(server.path(name), os.path.join(credentials, f"tavrel-upload.{credential}"))
    return {**device.environment, "CREDENTIALS_DIRECTORY": credentials}


def timed(command, device, environment):
    """Returns wall and CPU seconds, and the peak memory in MiB."""
    peak = device.path("peak")
    started = time.monotonic()
    # The peak from wait4 would include this process's own.
    process = subprocess.Popen(["/usr/bin/time", "-f", "%M", "-o", peak, *command],
                               env=environment, stdout=subprocess.DEVNULL,
                               stderr=subprocess.DEVNULL)
    _, status, usage = os.wait4(process.pid, 0)
    wall = time.monotonic() - started
    process.returncode = os.waitstatus_to_exitcode(status)
    if process.returncode != 0:
        raise SystemExit(f"{command[0]} ended with {process.returncode}")
    with open(peak, encoding="ascii") as file:
        return wall, usage.ru_utime + usage.ru_stime, int(file.read()) / 1024


def measure(device, server, logs):
    """Returns the figures of the uploads and those of curl."""
    environment = permit_upload(device, server)
    uploads, curls = [], []
    for _ in range(RUNS):
        outbox = fill(device, logs)
        with open(device.path("curl.conf"), "w", encoding="ascii") as file:
            for name in logs:
                file.write(f'upload-file = "{outbox}/{name}"\nurl = "{server.url()}/{name}"\n')
        curls.append(timed(["curl", "--fail", "--silent", "--http1.1", "--cacert",
                            server.path("ca.crt"), "--cert", server.path("device.crt"), "--key",
                            server.path("device.key"), "--config", device.path("curl.conf")],
                           device, device.environment))
        if server.take_logs() != logs:
            raise SystemExit("curl has not sent each log")
        uploads.append(timed([os.path.join(device.bin, "tavrel-upload")], device, environment))
        if {name: gzip.decompress(log) for name, log in server.take_logs().items()} != logs:
            raise SystemExit("tavrel-upload has not sent each log")
        if os.listdir(outbox):
            raise SystemExit("tavrel-upload has left logs behind")
    return uploads, curls


def main():
    wanted = Wanted()
    device = Device(sys.argv[1])
    logs = make_logs()
    with Server(device.path("server")) as server:
        uploads, curls = measure(device, server, logs)
    device.close()

    wall, cpu, memory = (statistics.median(column) for column in zip(*uploads))
    curl_wall, curl_cpu, _ = (statistics.median(column) for column in zip(*curls))
    ratio = wall / curl_wall
    size = sum(map(len, logs.values())) / LOGS / 1024
    print(f"Upload of {LOGS:,} logs of {size:.1f} KiB to nginx on this machine, over TLS\n"
          f"  tavrel-upload   wall {wall * 1e3:8.1f} ms   CPU {cpu * 1e3:8.1f} ms\n"
          f"  curl            wall {curl_wall * 1e3:8.1f} ms   CPU {curl_cpu * 1e3:8.1f} ms\n"
          f"  ratio           wall {ratio:8.2f}"
          f"{wanted.judge('upload: wall time, ratio to curl', ratio)}\n"
          f"  peak memory     {memory:13.2f} MiB")
    sys.exit(wanted.status())


if __name__ == "__main__":
    main()
