"""The life of a device, day by day: what happens to it, and whether it keeps its promises."""

import collections
import copy
import datetime
import json
import os
import pathlib
import plistlib
import re
import struct

from device import (Fault, PREFERENCES, RECORDS, Recorder, SECONDS_PER_DAY, STORE, SUBMISSION,
                    Sampler, Statsd)
from model import LANGUAGES, LAST_RUN, Model, OWN, Statistics, TRACKED, date_text, moment

DRIVER = pathlib.Path(__file__).parents[2] / "docs/examples/registry/storage.plist"
EVENTS = "var/lib/tavrel/ecc-events"
STORE_FOLDER = os.path.dirname(STORE)
SET_ASIDE = re.compile(r"\.corrupt-|-kept-damaged$")
CLOSE = 1e-9  # relative; sums of doubles depend on their order


def same(found, wanted):
    """Whether both are equal, apart from the rounding of means and deviations."""
    if isinstance(wanted, dict):
        return isinstance(found, dict) and found.keys() == wanted.keys() and all(
            same(found[key], wanted[key]) for key in wanted)
    if isinstance(wanted, list):
        return isinstance(found, list) and len(found) == len(wanted) and all(
            map(same, found, wanted))
    if isinstance(wanted, float):
        return abs(found - wanted) <= CLOSE * max(1.0, abs(wanted))
    return found == wanted


def differences(found, wanted, path=""):
    if isinstance(wanted, dict) and isinstance(found, dict):
        return [line for key in {**found, **wanted} for line in differences(
            found.get(key), wanted.get(key), f"{path}/{key}")]
    return [] if same(found, wanted) else [f"{path}: {found!r} and not {wanted!r}"]


def expect(condition, message):
    if not condition:
        raise Fault(message)


