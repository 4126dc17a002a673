#!/usr/bin/env python3
"""Measures the programs that record in memory: tavrelctl stat add, stat collect and tavrel-statsd.

    bench/recording_runs.py BIN_DIRECTORY

Each is measured in turn with its floor in the same run. Times are CPU times.
"""

import array
import fcntl
import os
import shutil
import signal
import socket
import statistics
import sys
import tempfile
import termios
import time

from wanted import Wanted

RUNS = 201  # runs of a short process
SAMPLES = 60
ROUNDS = 15  # per StatsD receiver
DATAGRAMS = 4000  # per round: that many fit in a socket's buffer
RECEIVE_BUFFER = 16 << 20
SO_RCVBUFFORCE = 33
LONGEST = 10  # seconds to wait for anything


class Device:
    """A device root on a tmpfs, where recording in memory works."""

    def __enter__(self):
        self.root = tempfile.mkdtemp(prefix="tavrel_recording.", dir="/dev/shm")
        os.makedirs(os.path.join(self.root, "run/tavrel/stat"))
        self.environment = dict(os.environ, TAVREL_ROOT=self.root)
        return self

    def __exit__(self, *_):
        shutil.rmtree(self.root)

    def cpu(self, *command):
        """Returns the CPU seconds of a process, whose output is discarded."""
        actions = [(os.POSIX_SPAWN_OPEN, 1, os.devnull, os.O_WRONLY, 0),
                   (os.POSIX_SPAWN_OPEN, 2, os.devnull, os.O_WRONLY, 0)]
        process = os.posix_spawn(command[0], command, self.environment, file_actions=actions)
        _, status, usage = os.wait4(process, 0)
        if status != 0:
            raise SystemExit(f"{command} ended with {status}")
        return usage.ru_utime + usage.ru_stime


def additions(bin_directory, wanted):
    with Device() as device:
        commands = {
            "an empty program with the same libraries": ["tavrel_empty_linked"],
            "tavrelctl stat add": ["tavrelctl", "stat", "add", "com.example.starts", "1"],
        }
        times = {name: [] for name in commands}
        for _ in range(RUNS):
            for name, (program, *arguments) in commands.items():
                path = os.path.join(bin_directory, program)
                times[name].append(device.cpu(path, *arguments))
    floor, add = (statistics.median(column) for column in times.values())
    print(f"One process, medians of {RUNS}")
    for name, column in times.items():
        print(f"  {name:42} {statistics.median(column) * 1e3:8.2f} ms")
    print(f"  ratio {add / floor:45.2f}{wanted.judge('stat add: ratio to an empty program', add / floor)}")


def samples(bin_directory, wanted):
    tool = os.path.join(bin_directory, "tavrelctl")
    with Device() as device:
        first = statistics.median(device.cpu(tool, "stat", "collect", "--seconds", "0")
                                  for _ in range(9))
        all_of_them = device.cpu(tool, "stat", "collect", "--seconds", str(SAMPLES))
        each = (all_of_them - first) / SAMPLES
        once = statistics.median(device.cpu(tool, "stat", "collect", "--once") for _ in range(21))
    print(f"\nA sample of the machine each second, {SAMPLES} of them\n"
          f"  each {each * 1e6:46.0f} us{wanted.judge('stat collect: one sample, us', each * 1e6)}\n"
          f"  as a process of its own (--once) {once * 1e3:18.2f} ms")


