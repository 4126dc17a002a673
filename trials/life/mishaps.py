"""Mishaps in a device's life. Each function is one event and returns False when it could not
happen; their names appear in the summary."""

import os

from device import PREFERENCES, Recorder, SECONDS_PER_DAY, STORE, SUBMISSION, WHITELIST
from life import Life, expect
from model import DA, LAST_RUN, LOCALES, OTHER, OWN, date_text

LIMITS = "etc/tavrel/limits.plist"
VERSION = "etc/tavrel/system-version.plist"
SCALAR_OPTIONS = [{}, {"bucket_interval": 10}, {"sig_fig": 2}, {"bucket_interval": 7, "sig_fig": 1}]
JUNK_FILES = ["var/lib/tavrel/last-run.plist", "run/tavrel/collect.state",
              "var/lib/tavrel/tidy-failures", "var/lib/tavrel/edac-counters.plist",
              "run/tavrel/notifications/com.norvane.da.tasking_changed"]


class Mishaps(Life):
    """EVENTS says how often each event happens in a thousand days."""

    repair_clock_at = None
    uploads = True
    spoiled = ()  # files that will be repaired next time

    # -- The owner, and those who look after the device -----------------------------------------

    def allow(self):
        latest = max([*self.days_held(), 0])
        arguments = ["--from", str(self.clock.today + 1)] if latest > self.clock.today else []
        day = self.clock.today + 1
        done = self.device.tool("allow", *arguments)
        expect(done.out == f"submission is allowed from day {day} ({date_text(day)}) on\n",
               done.out)
        self.model.permitted, self.model.first_day = True, day
        if not arguments:
            self.model.fold(self.clock, self.build_day)

    def agree_before_the_clock_is_right(self):
        """What is recorded in 1970 never leaves, even if the clock is still behind when it is set."""
        self.clock.set_wrong(-(self.clock.true // SECONDS_PER_DAY) * SECONDS_PER_DAY)
        # A program that is killed: memory must not keep what another clock would date differently.
        recorder = Recorder(self.device, "killed", self.recorder_program)
        for kind, key, value in (("a", "com.example.s0", 7), ("s", "com.example.level", 5),
                                 ("r", "com.example.d0", 2.5)):
            recorder.tell([f"{kind} {key} {value}"])
            self.model.record(self.clock, self.build_day, kind, key, value)
        self.kill_recorder(recorder)
        done = self.device.run("tavrelctl", "allow")
        expect((done.status, done.err) == (
            1, "tavrelctl: today is day 0 (1970-01-01), before this program was built: set the "
            "clock first, or give --from DAY\n"), f"{done.status} {done.err}")
        self.clock.set_wrong(-5 * SECONDS_PER_DAY)
        self.allow()
        self.clock.set_wrong(-(self.clock.true // SECONDS_PER_DAY) * SECONDS_PER_DAY)
        day = self.model.first_day
        done = self.device.run("tavrelctl", "allow")
        expect((done.status, done.out) == (
            0, f"submission is already allowed from day {day} ({date_text(day)}) on\n"),
            f"{done.status} {done.out}{done.err}")
        self.clock.set_wrong(0)

    def deny(self):
        if self.chance.random() < 0.5:
            self.kill("tavrelctl", "deny")
        self.device.tool("deny")
        self.model.permitted, self.model.first_day = False, None
        self.waiting, self.withheld = self.logs()
        expect(not self.waiting, "logs wait after the permission was withdrawn")

    def update_system(self):
        self.updates += 1
        self.model.version = {
            "ProductName": "Pellio", "ProductVersion": f"{4 + self.updates // 10}.{self.updates}",
            "ProductBuildVersion": f"16R{300 + self.updates}"}
        self.device.write(VERSION, self.model.version)
        locale, self.model.locale = self.chance.choice(LOCALES)
        self.device.write("etc/locale.conf", locale)

    def update_whitelist(self):
        chance = self.chance
        intervals = [{}, {"intervals": sorted(chance.sample(range(-50, 5000), 4))}]
        self.model.whitelist = {
            "Base": {"ScalarKeys": {f"com.example.s{i}": chance.choice(SCALAR_OPTIONS)
                                    for i in chance.sample(range(4), 3)},
                     "ScalarKeyPrefixes": {"com.example.": chance.choice(SCALAR_OPTIONS)},
                     "DistributionKeyPrefixes": {"com.example.": chance.choice(intervals)}},
            "Extra": {"ScalarKeyPrefixes": {"statsd.": chance.choice(SCALAR_OPTIONS)},
                      "DistributionKeyPrefixes": {"statsd.": chance.choice(intervals)}},
            "Device": {"ScalarKeys": {
                "com.norvane.usage.samples": {},
                "com.norvane.usage.cur_boot_session_cpu_uptime": {},
                "com.norvane.lumenhall.DiskUsageUserTotalBlocks": {"sig_fig": 2},
                "com.norvane.zentrix.bhd.database.corruptions": {},
                "com.norvane.brimhold.segments_refused": {}},
                "ScalarKeyPrefixes": {"com.norvane.tavrel.limits.": {}}}}
        self.device.write(WHITELIST, self.model.whitelist)
        self.model.whitelist_bytes = self.device.path(WHITELIST).read_bytes()

    def spoil_whitelist(self):
        self.device.write(WHITELIST, self.chance.randbytes(200))
        self.model.whitelist = None
        self.spoiled = (*self.spoiled, self.update_whitelist)

    def tasking(self):
        self.model.scheduled = {
            "TaskingID": f"tasking-{self.clock.today}-{self.chance.randrange(999)}",
            "TaskingDigest": self.chance.randbytes(4),
            "TaskingPayload": self.chance.sample([
                {"Domain": DA, "Key": "Extra", "Value": False},
                {"Domain": DA, "Key": "AggressiveSubmissionDays",
                 "Value": self.chance.randrange(1, 9)},
                {"Domain": OTHER, "Key": "interval", "Value": self.chance.randrange(60)}], 2)}
        self.device.write("tasking.plist", self.model.scheduled)
        self.device.tool("tasking", "schedule", str(self.device.path("tasking.plist")))

    def clear_tasking(self):
        self.device.tool("tasking", "clear")
        self.model.scheduled = None

    def change_limits(self):
        self.limits = {"Store": self.chance.randrange(20, 91),
                       "Pending": self.chance.randrange(10, 61),
                       "Outbox": self.chance.randrange(10, 61)}
        self.limits_are_whole = True
        self.device.write(LIMITS, {name: {"Days": days} for name, days in self.limits.items()})

    def spoil_limits(self):
        self.device.write(LIMITS, self.chance.choice([b"<plist>", b"", {"Stor": {"Days": 5}}]))
        self.limits_are_whole = False
        self.spoiled = (*self.spoiled, self.change_limits)

    def server_away(self):
        self.uploads = not self.uploads

    def upload(self):
        """Acts as the uploader does on a confirmed log: removes the log first."""
        for place in ("pending", "outbox"):
            for name in self.device.logs()[place]:
                for ending in (".log", ".metadata.plist"):
                    (self.device.path(SUBMISSION) / place / f"{name}{ending}").unlink()
                self.waiting.discard(name)
                self.count("logs uploaded")

    def erase(self):
        self.fold()
        if self.chance.random() < 0.5:
            self.device.tool("erase", "--key", "com.example.s1", "--yes")
            self.model.stored.remove(prefix="com.example.s1")
        else:
            last = self.clock.today - self.chance.randrange(2, 30)
            self.device.tool("erase", "--from", str(last - 3), "--to", str(last), "--yes")
            self.model.stored.remove(days=set(range(last - 3, last + 1)))

    def burst(self):
        self.activity(count=4000)

    # -- Clocks ---------------------------------------------------------------------------------

    def clock_is_wrong(self, days, lasts):
        if self.repair_clock_at is not None:
            return False
        self.clock.set_wrong(days * SECONDS_PER_DAY)
        self.repair_clock_at = self.clock.true + lasts
        return True

    def clock_ahead(self):
        far = self.chance.random() < 0.5
        days = self.chance.randrange(30, 2000) if far else self.chance.randrange(1, 4)
        return self.clock_is_wrong(days, self.chance.randrange(3, 60) * 3600)

    def clock_behind(self):
        return self.clock_is_wrong(-self.chance.randrange(1, 12),
                                   self.chance.randrange(3, 90) * 3600)

    def clock_in_1970(self):
        self.fold()
        return self.clock_is_wrong(-(self.clock.true // SECONDS_PER_DAY),
                                   self.chance.randrange(3, 50) * 3600)

    def repair_clock(self):
        self.clock.set_wrong(0)
        self.repair_clock_at = None
        # No run comes until the clock has passed the last one. Somebody notices and helps.
        if self.model.own.get(LAST_RUN, 0) > self.clock.today + 2:
            self.model.own[LAST_RUN] = self.clock.today - 2
            self.device.tool("prefs", "set", OWN, LAST_RUN, str(self.clock.today - 2), "--int")
            self.count("last runs set right by hand")

    # -- Faults -----------------------------------------------------------------------------------

    def kill(self, *command):
        """Kills a program before one of its calls that change files."""
        return self.device.run(*command, kill_at=self.chance.randrange(
            1, {"tavrel": 120}.get(command[0], 12)))

    def killed_run(self):
        return self.disturbed_run(lambda: self.kill("tavrel", "-d"))

    def killed_fold(self):
        self.activity()
        self.kill("tavrelctl", "stat", "fold")
        self.fold()

    def full_disk(self):
        """Programs record and fold, and the daily run comes, while there is hardly any space."""
        if not os.path.ismount(self.device.path("var")):
            return False
        room = self.chance.choice([0, 4, 16, 36, 60, 80, 110, 150, 400])
        self.activity()

        def run():
            self.device.fill(room)
            self.device.run("tavrelctl", "stat", "fold")
            done = self.device.run("tavrel", "-d")
            self.count("daily runs that a full disk disturbs", " error " in done.err)
            if not self.over_limits():
                self.device.run("tavrelctl", "tidy")
            self.device.empty()
            return done

        was_due = self.disturbed_run(run)
        self.fold()
        return was_due

    def over_limits(self):
        return self.excess_days(self.days_held()) or any(map(self.excess_logs,
                                                             ("pending", "outbox")))

    def corrupt_store(self):
        self.fold()
        # Memory may still have undated values, which a wrong clock would date.
        if self.clock.wrong:
            return False
        self.scalar_keys.update(self.device.rows("SELECT DISTINCT key FROM scalars"))
        self.model.stored.remove()
        self.activity()
        self.killed_recorder()
        for ending in ("-wal", "-shm"):
            self.device.path(STORE + ending).unlink(missing_ok=True)
        size = self.device.path(STORE).stat().st_size
        self.device.write(STORE, self.chance.randbytes(size))
        self.model.corruptions += 1
        self.model.last_lost = self.clock.today
        self.fold()
        self.check_new_store(self.model.stored)
        return True

    def corrupt_preferences(self):
        path = self.device.path(PREFERENCES) / f"{OWN}.plist"
        if not path.exists():
            return False
        path.write_bytes(path.read_bytes()[:self.chance.randrange(60)])
        self.model.own = {}
        return True

    def junk(self):
        there = [name for name in JUNK_FILES if self.device.path(name).exists()]
        for name in there:
            self.device.write(name, self.chance.randbytes(100))
        return bool(there)

    def foreign_segment(self):
        if self.clock.today < 10_000:  # in 1970, when it would count for a later day
            return False
        name = f"run/tavrel/stat/{self.chance.randrange(10 ** 9)}.segment"
        self.device.write(name, self.chance.randbytes(5000))
        self.fold()
        self.model.stored.take(self.clock.today, 0, "a", "com.norvane.brimhold.segments_refused", 1)
        self.device.path(name).unlink()

    def torn_record(self):
        """Leaves the torn end of a record, as a power cut would."""
        if not self.records_of_today().exists():
            return False
        with open(self.records_of_today(), "ab") as file:
            file.write(b'{"time":"20')
        self.memory_error()
        return True


# Occurrences per thousand days.
EVENTS = {
    "deny": 10, "update_system": 14, "update_whitelist": 10, "spoil_whitelist": 8,
    "tasking": 20, "clear_tasking": 5, "change_limits": 6, "spoil_limits": 5, "server_away": 15,
    "erase": 6, "burst": 10, "clock_ahead": 10, "clock_behind": 6, "clock_in_1970": 6,
    "killed_run": 50, "killed_fold": 30, "killed_recorder": 40, "full_disk": 25, "corrupt_store": 6,
    "corrupt_preferences": 6, "junk": 10, "foreign_segment": 8, "torn_record": 10,
}
