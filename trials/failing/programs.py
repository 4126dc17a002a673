"""Runs tavrel's programs on a device, and lets calls of theirs fail."""

import contextlib
import gzip
import http.server
import os
import pathlib
import plistlib
import select
import signal
import socket
import subprocess
import tempfile
import threading
import time
import types

LONGEST = 60  # seconds for one command, of those in which the machine is not at a standstill
DATAGRAMS = [b"a:1|c", b"a:2|c\nt:1.5|ms", b"t:2.5|ms", b"g:7|g"]
APPLICATION = {"bundle_id": "com.example.app", "version": "1.0",
               "uuid": "01234567-89AB-CDEF-0123-456789ABCDEF"}
MESSAGES = [plistlib.dumps(message) for message in (
    {"operation": 0}, {"operation": 2, "app_data": [APPLICATION]})]

# The programs to try, the library to preload, a folder for the files of this process, and the
# process identifier of the program that it runs.
here = types.SimpleNamespace(programs=None, library=None, work=None, running=None)


def begin(folder, programs):
    def stop(*_):
        if here.running:
            os.kill(here.running, signal.SIGKILL)
        os._exit(1)

    # An exception would only end the task at hand.
    for number in (signal.SIGINT, signal.SIGTERM):
        signal.signal(number, stop)
    here.programs, here.library = programs, folder / "failing_calls.so"
    here.work = pathlib.Path(tempfile.mkdtemp(dir=folder))


class Broken(Exception):
    """A promise was not kept."""


class LogServer(http.server.BaseHTTPRequestHandler):
    """Takes logs as docs/upload.md says, and keeps them by name."""
    protocol_version = "HTTP/1.1"
    kept = {}

    def do_PUT(self):
        body = self.rfile.read(int(self.headers["Content-Length"]))
        self.kept[self.path.rsplit("/", 1)[1]] = gzip.decompress(body)
        self.send_response(201)
        self.send_header("Tavrel-Received", self.headers["Content-Digest"])
        self.send_header("Content-Length", "0")
        self.end_headers()

    def log_message(self, *_):
        pass


def serve():
    """Starts a server; yields its port."""
    server = http.server.ThreadingHTTPServer(("127.0.0.1", 0), LogServer)
    threading.Thread(target=server.serve_forever, daemon=True).start()
    return server.server_address[1]


@contextlib.contextmanager
def socket_of(command):
    """The socket that a service manager would pass to the command, with what waits on it."""
    if command[0] == "tavrel-statsd":
        ours, its = socket.socketpair(socket.AF_UNIX, socket.SOCK_DGRAM)
        waiting = DATAGRAMS
    elif command == ["tavrel"]:
        its, ours = (socket.socket(socket.AF_UNIX, socket.SOCK_SEQPACKET) for _ in range(2))
        path = here.work / "socket"
        path.unlink(missing_ok=True)
        its.bind(str(path))
        its.listen()
        ours.connect(str(path))
        waiting = MESSAGES
    else:
        yield None
        return
    with contextlib.closing(ours), contextlib.closing(its):
        for message in waiting:
            ours.send(message)
        yield its


def run(root, command, kind=None, at=None):
    """The ended process, and whether a call of the kind failed: "" or "x" once it did, the former
    before `main`."""
    environment = {"PATH": os.environ["PATH"], "TAVREL_ROOT": str(root)}
    mark = here.work / "mark"
    mark.unlink(missing_ok=True)
    if kind:
        environment.update(FAILING_KIND=kind, FAILING_AT=at, FAILING_MARK=str(mark))
    words = [str(here.programs / command[0]),
             *(word.replace("{root}", str(root)) for word in command[1:])]
    with socket_of(command) as passed:
        if not passed:
            environment["LD_PRELOAD"] = str(here.library) if kind else ""
            return finished(words, environment), read_if_any(mark)
        environment["FAILING_SKIPS_WAITS"] = ""
        start = 'LISTEN_PID=$$ LISTEN_FDS=1 LD_PRELOAD=$0 exec "$@"'
        done = finished(["/bin/sh", "-c", start, str(here.library), *words], environment, passed)
    return done, read_if_any(mark)


def finished(words, environment, passed=None):
    """Runs a program to its end. Files take what it prints: a pipe would wake us for each line."""
    streams = [here.work / "output", here.work / "errors"]
    anew = os.O_WRONLY | os.O_CREAT | os.O_TRUNC
    actions = [(os.POSIX_SPAWN_OPEN, number, str(path), anew, 0o600)
               for number, path in enumerate(streams, 1)]
    if passed:
        actions.append((os.POSIX_SPAWN_DUP2, passed.fileno(), 3))
    process = here.running = os.posix_spawn(words[0], words, environment, file_actions=actions)
    has_ended = ends_in_time(process)
    here.running = None
    if not has_ended:
        doing = threads_of(process)
        os.kill(process, signal.SIGKILL)
        os.waitpid(process, 0)
        raise Broken(f"it goes on for longer than {LONGEST} seconds:\n{doing}")
    status = os.waitstatus_to_exitcode(os.waitpid(process, 0)[1])
    return subprocess.CompletedProcess(
        words, status, *(path.read_text(encoding="utf-8", errors="replace") for path in streams))


def ends_in_time(process):
    descriptor = os.pidfd_open(process)
    try:
        for _ in range(LONGEST):
            # A second is one however long it takes: a machine at a standstill keeps both waiting.
            began = time.monotonic()
            if select.select([descriptor], [], [], 1)[0]:
                return True
            if time.monotonic() - began > 10:
                print(f"a second took {time.monotonic() - began:.0f}", flush=True)
        return False
    finally:
        os.close(descriptor)


def threads_of(process):
    """What the threads do: state and CPU time in ticks, wait in the kernel, system call, stack."""
    facts = ("stat", "wchan", "syscall", "stack")
    return "\n".join(" | ".join((thread / fact).read_text(encoding="ascii").strip() for fact in facts)
                     for thread in pathlib.Path(f"/proc/{process}/task").iterdir())


def read_if_any(path):
    return path.read_text(encoding="ascii") if path.exists() else None


def tool(root, *command):
    done, _ = run(root, ["tavrelctl", *command])
    if done.returncode:
        raise Broken(f"tavrelctl {' '.join(command)} ends with {done.returncode}: {done.stderr}")
    return done.stdout
