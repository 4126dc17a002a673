"""The write of f2fs that a power cut can lose even though its fsync has returned.

An fsync waits for the node blocks that it wrote and then flushes the device. In Linux 6.1,
fs/f2fs/node.c numbers these blocks from 0 after each checkpoint but takes the number 0 to mean
"wrote none", so the first one may reach the device after the flush. Other kernels were not
examined, and are not excused.
"""

import struct

from write_log import DISCARD, FLUSH, FUA, MARK

KERNEL = "6.1."  # the versions known to do so
BLOCK = 4096
FOOTER = 4072  # at the end of a node block: node, inode, flags, checkpoint version, next address
FSYNC = 2  # one of these flags


def has_fault(kind, kernel):
    return kind.type == "f2fs" and kernel.startswith(KERNEL)


def is_fsynced_node(log, entry, version):
    if entry.length != BLOCK or entry.flags & (DISCARD | MARK):
        return False
    node, inode, flags, found, following = struct.unpack_from(
        "<IIIQI", log.content(entry), FOOTER)
    return (node > 0 and inode > 0 and flags & FSYNC and found & 0xFFFFFFFF == version
            and following == entry.start // BLOCK + 1)


class UnawaitedNodes:
    def __init__(self, log):
        """Finds such writes: each comes right after the flush of its fsync, and right before
        another write. Before another flush, it could belong to an fsync that has not returned."""
        self.log = log
        self.after = {}  # positions, by the position of the flush
        version = None
        numbers = [number for number, entry in enumerate(log.entries) if not entry.flags & MARK]
        for before, number, behind in zip(numbers, numbers[1:], numbers[2:]):
            entry = log.entries[number]
            if entry.flags & FUA and entry.length == BLOCK:  # the end of a checkpoint
                version = struct.unpack_from("<I", log.content(entry))[0]
            elif version is not None and is_fsynced_node(log, entry, version):
                version = None
                if log.entries[before].flags & FLUSH and not log.entries[behind].flags & FLUSH:
                    self.after[before] = number

    def lost(self, flush, end, last):
        """Returns the position of such a write that is missing although its fsync had returned.
        Everything up to `flush` is there, and the power is cut at `end`. The fsync had returned if
        anything written later is there (`last` is its position) or was sent out."""
        position = self.after.get(flush)
        if position is None:
            return None
        told = any(entry.flags & MARK for entry in self.log.entries[flush:min(position, end)])
        return position if told or last is not None and last > position else None
