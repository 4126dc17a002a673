"""Counts bytes that reach a block device, including the file system's own blocks and journal, which
the kernel's account of a process omits."""

import os
import shutil
import signal
import subprocess
import sys
import tempfile

SECTOR = 512
IMAGE_BYTES = 1 << 30  # sparse


def call(*command):
    return subprocess.run(command, check=True, capture_output=True, text=True).stdout.strip()


class BlockDevice:
    """An ext4 file system on a loop device, mounted from entry to exit, also when SIGTERM ends the
    program. Where the system does not allow that, entering yields None, and `reason` says why."""

    def __enter__(self):
        signal.signal(signal.SIGTERM, lambda *_: sys.exit(1))
        if not shutil.which("mkfs.ext4"):
            raise SystemExit("bench: there is no mkfs.ext4: install e2fsprogs")
        self.folder = tempfile.mkdtemp(prefix="tavrel_flash.")
        self.mounted = os.path.join(self.folder, "mounted")
        self.loop = self.reason = None
        try:
            image = os.path.join(self.folder, "image")
            with open(image, "wb") as file:
                file.truncate(IMAGE_BYTES)
            # Write everything now, so that nothing is left to write during a measurement.
            call("mkfs.ext4", "-q", "-F", "-E", "lazy_itable_init=0,lazy_journal_init=0", image)
            os.mkdir(self.mounted)
            # The kernel detaches a loop device that mount has made when it is unmounted.
            call("mount", "-o", "loop,noatime", image, self.mounted)
            self.loop = call("findmnt", "--noheadings", "--output", "SOURCE", self.mounted)
        except (PermissionError, subprocess.CalledProcessError) as error:
            lines = (getattr(error, "stderr", "") or str(error)).splitlines()
            self.reason = lines[0] if lines else str(error)
            return None
        return self

    def __exit__(self, *_):
        if os.path.ismount(self.mounted):
            call("umount", "--recursive", self.mounted)
        shutil.rmtree(self.folder)

    def written(self):
        """Bytes written since the device was made; first flushes everything pending."""
        descriptor = os.open(self.mounted, os.O_RDONLY)
        try:
            os.fsync(descriptor)
            call("sync", "--file-system", self.mounted)
        finally:
            os.close(descriptor)
        with open(f"/sys/block/{os.path.basename(self.loop)}/stat", encoding="ascii") as file:
            return int(file.read().split()[6]) * SECTOR
