"""What must hold on a device after a call failed in a program, by program."""

import contextlib
import functools
import json
import plistlib
import re
import sqlite3

from programs import Broken, LogServer, run, tool

PENDING = "var/mobile/Library/Logs/Submission/pending"
MOMENT = re.compile(r"<date>.*Z</date>")
# The lines that say that a run files no log.
NOT_FILED = re.compile("Z error (run ended early|cannot (go on serving|finish the (run|daily log)|"
                       "file log|read .*zentrix.plist: )|statistics store|"
                       "Couldn't load whitelist)|out of memory|terminate called")
NEVER_CAME = re.compile("never received requested AAI|out of memory|terminate called")
# How the machine is asked. What does not answer is left out.
ASKING = {"allocation", "open", "read", "listing", "thread"}
SUMS = ["cpu.busy_milliseconds", "disk.read_kib", "disk.written_kib", "network.received_kib",
        "network.sent_kib"]
# What a log makes of lists, and the lines that say that one is cut short.
LISTED = {"com.norvane.lumenhall.numAllInstalledApps", "com.norvane.lumenhall.numThirdPartyApps",
          "BHUserInterfaceLanguage", "BHPreferredUserInterfaceLanguage", "BHUserSetRegionFormat"}
NOT_LISTED = re.compile("Z error cannot (list|read) .*(applications|/locale|/languages)")
NAMED = re.compile(r' distribution "([^"]*)"|histCounts for key (\S+)\. ')


def values(root):
    """All statistics of the store and of what waits, as text."""
    return "\n".join(line for line in tool(root, "stat", "export").splitlines()
                     if "com.example." in line or "statsd." in line)


def logs(root):
    """What the submitted logs hold of the day."""
    found = []
    for path in sorted((root / PENDING).glob("log-tallied-*.log")):
        log = plistlib.loads(path.read_bytes())
        # Of the moment, of what clients of that run delivered, and of what an earlier run applied.
        for key in ("BHLogCreationDate", "BHActivatedAppInfo", "BHTaskID", "BHTaskDigest",
                    "BHTasking"):
            log.pop(key, None)
        if not path.with_suffix(".metadata.plist").exists():
            raise Broken(f"{path.name} has no metadata")
        found.append(log)
    return found


@functools.cache
def wanted(look, reference):
    """What a look at a reference shows, which does not change."""
    return look(reference)


def after_daily(device, reference, done):
    if done.returncode != 0:
        raise Broken(f"the daemon ends with {done.returncode}")
    filed_itself = bool(logs(device))
    next_daily_run(device, "-d")
    if values(device) != wanted(values, reference):
        raise Broken("statistics differ")
    found, right = logs(device), wanted(logs, reference)[0]
    # A line is written, too: without it, the next run must have filed the log.
    is_there = bool(found) if done.kind == "write" else filed_itself
    if not is_there and not NOT_FILED.search(done.stderr):
        raise Broken(f"it files no log and does not say why: {done.stderr}")
    # A run that was cut off after it filed its log files it again.
    if 0 < len(found) <= 2 and all(log == right for log in found):
        return
    # What the log lacks is said, nothing in it is wrong, and a forced run files the whole one.
    wrong = [key for log in found for key in lacks_or_differs(log, right, done.stderr.splitlines())]
    if wrong or len(found) > 2:
        raise Broken(f"{len(found)} logs, different in {wrong}; the run said: {errors_of(done)}")
    next_daily_run(device, "-f")
    if logs(device).count(right) != found.count(right) + 1:
        raise Broken("a forced run does not file the log")


def next_daily_run(device, mode):
    done, _ = run(device, ["tavrel", mode])
    errors = errors_of(done)
    if done.returncode != 0 or errors:
        raise Broken(f"tavrel {mode} ends with {done.returncode}: {errors}")


def errors_of(done):
    return [line for line in done.stderr.splitlines() if "Z error " in line]


def lacks_or_differs(log, right, lines):
    """The entries of a log that no line said would be missing, or that are wrong."""
    named = [match[1] or match[2] for line in lines if (match := NAMED.search(line))]
    excused = LISTED if any(NOT_LISTED.search(line) for line in lines) else set()
    # Where the store could not be read, no line names what it has.
    may_lack_any = not named and any("Z error statistics store " in line for line in lines)
    for group in sorted({*log, *right}):
        ours, theirs = log.get(group), right.get(group)
        if not isinstance(theirs, dict):
            if ours != theirs:
                yield group
            continue
        for key in sorted({*(ours or {}), *theirs} - excused):
            is_absent = key not in (ours or {})
            if not (may_lack_any or key in named) if is_absent else ours[key] != theirs.get(key):
                yield key


def after_fold(device, reference, done):
    # Segments that it emptied may stay without a word: the next fold removes them.
    if done.returncode == 0 and folded(device) != wanted(folded, reference):
        raise Broken(f"it ends with 0, and the store has {folded(device)}")
    tool(device, "stat", "fold")
    if values(device) != wanted(values, reference):
        raise Broken("statistics differ")
    said(done)


