"""Runs tavrel's programs on a device, and lets calls of theirs fail."""

import contextlib
import gzip
import http.server
import os
import pathlib
import socket
import subprocess
import tempfile
import threading
import types

LONGEST = 60  # seconds for one command
DATAGRAMS = [b"a:1|c", b"a:2|c\nt:1.5|ms", b"t:2.5|ms", b"g:7|g"]

# The programs to try, the library to preload, and a folder for the files of this process.
here = types.SimpleNamespace(programs=None, library=None, work=None)


def begin(folder, programs):
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


def run(root, command, kind=None, at=None):
    """The ended process, and whether a call of the kind failed: "" or "x" once it did, the former
    before `main`."""
    environment = {"PATH": os.environ["PATH"], "TAVREL_ROOT": str(root)}
    mark = here.work / "mark"
    mark.unlink(missing_ok=True)
    preload = str(here.library) if kind else ""
    if kind:
        environment.update(FAILING_KIND=kind, FAILING_AT=at, FAILING_MARK=str(mark))
    words = [str(here.programs / command[0]),
             *(word.replace("{root}", str(root)) for word in command[1:])]
    options = {"env": environment, "capture_output": True, "text": True, "errors": "replace",
               "timeout": LONGEST, "check": False}
    if command[0] != "tavrel-statsd":
        environment["LD_PRELOAD"] = preload
        return subprocess.run(words, **options), read_if_any(mark)
    # As the service manager starts it: with a socket on which datagrams wait.
    ours, its = socket.socketpair(socket.AF_UNIX, socket.SOCK_DGRAM)
    with contextlib.closing(ours), contextlib.closing(its):
        for datagram in DATAGRAMS:
            ours.send(datagram)
        start = 'LISTEN_PID=$$ LISTEN_FDS=1 LD_PRELOAD=$0 exec "$@"'
        done = subprocess.run(["sh", "-c", start, preload, *words], pass_fds=(3,),
                              preexec_fn=lambda: os.dup2(its.fileno(), 3), **options)
    return done, read_if_any(mark)


def read_if_any(path):
    return path.read_text(encoding="ascii") if path.exists() else None


def tool(root, *command):
    done, _ = run(root, ["tavrelctl", *command])
    if done.returncode:
        raise Broken(f"tavrelctl {' '.join(command)} ends with {done.returncode}: {done.stderr}")
    return done.stdout