class Life:
    def __init__(self, device, chance, build_day, recorder):
        self.device, self.clock, self.chance = device, device.clock, chance
        self.build_day, self.recorder_program = build_day, recorder
        self.model = Model()
        self.waiting, self.withheld = set(), set()  # names of logs
        self.limits = {"Store": 90, "Pending": 60, "Outbox": 60}
        self.limits_are_whole = True
        self.counts = {}
        self.number = 0  # the number of memory errors
        self.updates = 0
        self.scalar_keys = set()  # keys in stores that were damaged later
        self.begin()

    def count(self, what, number=1):
        self.counts[what] = self.counts.get(what, 0) + number

    def begin(self):
        self.device.path("run/tavrel/stat").mkdir(parents=True)
        self.device.write("etc/tavrel/device-answers.plist", {"DiskUsage": {
            "TotalDiskCapacity": 32 << 30, "TotalDataAvailable": 20 << 30}})
        self.device.write("var/lib/tavrel/registry/storage.plist", DRIVER.read_bytes())
        self.update_system()
        self.update_whitelist()
        self.device.write("etc/tavrel/languages", LANGUAGES)
        self.agree_before_the_clock_is_right()
        self.recorder = Recorder(self.device, "recorder", self.recorder_program)
        self.statsd = Statsd(self.device)
        self.sampler = Sampler(self.device)
        self.model.record(self.clock, self.build_day, "a", "com.norvane.usage.samples", 1)

    # -- What programs do ---------------------------------------------------------------------

    def record(self, recorder, keys, count):
        lines = []
        for _ in range(count):
            kind = self.chance.choice("aasrrr")
            key = self.chance.choice(keys[kind])
            value = self.chance.randrange(-400, 40000) / 8 if kind == "r" else \
                self.chance.randrange(1, 3000)
            lines.append(f"{kind} {key} {value}")
            self.model.record(self.clock, self.build_day, kind, key, value)
        recorder.tell(lines)

    def activity(self, count=None):
        """A few minutes in which everything that records does so."""
        count = count or self.chance.randrange(1, 12)
        self.record(self.recorder, {
            "a": [f"com.example.s{i}" for i in range(4)], "s": ["com.example.level"],
            "r": [f"com.example.d{i}" for i in range(3)]}, count)
        lines = []
        for _ in range(self.chance.randrange(1, 6)):
            # While the clock is wrong, a set does not replace a value added a second before.
            kinds = [("a", "c", "hits", 7), ("s", "g", "level", 12), ("r", "ms", "wait", 2.5),
                     ("a", "g", "level", 3)][:4 if self.clock.today >= self.build_day else 3]
            kind, letter, name, value = self.chance.choice(kinds)
            value *= self.chance.randrange(1, 50)
            lines.append(f"{name}:{'+' if (kind, letter) == ('a', 'g') else ''}{value}|{letter}")
            self.model.record(self.clock, self.build_day, kind, f"statsd.{name}", value)
        self.statsd.tell(lines)
        if self.clock.today >= self.build_day:
            self.sampler.stroke()
            self.model.record(self.clock, self.build_day, "a", "com.norvane.usage.samples", 1)
        if self.chance.random() < 0.5:
            value = self.chance.randrange(1, 9)
            self.device.tool("stat", "add", "com.example.s0", str(value))
            self.model.record(self.clock, self.build_day, "a", "com.example.s0", value)
        if self.chance.random() < 0.2:
            self.device.tool("stat", "record", "com.example.d0", "4.5")
            self.model.record(self.clock, self.build_day, "r", "com.example.d0", 4.5)

    def killed_recorder(self):
        """Kills a program of the current release: what it recorded must stay."""
        recorder = Recorder(self.device, "killed", self.recorder_program)
        self.record(recorder, {"a": [f"com.example.v{self.updates}.starts"], "s": ["com.example.k"],
                               "r": [f"com.example.v{self.updates}.seconds"]}, 20)
        self.device.kills["recorder"] += self.kill_recorder(recorder)

    def kill_recorder(self, recorder):
        """Returns whether it was still running."""
        self.device.residents.pop("killed")
        recorder.process.kill()
        status = recorder.process.wait()
        recorder.process.stdin.close()
        recorder.process.stdout.close()
        return status == -9

    def fold(self):
        self.device.tool("stat", "fold")
        self.model.fold(self.clock, self.build_day)

    def memory_error(self):
        self.number += 1
        registers = [self.number, self.clock.now]
        self.device.write(f"{EVENTS}/{self.number:08}.event",
                          struct.pack("<BB6x8Q", 4, 2, *registers, *[0] * 6))
        self.model.events.append({"id": 4, "count": 2, "reg0": registers[0], "reg1": registers[1]})

    # -- The daily run ------------------------------------------------------------------------

    def logs(self):
        found = self.device.logs()
        return found["pending"] | found["outbox"], found["withheld"]

    def read_log(self, name, ending=".log"):
        for place in ("pending", "outbox", "withheld"):
            path = self.device.path(SUBMISSION) / place / f"{name}{ending}"
            if path.exists():
                return path.read_bytes()
        raise Fault(f"{name}{ending} is missing")

    def check_new_logs(self, effects):
        """New logs are exactly those expected, with each value; old ones remain or were deleted."""
        waiting, withheld = self.logs()
        new = {name for name in (waiting - self.waiting) | (withheld - self.withheld)}
        tallied = {name for name in new if name.startswith("log-tallied-")}
        expect(len(tallied) == (effects["log"] is not None),
               f"day {effects['day']}: {len(tallied)} logs, {effects['outcome']} expected")
        for name in tallied:
            self.check_log(name, effects)
        nand = new - tallied
        expect(len(nand) == (effects["nand"] is not None), f"{len(nand)} NAND logs")
        expect(all((name in withheld) == (effects["nand"] == "withheld") for name in nand),
               "a NAND log is not where it belongs")
        for name in nand:
            expect(f"Date: {moment(self.clock.now)} +0000" in self.read_log(name).decode(),
                   f"the date of {name}")
        kept = set() if effects["deletes"] else self.waiting
        expect(waiting - new == kept, f"{self.waiting ^ waiting} have come or gone")
        if effects["sends"]:
            expect(not self.device.logs()["pending"], "logs were not sent on")
        expect(len(withheld) <= 8, "too many logs are withheld")
        self.waiting, self.withheld = waiting, withheld
        self.count("NAND logs", len(nand))

    def check_log(self, name, effects):
        log = plistlib.loads(self.read_log(name))
        wrong = differences(log, effects["log"]) + differences(
            plistlib.loads(self.read_log(name, ".metadata.plist")), effects["metadata"])
        expect(not wrong, f"log of day {effects['day']}: {'; '.join(wrong)}")
        self.count("logs")
        self.count("values", len(log["BHScalars"]) + len(log["BHDistributions"]))

    def check_preferences(self):
        found = {key: value for key, value in self.device.preferences(OWN).items()}
        expect(found == self.model.own, f"preferences: {differences(found, self.model.own)}")
        for domain, wanted in self.model.domains.items():
            found = self.device.preferences(domain)
            expect(found == wanted, f"{domain}: {differences(found, wanted)}")

    def records_of_today(self):
        return self.device.path(RECORDS) / f"172-{date_text(self.clock.today)}.jsonl"

    def before_run(self):
        """If a clock that was ahead had made this day's file, it may have been removed since."""
        if not self.records_of_today().exists():
            self.model.records.pop(self.clock.today, None)

    def check_records(self, disturbed=False):
        day, path = self.clock.today, self.records_of_today()
        text = path.read_text(encoding="ascii") if path.exists() else ""
        found = [json.loads(line)["record"] for line in text.splitlines()]
        wanted = self.model.records.get(day, [])
        if disturbed:  # a record filed before a kill may be filed again
            expect(all(record in found for record in wanted), f"{path.name} lacks records")
            self.model.records[day] = found
        else:
            expect(found == wanted, f"{path.name} has {found} and not {wanted}")

    def daily_run(self):
        self.before_run()
        effects = self.model.gated(self.clock, self.build_day)
        done = self.device.run("tavrel", "-d")
        if effects is None:
            expect("Day unchanged since last run" in done.err, f"a run took place: {done.err}")
        else:
            passed = [each.split(" info ", 1)[1] for each in done.err.splitlines()
                      if " had no daily run, " in each]
            line = effects["line"]
            expect(passed == ([line] if line else []), f"{passed} and not {line}")
            self.check_effects(effects)
        self.tidy()

    def check_effects(self, effects, disturbed=False):
        self.check_new_logs(effects)
        self.check_preferences()
        self.check_records(disturbed)

    def disturbed_run(self, disturb):
        """A disturbed run, and the next one, which makes up for it. A log may lack
        something only if the run reports that; it is then filed again by hand.
        False when no run was due."""
        self.before_run()
        before = copy.deepcopy(self.model, {id(self.model.ever): self.model.ever})
        effects = self.model.gated(self.clock, self.build_day)
        if effects is None:
            return False
        said = " error " in disturb().err
        waiting, self.withheld = self.logs()
        new = waiting - self.waiting
        expect(effects["deletes"] or self.waiting <= waiting, "logs have gone")
        tallied = [name for name in new if name.startswith("log-tallied-")]
        expect(len(tallied) <= (effects["log"] is not None), "a log that nobody expects")
        is_filed = effects["log"] is None
        for name in tallied:
            try:
                self.check_log(name, effects)
                is_filed = True
            except Fault as fault:
                expect(said, f"nobody says why: {fault}")
        self.waiting = waiting
        if not self.adopt(before):
            again = self.model.gated(self.clock, self.build_day)
            self.device.run("tavrel", "-d")
        elif is_filed:
            self.fold()  # this takes in values that could not be committed
            return True
        else:
            expect(said, f"no log of day {effects['day']}, and nobody says why")
            self.count("logs filed by hand")
            again = self.model.tasks(effects["day"], self.clock, self.build_day)
            if before.fates.get(effects["day"]) != "reported":
                self.model.note_fate(effects["day"], "filed by hand", self.clock)
            self.device.run("tavrel", "-f")
        self.check_effects(again, disturbed=True)
        return True

    def adopt(self, before):
        """Takes over the state that a disturbed run has left: each preference has its old or its
        new value. Returns whether the day counts as done."""
        model, found = self.model, self.device.preferences(OWN)
        for key in {**found, **before.own, **model.own}:
            allowed = [before.own.get(key), model.own.get(key)]
            if key == "LastLogOutcome":
                allowed += ["not-filed", "filed-in-part", "store-unreadable"]
            expect(found.get(key) in allowed, f"{key} is {found.get(key)} after a disturbed run")
        is_done = found.get(LAST_RUN) == model.own[LAST_RUN]
        model.own = found
        for domain in model.domains:
            values = self.device.preferences(domain)
            for key in {**values, **before.domains[domain], **model.domains[domain]}:
                expect(values.get(key) in (before.domains[domain].get(key),
                                           model.domains[domain].get(key)), f"{domain}: {key}")
            model.domains[domain] = values
        nand = self.device.preferences("com.norvane.zentrix.tavrel").get("SSLastLoggedAt")
        model.last_nand = int((nand - moment(0)).total_seconds()) if nand else None
        model.corruptions = self.device.preferences("com.norvane.tallied").get(
            "DatabaseCorruptionCount", 0)
        # Events taken from the queue must have been filed.
        waiting = {int(path.stem) for path in self.device.path(EVENTS).glob("*.event")}
        todays = model.records.get(self.clock.today, [])
        model.events = [event for event in todays if event["reg0"] in waiting]
        model.records[self.clock.today] = [event for event in todays if event not in model.events]
        return is_done

    # -- Limits -------------------------------------------------------------------------------

    def days_held(self):
        return sorted({day for table in ("scalars", "distributions")
                       for day, in self.device.rows(f"SELECT DISTINCT day FROM {table}")})

    def excess_days(self, days):
        """The days to remove: first those recorded while the clock was ahead, then the oldest."""
        today, last = self.clock.today, self.model.own.get(LAST_RUN)
        waits = {today, today - 1} | ({last + 1, last + 2} if last is not None else set())
        waits -= {day for day in days if last is not None and day <= last and day != today}
        order = [day for day in days if day not in waits]
        order.sort(key=lambda day: (day <= today + 1, day))
        return order[:max(0, len(days) - self.limits["Store"])]

    def excess_logs(self, place):
        def day_of(name):
            stamp = datetime.datetime.strptime(name.split("-")[-2], "%Y%m%dT%H%M%SZ")
            return (stamp - moment(0)).total_seconds() // SECONDS_PER_DAY
        names = sorted(self.device.logs()[place], key=lambda name: (
            day_of(name) <= self.clock.today + 1, name.split("-")[-2], name))
        excess = []
        while len({day_of(name) for name in names}) > self.limits[place.title()]:
            if len(names) == 1:
                break
            excess.append(names.pop(0))
        return set(excess)

    def set_aside(self):
        """The number of damaged files that were set aside, and their KiB."""
        found = [path for folder in (STORE_FOLDER, PREFERENCES)
                 for path in self.device.path(folder).glob("*") if SET_ASIDE.search(path.name)]
        return len(found), sum((path.stat().st_size + 4095) // 4096 * 4 for path in found)

    def tidy(self):
        days, logs = self.days_held(), self.device.logs()
        aside, _ = self.set_aside()
        excess = self.excess_days(days)
        gone = {place: self.excess_logs(place) for place in ("pending", "outbox")}
        done = self.device.run("tavrelctl", "tidy")
        if not self.limits_are_whole:
            excess, gone = [], {}
        expect(done.status == (0 if self.limits_are_whole else 1), f"tidy: {done.err}")
        for place, names in gone.items():
            expect(self.device.logs()[place] == logs[place] - names, f"logs in {place}")
            self.waiting -= names
            self.limit(f"{place}.logs", len(names))
        left, size = self.set_aside()
        expect(size <= 16 << 10 or not self.limits_are_whole, f"{size} KiB are set aside")
        self.limit("set_aside.files", aside - left)
        self.model.stored.remove(days=set(excess))
        self.limit("store.days", len(excess))
        left = set(self.days_held())
        expect(left - {self.clock.today} == set(days) - set(excess) - {self.clock.today},
               f"tidy removed {sorted(set(days) - left)} and not {excess}")

    def limit(self, name, number):
        if number:
            self.count(f"{name} removed by limits", number)
            self.model.stored.take(self.clock.today, 0, "a",
                                   f"com.norvane.tavrel.limits.{name}", number)

    # -- All that is held ---------------------------------------------------------------------

    def check_statistics(self):
        """Checks each value in the store and each waiting one, with its second. Values that still
        wait for a date are not exported."""
        twin = Model()
        twin.stored, twin.waiting = self.model.stored.copy(), list(self.model.waiting)
        twin.fold(self.clock, self.build_day)
        wanted = twin.stored.lines()
        found = self.exported()
        lacks, more = sorted(set(wanted) - set(found)), sorted(set(found) - set(wanted))
        expect(sorted(found) == sorted(wanted), f"statistics lack {lacks[:9]} and have {more[:9]}")
        self.count("comparisons of the store")
        self.count("comparisons of the store while values waited for a date", bool(twin.waiting))
        self.count("values compared in the store", len(found))

    def exported(self):
        return [line for line in self.device.tool("stat", "export").out.splitlines()
                if line.split("\t")[2].startswith(TRACKED)]

    def check_new_store(self, waited):
        """After damage, the store regains what programs still have in memory: everything that a
        killed program left, and the measurements that no fold had taken. A scalar of a running
        program may be lost, but must not return with a value that was not set, or with more than
        was added. One value may be refused for each such key."""
        ever, found = self.model.ever, Statistics()
        for line in self.exported():
            kind, day, key, *numbers = line.split("\t")
            if kind == "scalar":
                found.take(int(day), 0, "s", key, int(numbers[0]))
            else:
                found.take(int(day), int(numbers[0]), "r", key, float(numbers[1]))
        for day, row in found.scalars.items():
            for key, value in row.items():
                if key == "com.norvane.brimhold.refused" and day == self.clock.today:
                    keys = len(self.scalar_keys)
                    expect(0 < value <= keys, f"{value} values refused, of {keys} keys")
                    continue
                recorded = ever.scalars.get(day, {}).get(key, 0)
                is_sum = key.startswith("com.example.s") or key.endswith(
                    (".samples", ".hits", ".starts"))
                expect(0 < value <= recorded if is_sum else value == recorded,
                       f"{key} of day {day} is {value}, and {recorded} was recorded")
        for day, row in found.series.items():
            for key, values in row.items():
                expect(not collections.Counter(values) - collections.Counter(ever.series[day][key]),
                       f"{key} of day {day} has values that nobody recorded")
        whole = ("com.example.k", f"com.example.v{self.updates}.starts")  # of the killed program
        lost = [line for line in (collections.Counter(waited.lines()) -
                                  collections.Counter(found.lines()))
                if line.startswith("value") or line.split("\t")[2] in whole]
        expect(not lost, f"lost: {lost}")
        self.model.stored = found