def folded(root):
    """The statistics of the store, without what waits."""
    waiting, aside = root / "run/tavrel/stat", root / "aside"
    waiting.rename(aside)
    found = values(root)
    aside.rename(waiting)
    return found


def after_add(device, _, done):
    tool(device, "stat", "fold")
    lines = [line for line in values(device).splitlines() if "com.example.starts" in line]
    right = 3 + (2 if done.returncode == 0 else 0)
    if len(lines) != 1 or lines[0].split("\t")[3] != str(right):
        raise Broken(f"it ended with {done.returncode}, and there is: {lines}")
    said(done)


def after_again(*command, look=None):
    """`look` shows the logs that must be there when the program ends with 0, if not all files."""
    def check(device, reference, done):
        said(done)
        if done.returncode == 0:
            is_done(device, reference, done, look or filed)
        tool(device, *command)
        is_done(device, reference, done, filed)
    return check


def is_done(device, reference, done, look):
    ended = f"; it ended with {done.returncode}: {done.stderr}"
    if values(device) != wanted(values, reference):
        raise Broken(f"statistics differ: {values(device)}{ended}")
    if is_allowed(device) != wanted(is_allowed, reference):
        raise Broken(f"the permission differs{ended}")
    if look(device) != wanted(look, reference):
        raise Broken(f"there are the logs {sorted(look(device))}{ended}")


def filed(root):
    """All that is kept for submission, by name."""
    folder = (root / PENDING).parent
    return {path.name: path.read_bytes() for path in folder.rglob("log-*")}


def with_their_logs(root):
    """The same without metadata of logs that have gone, which a later tidy removes."""
    files = filed(root)
    return {name: content for name, content in files.items()
            if name.replace(".metadata.plist", ".log") in files}


def after_change(look):
    """All of a change is made, or nothing of it."""
    def check(device, reference, done):
        said(done)
        now = look(device)
        if now != wanted(look, reference) and (
                done.returncode == 0 or now != wanted(look, done.before)):
            raise Broken(f"it ends with {done.returncode}, and there is: {now}")
    return check


def number(root):
    return tool(root, "prefs", "get", "com.example", "number")


def taskings(root):
    return tool(root, "tasking", "show", "--json")


def after_service(device, reference, done):
    """As after a daily run. Clients are not answered: what they delivered may be missing, and a line
    says so."""
    has_application = any(b"com.example.app" in log.read_bytes()
                          for log in (device / PENDING).glob("log-tallied-*.log"))
    if not has_application and done.kind != "write" and not (
            errors_of(done) or NEVER_CAME.search(done.stderr)):
        raise Broken(f"the log has no applications, and nobody says why: {done.stderr}")
    after_daily(device, reference, done)
    if taskings(device) == wanted(taskings, reference):
        return
    # Without the OS build, which could not be read, the next run applies the tasking once more.
    if not errors_of(done) and tool(device, "prefs", "get", "com.example", "k1").strip() != "1":
        raise Broken(f"the tasking is not applied, and nobody says why: {taskings(device)}")
    next_daily_run(device, "-f")
    if taskings(device) != wanted(taskings, reference):
        raise Broken(f"a forced run does not apply the tasking: {taskings(device)}")


def after_health(device, reference, done):
    """What a reading has is right, and the next one has everything. Only remembered counters that
    could not be read, which is said, leave it without growth."""
    said(done)
    right, old = wanted(readings, reference), wanted(readings, done.before)
    wrong = [(drive, key, value) for drive, reading in readings(device).items()
             if reading != old.get(drive)
             for key, value in reading.items() if key[0] and value != right[drive].get(key)]
    if wrong:
        raise Broken(f"a reading has {wrong}; it said: {done.stderr}")
    # A figure that cannot be read is absent without a word, like one that the drive does not
    # report. But each drive has a new reading.
    if done.returncode == 0 and (replaced(device, done.before) != set(right)
                                 or done.kind not in ASKING and readings(device) != right):
        raise Broken(f"it ends with 0, and readings are {readings(device)} in place of {right}")
    again, _ = run(device, done.args_of)
    now = readings(device)
    if "starting again" in done.stderr:
        now, right = ({drive: {key: value for key, value in reading.items() if key[0] != "growth"}
                       for drive, reading in found.items()} for found in (now, right))
    if again.returncode or now != right:
        raise Broken(f"the next one ends with {again.returncode}: {again.stderr}; "
                     f"readings are {now} in place of {right}")


def readings(root):
    """The readings of drives without their time, each figure with a key of its own."""
    found = {}
    for path in (root / "run/tavrel/health").glob("*.plist"):
        reading = plistlib.loads(path.read_bytes())
        del reading["time"]
        found[path.name] = {(group, key): value for group in ("figures", "growth")
                            for key, value in reading.pop(group, {}).items()}
        found[path.name] |= {("", key): str(value).replace(str(root), "")
                             for key, value in reading.items()}
    return found


def replaced(root, before):
    """The names of the readings that are no longer those of before."""
    folder = "run/tavrel/health"
    return {path.name for path in (root / folder).glob("*.plist")
            if path.stat().st_mtime_ns != (before / folder / path.name).stat().st_mtime_ns}