class Receiver:
    """A program that receives from a UDP socket, stopped whenever nothing is measured. It ends
    with the `with` block."""

    def __init__(self, device, *command):
        self.socket = socket.socket(socket.AF_INET, socket.SOCK_DGRAM)
        try:
            self.socket.setsockopt(socket.SOL_SOCKET, SO_RCVBUFFORCE, RECEIVE_BUFFER)
        except PermissionError:
            raise SystemExit("recording_runs: needs root for a large receive buffer") from None
        self.socket.bind(("127.0.0.1", 0))
        self.process = os.fork()
        if self.process == 0:
            os.dup2(self.socket.fileno(), 3)
            os.set_inheritable(3, True)
            os.execve(command[0], command,
                      dict(device.environment, LISTEN_FDS="1", LISTEN_PID=str(os.getpid())))
        time.sleep(0.2)

    def waiting(self):
        number = array.array("i", [0])
        fcntl.ioctl(self.socket.fileno(), termios.FIONREAD, number)
        return number[0]

    def nanoseconds(self):
        with open(f"/proc/{self.process}/schedstat", encoding="ascii") as file:
            return int(file.read().split()[0])

    def round(self, datagrams):
        """Returns CPU time per datagram, in nanoseconds."""
        os.kill(self.process, signal.SIGSTOP)
        _, status = os.waitpid(self.process, os.WUNTRACED)
        if not os.WIFSTOPPED(status):
            self.process = None
            raise SystemExit(f"a receiver ended with {os.waitstatus_to_exitcode(status)}")
        for datagram in datagrams:
            self.socket.sendto(datagram, self.socket.getsockname())
        before = self.nanoseconds()
        os.kill(self.process, signal.SIGCONT)
        end = time.monotonic() + LONGEST
        while self.waiting():
            if time.monotonic() > end:
                raise SystemExit("a receiver does not receive")
            time.sleep(0.001)
        time.sleep(0.01)
        return (self.nanoseconds() - before) / len(datagrams)

    def lost(self):
        """How many datagrams the kernel dropped for lack of room."""
        inode = os.fstat(self.socket.fileno()).st_ino
        with open("/proc/net/udp", encoding="ascii") as file:
            return next(int(line.split()[-1]) for line in file if f" {inode} " in line)

    def peak_mebibytes(self):
        with open(f"/proc/{self.process}/status", encoding="ascii") as file:
            return next(int(line.split()[1]) for line in file if line.startswith("VmHWM")) / 1024

    def __enter__(self):
        return self

    def __exit__(self, *_):
        if self.process:
            os.kill(self.process, signal.SIGKILL)
            os.waitpid(self.process, 0)
        self.socket.close()


def datagrams_of(lines):
    kinds = (b"api.requests.login:1|c", b"api.seconds.login:12.5|ms|#host:a", b"queue.depth:42|g",
             b"api.requests.logout:1|c|@0.5")
    return [b"\n".join(kinds[(i + j) % len(kinds)] for j in range(lines)) for i in range(DATAGRAMS)]


def statsd(bin_directory, wanted):
    print("\nStatsD datagrams on UDP, CPU time of the receiver")
    with (Device() as device,
          Receiver(device, os.path.join(bin_directory, "tavrel_statsd_floor")) as floor,
          Receiver(device, os.path.join(bin_directory, "tavrel-statsd"), "--idle", "0") as program):
        for lines in (1, 10):
            datagrams = datagrams_of(lines)
            pairs = [(floor.round(datagrams), program.round(datagrams)) for _ in range(ROUNDS)]
            bare, ours = (statistics.median(column) for column in zip(*pairs))
            print(f"  {lines:2} lines each: a bare recvmmsg loop {bare:6.0f} ns, tavrel-statsd "
                  f"{ours:6.0f} ns, rate {bare / ours:.2f} of the loop's")
            if lines == 1:
                print(" " * 16 + wanted.judge("statsd: CPU of one datagram, ratio to a bare loop",
                                              ours / bare))
        peak = program.peak_mebibytes()
        print(f"  lost: {program.lost()} of {2 * ROUNDS * DATAGRAMS}\n"
              f"  memory of tavrel-statsd at most {peak:.2f} MiB, of which its segment has up to 4"
              f"{wanted.judge('statsd: memory, MiB', peak)}")
        lost = program.lost()
    if lost:
        raise SystemExit(f"{lost} datagrams were lost")


def main():
    wanted = Wanted()
    additions(sys.argv[1], wanted)
    samples(sys.argv[1], wanted)
    statsd(sys.argv[1], wanted)
    sys.exit(wanted.status())


if __name__ == "__main__":
    main()
