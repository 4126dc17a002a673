"""A device in a folder, with programs whose clocks the driver controls."""

import collections
import fcntl
import mmap
import os
import pathlib
import plistlib
import socket
import sqlite3
import struct
import subprocess
import termios
import time
from xml.parsers.expat import ExpatError

STORE = "var/mobile/Library/Brimhold/BHDataStore.sqlitedb"
PREFERENCES = "var/mobile/Library/Preferences"
SUBMISSION = "var/mobile/Library/Logs/Submission"
RECORDS = "var/mobile/Library/Logs/CrashReporter/StructuredData"
WHITELIST = "Library/Application Support/Brimhold/Whitelist_Pellio.plist"
SECONDS_PER_DAY = 86400
NANOSECONDS = 1_000_000_000
LONGEST = 60  # real seconds for one program

REAL, BOOT, PEAK, CALLS, ASKED, DONE = range(0, 48, 8)  # struct Shared of simulated_clock.c


class Fault(Exception):
    """A promise was not kept."""


class Clock:
    """The device's clocks: the true time, and how far the device is off."""

    def __init__(self, path, start):
        path.write_bytes(bytes(64))
        with open(path, "r+b") as file:
            self.memory = mmap.mmap(file.fileno(), 64)
        self.path, self.start, self.true, self.wrong = path, start, start, 0
        self.put(DONE, -1)
        self.show()

    def put(self, at, value):
        struct.pack_into("<q", self.memory, at, value)

    def get(self, at):
        return struct.unpack_from("<q", self.memory, at)[0]

    def show(self):
        self.put(REAL, self.now * NANOSECONDS)
        self.put(BOOT, (self.uptime) * NANOSECONDS)

    @property
    def uptime(self):
        return 600 + self.true - self.start

    @property
    def now(self):
        return self.true + self.wrong

    @property
    def today(self):
        return self.now // SECONDS_PER_DAY

    def go_to(self, second):
        """Moves to a second of true time, which never goes back."""
        assert second >= self.true
        self.true = second
        self.show()

    def set_wrong(self, seconds):
        self.wrong = seconds
        self.show()


class Ended:
    def __init__(self, status, out, err, clock):
        self.status, self.out, self.err = status, out, err
        self.peak, self.calls = clock.get(PEAK), clock.get(CALLS)