def after_collect(device, reference, done):
    """Values are right or absent; the next sample counts nothing twice."""
    said(done)
    now, right = collected(device), wanted(collected, reference)
    before = wanted(collected, done.before)
    is_whole = done.kind not in ASKING
    wrong = {key: value for key, value in now.items() if value not in (right[key], before.get(key))}
    if wrong or done.returncode == 0 and (
            now["samples"] != right["samples"] or is_whole and now != right):
        raise Broken(f"it ends with {done.returncode}, and there is {now} in place of {right}")
    again, _ = run(device, done.args_of)
    last = collected(device)
    if again.returncode or again.stderr or last["samples"] != now["samples"] + 1:
        raise Broken(f"the next sample ends with {again.returncode}: {again.stderr}: {last}")
    twice = {key for key in SUMS if last.get(key, 0) > right[key]}
    if twice:
        raise Broken(f"{twice} count twice: {last} in place of {right}")


def collected(root):
    """The samples of a machine that do not depend on the moment: values of scalars, numbers of
    measurements."""
    found = {}
    for line in tool(root, "stat", "export").splitlines():
        kind, _, key, *rest = line.split("\t")
        name = key.removeprefix("com.norvane.usage.")
        if name != key and name != "disk.free_mib":
            found[name] = int(rest[0]) if kind == "scalar" else found.get(name, 0) + 1
    return found


def is_allowed(root):
    return json.loads(tool(root, "status", "--json"))["submission_allowed"]


@functools.cache
def undisturbed(reference, *command):
    return MOMENT.sub("", run(reference, command)[0].stdout)


def after_reading(_, reference, done):
    said(done)
    if done.returncode == 0 and (
            MOMENT.sub("", done.stdout) != undisturbed(reference, *done.args_of)):
        raise Broken(f"it ends with 0 and prints something else: {done.stdout}{done.stderr}")


def after_statsd(device, reference, done):
    said(done)
    found, left = received(device), list(wanted(received, reference))
    if done.returncode == 0 and not done.stderr and found != left:
        raise Broken(f"statistics differ: {found}")
    # Of what could not be recorded, values are absent and sums smaller.
    for row in found:
        match = next((all_of_it for all_of_it in left if is_part(row, all_of_it)), None)
        if match is None:
            raise Broken(f"nobody sent {row}: {found}")
        left.remove(match)


def is_part(row, of):
    return row == of or (row[0] == "scalar" and row[:3] == of[:3]
                         and 0 <= int(row[3]) < int(of[3]))


def received(root):
    """What datagrams brought, without the second of the day."""
    lines = (line.split("\t") for line in values(root).splitlines() if "statsd." in line)
    return sorted(fields[:3] + fields[-1:] for fields in lines)


def after_upload(device, reference, done):
    said(done)
    waiting = {path.name: path.read_bytes() for path in (device / PENDING).glob("*.log")}
    outbox = device / PENDING.replace("pending", "outbox")
    waiting |= {path.name: path.read_bytes() for path in outbox.glob("*.log")}
    all_logs = {path.name: path.read_bytes() for path in (reference / "sent").glob("*.log")}
    if {**waiting, **LogServer.kept} != all_logs:
        raise Broken(f"of {sorted(all_logs)} there are {sorted(waiting)} on the device and "
                     f"{sorted(LogServer.kept)} on the server; it said: {done.stderr}")
    # Nothing may be sent while the permission cannot be read, which is said.
    if done.returncode == 0 and waiting and "zentrix.plist: " not in done.stderr:
        raise Broken(f"it ends with 0, and {sorted(waiting)} wait")
    again, _ = run(device, done.args_of)
    if again.returncode or LogServer.kept != all_logs:
        raise Broken(f"the next run ends with {again.returncode}: {again.stderr}")


def after_load(device, reference, done):
    said(done)
    if done.returncode == 0 and rows(device) != wanted(rows, reference):
        raise Broken("it ends with 0, and rows differ")
    again, _ = run(device, done.args_of)
    if again.returncode or rows(device) != wanted(rows, reference):
        raise Broken(f"the next load ends with {again.returncode}, and rows may differ: "
                     f"{again.stderr}")


def rows(root):
    """All rows of all tables that docs/fleet-tables.md promises, with digests for numbers of logs."""
    with contextlib.closing(sqlite3.connect(root / "fleet.db")) as tables:
        tables.row_factory = sqlite3.Row
        digest = {log: name for log, name in tables.execute("SELECT log, digest FROM logs")}
        views = [name for name, in tables.execute("SELECT name FROM sqlite_master "
                                                  "WHERE type = 'view'")]
        return sorted(repr((view, [digest[value] if column == "log" else value
                                   for column, value in zip(row.keys(), row)]))
                      for view in views for row in tables.execute(f"SELECT * FROM {view}"))


def said(done):
    """A failure has a status and a line."""
    if done.returncode not in (0, 1, 2, 75, 78):
        raise Broken(f"it ends with {done.returncode}: {done.stderr}")
    # Standard error is written, too.
    if done.returncode != 0 and not done.stderr.strip() and done.kind != "write":
        raise Broken(f"it ends with {done.returncode} without a word")
