"""The contents of a device, read without tavrel's own programs."""

import functools
import hashlib
import json
import os
import pathlib
import plistlib
import re
import shutil
import sqlite3

STORE = "var/mobile/Library/Brimhold"
PREFERENCES = "var/mobile/Library/Preferences"
SUBMISSION = "var/mobile/Library/Logs/Submission"
RECORDS = "var/mobile/Library/Logs/CrashReporter/StructuredData"
EVENTS = "var/lib/tavrel/ecc-events"
LAST_RUN = "var/lib/tavrel/last-run.plist"


class Broken(Exception):
    """A promise was not kept."""


def tree_digest(root):
    """A digest of everything that programs can read there."""
    digest = hashlib.sha256()
    for folder, folders, files in os.walk(root):
        folders.sort()
        for name in sorted(folders + files):
            path = os.path.join(folder, name)
            status = os.lstat(path)
            digest.update(f"{path}\0{status.st_mode}\0{status.st_size}\0".encode())
            if os.path.isfile(path) and not os.path.islink(path):
                with open(path, "rb") as file:
                    digest.update(file.read())
    return digest.digest()


def names(folder):
    """The names in a folder, without the leftovers of an interrupted write."""
    if not folder.is_dir():
        return []
    found = sorted(name for name in os.listdir(folder) if not name.startswith(".tavrel-"))
    for name in found:
        if ".corrupt-" in name or "damaged" in name or "unusable" in name:
            raise Broken(f"{name} was set aside")
    return found


def number(packed):
    value = shift = 0
    while True:
        byte = packed.pop(0)
        value |= (byte & 127) << shift
        shift += 7
        if byte < 128:
            return value


def joined(database, runs):
    """The bytes of a distribution's values, and those of their offsets."""
    packed, values, offsets = list(runs), b"", b""
    while packed:
        first, chunks, count = number(packed), number(packed), number(packed)
        rows = [row[0] for row in database.execute(
            "SELECT data FROM chunks WHERE chunk >= ? AND chunk < ? ORDER BY chunk",
            (first, first + chunks // 2 * 2))]
        new = b"".join(rows[:chunks // 2]), b"".join(rows[chunks // 2:])
        if (len(new[0]), len(new[1])) != (count * 8, count * 4):
            raise Broken(f"a distribution lacks values: run {first}, {chunks}, {count}")
        values, offsets = values + new[0], offsets + new[1]
    return values, offsets


def statistics(root, scratch):
    """All rows of the store, which must be sound. Reads a copy of it."""
    present = names(root / STORE)
    name = "BHDataStore.sqlitedb"
    parts = [(root / STORE / file).read_bytes() if file in present else b""
             for file in (name, name + "-wal")]
    return rows_of(Parts(parts), scratch)


class Parts(list):
    """The files of a store. Many states have the same files, so these are read only once."""

    def __init__(self, parts):
        super().__init__(parts)
        self.name = hashlib.sha256(b"".join([*parts, str(len(parts[0])).encode()])).digest()

    def __hash__(self):
        return hash(self.name)

    def __eq__(self, other):
        return self.name == other.name


@functools.lru_cache(maxsize=64)
def rows_of(parts, scratch):
    if not any(parts):
        return {}
    shutil.rmtree(scratch, ignore_errors=True)
    scratch.mkdir()
    (scratch / "store").write_bytes(parts[0])
    (scratch / "store-wal").write_bytes(parts[1])
    database = sqlite3.connect(scratch / "store")
    try:
        verdict = database.execute("PRAGMA integrity_check").fetchall()
        if verdict != [("ok",)]:
            raise Broken(f"the store is damaged: {verdict}")
        rows = {}
        if not database.execute("SELECT 1 FROM sqlite_master").fetchall():
            return rows
        for day, key, value in database.execute("SELECT day, key, value FROM scalars"):
            rows[day, key.decode()] = value
        for day, key, count, runs in database.execute("SELECT * FROM distributions"):
            values = joined(database, runs)
            if len(values[0]) != count * 8:
                raise Broken(f"{key} has {len(values[0]) // 8} values, not {count}")
            rows[day, key.decode()] = values
        return rows
    except sqlite3.DatabaseError as error:
        raise Broken(f"the store cannot be read: {error}") from None
    finally:
        database.close()


@functools.lru_cache(maxsize=256)
def parsed(content):
    return plistlib.loads(content)


def property_list(path):
    try:
        return dict(parsed(path.read_bytes()))
    except Exception as error:  # whatever the parser raises
        raise Broken(f"{path.name} is no property list: {error}") from None


def log(folder, name):
    """Returns the log's content and metadata as text, without the parts that differ each time it is
    made; the system change that it reports; the tasking in force."""
    stem = name.removesuffix(".log")
    path = folder / f"{stem}.metadata.plist"
    if not path.exists():
        raise Broken(f"{folder.name}/{name} has no metadata")
    metadata = property_list(path)
    moment = metadata.pop("Time", None)
    change = metadata.pop("Options", {}).get("previous_os_version")
    tasking = None
    if name.startswith("log-tallied"):
        content = property_list(folder / name)
        content.pop("BHLogCreationDate")
        tasking = str([content.pop(key) for key in sorted(content) if key.startswith("BHTask")])
    else:
        content = re.sub(r"(?m)^Incident ID: .*\n|(?<=tavrel)\[\d+\]", "",
                         (folder / name).read_text())
        if not content.endswith("\n"):
            raise Broken(f"{name} is torn")
    if moment is None:
        raise Broken(f"{path.name} has no time")
    return repr((content, metadata)), change, tasking


class Contents:
    """`statistics` and `preferences` by key, `logs` by name, `records` and `events` as sets."""

    def __init__(self, root, scratch):
        root = pathlib.Path(root)
        self.statistics = statistics(root, scratch)
        self.preferences = {}
        for name in names(root / PREFERENCES):
            if name.endswith(".plist"):
                values = property_list(root / PREFERENCES / name)
                self.preferences.update({(name, key): value for key, value in values.items()})
        self.logs = {}
        for place in ("pending", "outbox"):
            folder = root / SUBMISSION / place
            for name in names(folder):
                if name.endswith(".log"):
                    self.logs[name] = log(folder, name)
        self.records, self.torn = set(), []
        for name in names(root / RECORDS):
            for line in (root / RECORDS / name).read_bytes().split(b"\n"):
                try:
                    if line:
                        json.loads(line)
                        self.records.add((name, line))
                except ValueError:
                    self.torn.append(name)
        self.events = set(names(root / EVENTS))
        self.run = None
        if (root / LAST_RUN).exists():
            self.run = property_list(root / LAST_RUN)