class Device:
    def __init__(self, root, bin_folder, library, clock):
        self.root, self.bin, self.clock = pathlib.Path(root), bin_folder, clock
        self.environment = {"PATH": os.environ["PATH"], "TAVREL_ROOT": str(root),
                            "LD_PRELOAD": str(library), "LIFE_CLOCK": str(clock.path)}
        self.peaks = {}
        self.kills = collections.Counter()  # kills that took place, by program
        self.residents = {}

    # -- Files --------------------------------------------------------------------------------

    def path(self, name):
        return self.root / name

    def write(self, name, content):
        path = self.path(name)
        path.parent.mkdir(parents=True, exist_ok=True)
        path.write_bytes(content if isinstance(content, bytes) else plistlib.dumps(content))

    def preferences(self, domain):
        try:
            return plistlib.loads((self.path(PREFERENCES) / f"{domain}.plist").read_bytes())
        except (FileNotFoundError, ExpatError, plistlib.InvalidFileException):
            return {}  # the programs, too, read a damaged file as empty

    def logs(self):
        """The names of the logs in each folder."""
        return {place: {path.name[:-4] for path in (self.path(SUBMISSION) / place).glob("*.log")}
                for place in ("pending", "outbox", "withheld")}

    def rows(self, query):
        path = self.path(STORE)
        if not path.exists():
            return []
        connection = sqlite3.connect(f"file:{path}?mode=ro", uri=True)
        try:
            return connection.execute(query).fetchall()
        finally:
            connection.close()

    def disk(self):
        status = os.statvfs(self.path("var"))
        return status.f_bavail * status.f_frsize, status.f_blocks * status.f_frsize

    def fill(self, kibibytes):
        """Leaves this much of the disk free, in whole pages."""
        free, _ = self.disk()
        with open(self.path("var/filler"), "ab") as file:
            os.posix_fallocate(file.fileno(), 0, max(free - kibibytes * 1024, 4096))

    def empty(self):
        self.path("var/filler").unlink(missing_ok=True)

    # -- Programs -----------------------------------------------------------------------------

    def run(self, *command, kill_at=None, text=None):
        environment = self.environment
        if kill_at:
            environment = {**environment, "LIFE_KILL_AT": str(kill_at)}
        done = subprocess.run([self.bin / command[0], *command[1:]], env=environment, input=text,
                              capture_output=True, text=True, timeout=LONGEST, check=False)
        ended = Ended(done.returncode, done.stdout, done.stderr, self.clock)
        if ended.status < 0 and not (kill_at and ended.status == -9):
            raise Fault(f"signal {-ended.status} ends {' '.join(command)}: {ended.err}")
        name = " ".join(command[:1 if command[0] == "tavrel" else 3])
        if kill_at:
            self.kills[name] += ended.status == -9
        if ended.status >= 0:
            self.peaks[name] = max(self.peaks.get(name, 0), ended.peak)
        return ended

    def tool(self, *command, text=None):
        """Runs a command that must succeed."""
        done = self.run("tavrelctl", *command, text=text)
        if done.status:
            raise Fault(f"tavrelctl {' '.join(command)} ends with {done.status}: {done.err}")
        return done

    def start(self, name, *command, **environment):
        with open(self.path(f"{name}.err"), "ab") as errors:
            self.residents[name] = subprocess.Popen(
                command, env={**self.environment, **environment}, stdin=subprocess.PIPE,
                stdout=subprocess.PIPE, stderr=errors, bufsize=0)
        return self.residents[name]

    def stop(self):
        for process in self.residents.values():
            process.kill()
            process.wait()
            process.stdin.close()
            process.stdout.close()
        self.residents.clear()

    def resident(self, name):
        """Resident KiB and open descriptors of a long-running program."""
        process = self.residents[name]
        if process.poll() is not None:
            raise Fault(f"{name} has ended with {process.returncode}")
        with open(f"/proc/{process.pid}/status", encoding="ascii") as file:
            memory = next(int(line.split()[1]) for line in file if line.startswith("VmRSS"))
        return memory, len(os.listdir(f"/proc/{process.pid}/fd"))


class Recorder:
    """The program of recorder.c. A call returns once its values are recorded."""

    def __init__(self, device, name, program):
        self.process = device.start(name, program)

    def tell(self, lines):
        self.process.stdin.write("".join(f"{line}\n" for line in [*lines, "."]).encode())
        if self.process.stdout.read(2) != b".\n":
            raise Fault("the recording program has ended")


class Statsd:
    def __init__(self, device):
        self.path = device.path("statsd.sock")
        self.process = device.start("tavrel-statsd", device.bin / "tavrel-statsd", "--idle", "0",
                                    "--unix", self.path)
        self.socket = socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
        wait_for("the socket of tavrel-statsd", self.path.exists)
        self.socket.connect(str(self.path))

    def tell(self, lines):
        self.socket.send("\n".join(lines).encode())
        wait_for("tavrel-statsd", self.is_done)

    def is_done(self):
        unread, = struct.unpack("i", fcntl.ioctl(self.socket, termios.TIOCOUTQ, bytes(4)))
        with open(f"/proc/{self.process.pid}/stat", encoding="ascii") as file:
            return unread == 0 and file.read().rsplit(")", 1)[1].split()[0] == "S"


class Sampler:
    """`tavrelctl stat collect`, which takes a reading on request."""

    def __init__(self, device):
        self.clock = device.clock
        device.start("stat collect", device.bin / "tavrelctl", "stat", "collect", "--seconds",
                     "1000000", LIFE_PACED="1")
        self.strokes = 0
        self.wait()

    def wait(self):
        wait_for("a reading", lambda: self.clock.get(DONE) == self.strokes)

    def stroke(self):
        self.strokes += 1
        self.clock.put(ASKED, self.strokes)
        self.wait()


def wait_for(what, condition):
    end = time.monotonic() + LONGEST
    while not condition():
        if time.monotonic() > end:
            raise Fault(f"waited {LONGEST} seconds for {what}")
        time.sleep(0.0002)
