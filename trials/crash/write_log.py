"""Reads what dm-log-writes recorded of a block device, and makes states that a power cut leaves."""

import collections
import mmap
import struct

SECTOR = 512
MAGIC = 0x6A736677736872
FLUSH, FUA, DISCARD, MARK = 1, 2, 4, 8
# A flush makes everything before it durable; FUA makes the write itself durable. A write without
# FUA is logged with the next flush after its completion, so a mark may come before it.
Entry = collections.namedtuple("Entry", "flags start length data")


class WriteLog:
    """The entries, in order. A mark is text; the `data` of a write is its offset in the log."""

    def __init__(self, path):
        with open(path, "rb") as file:
            self.bytes = mmap.mmap(file.fileno(), 0, prot=mmap.PROT_READ)
        magic, _, count, unit = struct.unpack_from("<QQQI", self.bytes, 0)
        if magic != MAGIC:
            raise ValueError(f"{path} is no log of writes")
        self.entries = []
        place = unit
        for _ in range(count):
            sector, sectors, flags, length = struct.unpack_from("<QQQQ", self.bytes, place)
            data = place + unit
            if flags & MARK:
                text = self.bytes[place + 32:place + 32 + length].decode()
                self.entries.append(Entry(flags, 0, 0, text.rstrip("\0")))
                place = data
            else:
                self.entries.append(Entry(flags, sector * SECTOR, sectors * SECTOR, data))
                place = data if flags & DISCARD else data + sectors * SECTOR

    def content(self, entry):
        """What the entry leaves on the device; discarded ranges read as zeros."""
        if entry.flags & DISCARD:
            return bytes(entry.length)
        return self.bytes[entry.data:entry.data + entry.length]


def torn(log, position, cut, random, atom):
    """Of the entries from a position to the cut, any may be missing or torn except those
    written with FUA. Returns the numbers of those that are there, each with the atoms of it
    that are, or None if it is whole."""
    pieces = []
    share = random.choice([0.1, 0.5, 0.9])
    for number in range(position, cut):
        entry = log.entries[number]
        atoms = range(0, entry.length, atom)
        if not entry.length:
            continue
        if entry.flags & FUA:
            pieces.append((number, None))
        elif random.random() < share:
            kept = atoms if random.random() < 0.7 else random.sample(
                atoms, random.randint(1, len(atoms)))
            pieces.append((number, tuple(sorted(kept)) if len(kept) < len(atoms) else None))
    return tuple(pieces)


class Image:
    """A device whose writes can be undone."""

    def __init__(self, log, size, chunk=65536):
        self.log, self.chunk = log, chunk
        self.bytes = mmap.mmap(-1, size)  # takes memory only for what is written
        self.used = set()  # chunks that may hold something
        self.position = 0
        self.undo = []

    def put(self, start, content):
        self.bytes[start:start + len(content)] = content
        if content.strip(b"\0"):
            self.used.update(range(start // self.chunk, -(-(start + len(content)) // self.chunk)))

    def advance(self, position):
        """Applies all entries before the position, in full."""
        while self.position < position:
            entry = self.log.entries[self.position]
            if entry.length:
                self.put(entry.start, self.log.content(entry))
            self.position += 1

    def overwrite(self, start, content):
        """As `put`, until `mend`."""
        self.undo.append((start, self.bytes[start:start + len(content)]))
        self.put(start, content)

    def tear(self, pieces, atom):
        """Writes parts of entries, as `torn` chose them; `mend` undoes that."""
        for number, kept in pieces:
            entry = self.log.entries[number]
            content = self.log.content(entry)
            if kept is None:
                self.overwrite(entry.start, content)
            for piece in kept or ():
                self.overwrite(entry.start + piece, content[piece:piece + atom])

    def mend(self):
        for start, content in reversed(self.undo):
            self.bytes[start:start + len(content)] = content
        self.undo = []

    def write(self, file):
        file.truncate(0)
        file.truncate(len(self.bytes))
        whole = memoryview(self.bytes)
        for number in sorted(self.used):
            file.seek(number * self.chunk)
            file.write(whole[number * self.chunk:(number + 1) * self.chunk])
        file.flush()
