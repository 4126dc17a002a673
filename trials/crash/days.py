"""Two days of a device on which everything is switched on, as steps between which
its state is examined."""

import base64
import collections
import hashlib
import http.server
import os
import pathlib
import plistlib
import shutil
import subprocess
import threading

SOURCES = pathlib.Path(__file__).resolve().parent.parent.parent
SECONDS = 86400
LONGEST = 900  # seconds for one command
DOMAIN = "com.norvane.tallied.tavrel.plist"
LAST_DAY = (DOMAIN, "LastCrashLogSerializationDateInDaysSince1970")

# `clock` is the time of the step, `next_clock` the time of the next run after a power cut in the
# step. `whole`: the step's changes of statistics and preferences appear together or not at all.
# `again`: commands that are repeated after a power cut.
Step = collections.namedtuple("Step", "name clock next_clock whole action again")


class Device:
    """A device root. Its /run is beside it and stands for memory."""

    def __init__(self, root, programs, preload):
        self.root, self.programs = pathlib.Path(root), pathlib.Path(programs)
        self.preload = str(preload)
        self.clock = 0
        self.process = self.run_to_end

    def environment(self):
        return {"PATH": os.environ["PATH"], "TAVREL_ROOT": str(self.root),
                "LD_PRELOAD": self.preload, "CRASH_CLOCK": str(self.clock)}

    def run_to_end(self, command, environment, text):
        done = subprocess.run(command, env=environment, input=text, capture_output=True, text=True,
                              timeout=LONGEST, check=False)
        return done.returncode, done.stderr

    def run(self, name, *arguments, text=""):
        status, said = self.process([str(self.programs / name), *arguments], self.environment(),
                                    text)
        if status:
            raise RuntimeError(f"{name} {' '.join(arguments)} ends with {status}: {said}")

    def tool(self, *arguments, text=""):
        self.run("tavrelctl", *arguments, text=text)

    def forget_memory(self):
        """Loses everything in memory, as in a power cut."""
        memory = self.root.parent / "memory"
        shutil.rmtree(memory, ignore_errors=True)
        (memory / "tavrel/stat").mkdir(parents=True)

    def write(self, name, content):
        """Writes a file that the device's maker provides."""
        path = self.root / name
        path.parent.mkdir(parents=True, exist_ok=True)
        new = path.with_name(".new")
        with open(new, "wb") as file:
            file.write(content if isinstance(content, bytes) else plistlib.dumps(content))
            file.flush()
            os.fsync(file.fileno())
        new.rename(path)
        folder = os.open(path.parent, os.O_RDONLY)
        os.fsync(folder)
        os.close(folder)

    def next_run(self, step):
        """Does what the device does once power is back."""
        self.forget_memory()
        self.clock = step.clock
        for command in step.again:
            self.run(*command)
        self.clock = step.next_clock
        self.run("tavrel", "-d")


class Server(threading.Thread):
    """Confirms each log after passing its name to `received`."""

    def __init__(self, received):
        super().__init__(daemon=True)

        class Handler(http.server.BaseHTTPRequestHandler):
            protocol_version = "HTTP/1.1"

            def do_PUT(self):
                body = self.rfile.read(int(self.headers["Content-Length"]))
                digest = base64.b64encode(hashlib.sha256(body).digest()).decode()
                received(self.path.rpartition("/")[2])
                self.send_response(201)
                self.send_header("Tavrel-Received", f"sha-256=:{digest}:")
                self.send_header("Content-Length", "0")
                self.end_headers()

            def log_message(self, *_):
                pass

        self.server = http.server.HTTPServer(("127.0.0.1", 0), Handler)
        self.url = f"http://127.0.0.1:{self.server.server_port}/logs"

    def run(self):
        self.server.serve_forever()


def version(build):
    return {"ProductName": "Pellio", "ProductVersion": "4.2", "ProductBuildVersion": build}


def lines(day, name, scalars, values):
    """Statistics in the import format."""
    text = "".join(f"scalar\t{day}\tcom.example.{name}{i}\t{i * 37 + day}\n"
                   for i in range(scalars))
    return text + "".join(f"value\t{day}\tcom.example.{name}{i % 7}.d\t{i % SECONDS}\t{i}.25\n"
                          for i in range(values))


def prepare(device, day, url):
    """Sets up everything that exists before the first of the two days."""
    device.clock = day * SECONDS
    os.symlink("../memory", device.root / "run")
    device.forget_memory()
    for recording in ("report.plist", "storage.plist"):
        device.write(f"var/lib/tavrel/registry/{recording}",
                     (SOURCES / "docs/examples/registry" / recording).read_bytes())
    every = {"com.example.": {"intervals": [5, 100, 2000]}}
    device.write("Library/Application Support/Brimhold/Whitelist_Pellio.plist",
                 {"Example": {"ScalarKeyPrefixes": {"com.example.": {},
                                                    "com.norvane.ioreport.": {}},
                              "DistributionKeyPrefixes": every}})
    device.write("etc/tavrel/system-version.plist", version("16R349"))
    device.write("etc/tavrel/upload.plist", {"URL": url, "AllowPlainHTTP": True})
    device.write("etc/tavrel/limits.plist", {"Store": {"Days": 3}})
    device.write("etc/tavrel/device-answers.plist", {"DiskUsage": {
        "TotalDiskCapacity": 31914983424, "TotalDataAvailable": 20401094656}})
    device.write("etc/machine-id", b"0123456789abcdef0123456789abcdef\n")
    device.write("etc/os-release", b"NAME=Pellio\n")
    device.write("sys/devices/system/edac/mc/mc0/ce_count", b"2\n")
    device.write("proc/sys/kernel/random/boot_id", b"6dcf1b07-6c0c-4d4f-8d59-6a5ac79a0e3d\n")
    for number in range(4):
        device.write(f"var/lib/tavrel/ecc-events/{number}.event",
                     bytes([number, 1]) + bytes(6) + bytes([17]) + bytes(63))
    device.tool("allow", "--from", str(day - 20))
    for old in range(2, 6):
        device.tool("stat", "import", "-", text=lines(day - old, "old", 20, 200))


def steps(day):
    """The steps of the two days that begin with `day`."""
    noon, second = day * SECONDS + 43200, (day + 1) * SECONDS + 1800
    third = second + SECONDS

    def record(device, count):
        for number in range(count):
            device.tool("stat", "add", f"com.example.starts{number % 3}", str(number + 1))
            device.tool("stat", "record", f"com.example.seconds{number % 2}", f"{number}.5")

    def import_day(device):
        device.tool("stat", "import", "-", text=lines(day - 1, "import", 300, 3000))

    def import_much(device):
        device.tool("stat", "import", "-", text=lines(day, "much", 100, 60000))

    def recorded_and_folded(count):
        def action(device):
            record(device, count)
            device.tool("stat", "fold")
        return action

    def add_to_store(device):
        shutil.rmtree(device.root.parent / "memory/tavrel/stat")
        record(device, 1)
        device.forget_memory()

    def tasking(device):
        device.tool("tasking", "schedule", "-", text="""{"TaskingID": "first", "TaskingPayload": [
            {"Domain": "com.norvane.da", "Key": "AggressiveSubmissionDays", "Value": 3},
            {"Domain": "com.example.app", "Key": "mode", "Value": "quiet"}]}""")

    def second_tasking(device):
        device.tool("tasking", "schedule", "-", text="""{"TaskingID": "second", "TaskingPayload": [
            {"Domain": "com.norvane.da", "Key": "AggressiveSubmissionDays", "Value": 2},
            {"Domain": "com.example.other", "Key": "level", "Value": 7}]}""")

    def new_system(device):
        device.write("etc/tavrel/system-version.plist", version("16R350"))

    def runs(name, *arguments):
        return lambda device: device.run(name, *arguments)

    def preference(value):
        return runs("tavrelctl", "prefs", "set", "com.example.app", "volume", str(value), "--int")

    tidy = ("tavrelctl", "tidy")
    erase = ("tavrelctl", "erase", "--key", "com.example.import", "--yes")
    deny = ("tavrelctl", "deny")
    first = [("import", import_day), ("fold", recorded_and_folded(6)),
             ("preference", preference(1)), ("large import", import_much),
             ("second fold", recorded_and_folded(3)), ("tasking", tasking)]
    return [
        *(Step(name, noon, noon, True, action, ()) for name, action in first),
        Step("run", noon, noon, False, runs("tavrel", "-d"), ()),
        Step("tidy", noon, second, False, runs(*tidy), (tidy,)),
        Step("upload", noon, second, False, runs("tavrel-upload", "--now"), ()),
        Step("preference of the second day", second, second, True, preference(2), ()),
        Step("fold of the second day", second, second, True, recorded_and_folded(4), ()),
        Step("values without segments", second, second, False, add_to_store, ()),
        Step("new system", second, second, True, new_system, ()),
        Step("tasking of the second day", second, second, True, second_tasking, ()),
        Step("run of the second day", second, second, False, runs("tavrel", "-d"), ()),
        Step("upload of the second day", second, third, False, runs("tavrel-upload", "--now"), ()),
        Step("forced run", second, third, False, runs("tavrel", "-f"), ()),
        Step("erasure", second, third, False, runs(*erase), (erase,)),
        Step("withdrawal", second, third, False, runs(*deny), (deny,)),
        Step("rest", second, third, True, lambda device: None, ()),  # the withdrawal is complete
    ]
