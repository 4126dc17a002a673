"""What a device must hold and report, computed only from what was done to it and from docs/."""

import bisect
import datetime
import hashlib
import math

from device import SECONDS_PER_DAY

OWN = "com.norvane.tallied.tavrel"
LAST_RUN = "LastCrashLogSerializationDateInDaysSince1970"
DA = "com.norvane.da"
OTHER = "com.example.settings"  # a domain of another program
CAPACITY = 32 << 30
NAND_PERIOD = 7 * SECONDS_PER_DAY
IN_PART = {"filed": "filed-in-part", "nothing-to-report": "store-unreadable"}
REPORTED = ("reported", "filed by hand")  # fates that another run does not change
LANGUAGES = b"en\nde\nzh-Hant\n"  # the languages that the device shows
LOCALES = [  # /etc/locale.conf, and what a log says about it
    (b"", {"BHUserInterfaceLanguage": "<unknown>",
           "BHPreferredUserInterfaceLanguage": "<unknown>"}),
    (b"LANG=de_AT.UTF-8\nLC_MEASUREMENT=de_CH.UTF-8\nLANGUAGE=de_AT:de:en\n",
     {"BHUserInterfaceLanguage": "de", "BHPreferredUserInterfaceLanguage": "de-AT",
      "BHUserSetRegionFormat": "CH"}),
    (b"LANG=fr_FR.UTF-8\n",
     {"BHUserInterfaceLanguage": "en", "BHPreferredUserInterfaceLanguage": "fr-FR",
      "BHUserSetRegionFormat": "FR"})]
TRACKED = ("com.example.", "statsd.", "com.norvane.usage.samples", "com.norvane.tavrel.limits.",
           "com.norvane.brimhold.", "com.norvane.lumenhall.DiskUsageUserTotalBlocks")


def moment(second):
    return datetime.datetime(1970, 1, 1) + datetime.timedelta(seconds=second)


def date_text(day):
    return moment(day * SECONDS_PER_DAY).strftime("%Y-%m-%d")


def coarsened(value, options):
    if width := options.get("bucket_interval"):
        shifted = value + width // 2
        value = shifted - int(math.fmod(shifted, width))
    if "sig_fig" in options and value:
        drop = math.ceil(math.log10(abs(value))) - options["sig_fig"]
        if drop >= 1:
            scaled = value / 10.0 ** drop
            value = int(10.0 ** drop * math.copysign(math.floor(abs(scaled) + 0.5), scaled))
    return value


def histogram(values, intervals):
    ends = ["-inf", *map(str, intervals), "inf"]
    counts = [0] * (len(intervals) + 1)
    for value in values:
        counts[bisect.bisect_left(intervals, value)] += 1
    return {f"({ends[i]}, {ends[i + 1]}{']' if i < len(intervals) else ')'}": count
            for i, count in enumerate(counts) if count}


def summary(values):
    mean = math.fsum(values) / len(values)
    return [min(values), max(values), mean, math.fsum((v - mean) ** 2 for v in values), len(values)]


class Statistics:
    """Scalars by day and key; the seconds and values of series."""

    def __init__(self):
        self.scalars, self.series = {}, {}

    def take(self, day, second, kind, key, value):
        if kind == "r":
            self.series.setdefault(day, {}).setdefault(key, []).append((second, value))
            return
        scalars = self.scalars.setdefault(day, {})
        scalars[key] = value + (scalars.get(key, 0) if kind == "a" else 0)

    def remove(self, days=None, prefix=""):
        for table in (self.scalars, self.series):
            for day in list(table):
                if days is not None and day not in days:
                    continue
                table[day] = {k: v for k, v in table[day].items() if not k.startswith(prefix)}
                if not table[day]:
                    del table[day]

    def lines(self):
        """The lines that `tavrelctl stat export` prints."""
        return [f"scalar\t{day}\t{key}\t{value}" for day, row in self.scalars.items()
                for key, value in row.items()] + [
                    f"value\t{day}\t{key}\t{second}\t{value:.17g}"
                    for day, row in self.series.items() for key, values in row.items()
                    for second, value in values]

    def copy(self):
        twin = Statistics()
        twin.scalars = {day: dict(row) for day, row in self.scalars.items()}
        twin.series = {day: {key: list(values) for key, values in row.items()}
                       for day, row in self.series.items()}
        return twin


class Model:
    def __init__(self):
        self.stored, self.waiting = Statistics(), []
        self.ever = Statistics()  # everything recorded, whatever became of it
        self.whitelist, self.whitelist_bytes = None, b""
        self.permitted, self.first_day = False, None
        self.version, self.locale = {}, {}
        self.own = {}                       # the daemon's preferences
        self.domains = {DA: {}, OTHER: {}}  # what a tasking has set
        self.scheduled = None
        self.corruptions = 0
        self.last_lost = None               # the last day of which a damaged store had values
        self.last_nand = None
        self.events, self.records = [], {}  # memory errors that wait, and those filed, by day
        self.fates = {}                     # what became of each day

    # -- Recording -----------------------------------------------------------------------------

    def record(self, clock, build_day, kind, key, value):
        """The day is that of the clock. When that is before the library was built, it follows from
        the time since boot once the clock is set."""
        dated = clock.today >= build_day
        self.waiting.append((clock.now if dated else None, clock.uptime, kind, key, value))

    def fold(self, clock, build_day):
        left = []
        for second, uptime, kind, key, value in self.waiting:
            if second is None:
                if clock.today < build_day:
                    left.append((second, uptime, kind, key, value))
                    continue
                second = clock.now - (clock.uptime - uptime)
            for statistics in (self.stored, self.ever):
                statistics.take(*divmod(second, SECONDS_PER_DAY), kind, key, value)
        self.waiting = left

    # -- The daily run -------------------------------------------------------------------------

    def covers(self, day):
        return self.permitted and (self.first_day is None or day >= self.first_day)

    def options(self, table, key):
        """The whitelist's options; None when the key does not leave the device."""
        found = None
        for group, tables in self.whitelist.items():
            if self.domains[DA].get(group) is False:
                continue
            if key in tables.get(f"{table}Keys", {}):
                found = (len(key) + 1, tables[f"{table}Keys"][key])
            for prefix, options in tables.get(f"{table}KeyPrefixes", {}).items():
                if key.startswith(prefix) and (found is None or len(prefix) >= found[0]):
                    found = (len(prefix), options)
        return None if found is None else found[1]

    def log(self, day, clock):
        """The content of the day's log, or the reason why there is none."""
        if not self.covers(clock.today - 1):
            return "not-permitted"
        if self.whitelist is None:
            return "no-whitelist"
        scalars, distributions, histograms = {}, {}, {}
        for key, value in self.stored.scalars.get(day, {}).items():
            if (options := self.options("Scalar", key)) is not None:
                scalars[key] = coarsened(value, options)
        for key, values in self.stored.series.get(day, {}).items():
            if (options := self.options("Distribution", key)) is None:
                continue
            numbers = [value for _, value in values]
            distributions[key] = summary(numbers)
            if "intervals" in options:
                histograms[key] = histogram(numbers, options["intervals"])
        if not scalars and not distributions:
            return "nothing-to-report"
        probes = {"com.norvane.zentrix.bhd.database.corruptions": self.corruptions,
                  "com.norvane.usage.cur_boot_session_cpu_uptime": clock.uptime // 60}
        for key, value in probes.items():
            if (options := self.options("Scalar", key)) is not None:
                scalars[key] = coarsened(value, options)
        return {"BHCrashLogVersion": 1, "BHStartDate": moment(day * SECONDS_PER_DAY),
                "BHLogCreationDate": moment(clock.now), "BHMetadata": self.locale,
                "BHScalars": scalars, "BHDistributions": distributions,
                "BHDistributionsHistogram": histograms,
                "BHTasking": self.own.get("TaskingPayload", []),
                "BHTaskID": self.own.get("TaskingID", "(no tasking id)"),
                "BHTaskDigest": self.own.get("TaskingDigest", "(no tasking digest)"),
                "BHWhitelistDigest": hashlib.md5(self.whitelist_bytes).hexdigest()}

    def version_text(self):
        return "{ProductName} {ProductVersion} ({ProductBuildVersion})".format(**self.version)

    def metadata(self, clock):
        """Metadata of a log that is filed now; notes the version of the system."""
        found = {"LogType": "193", "LogName": "log-tallied", "OSVersion": self.version_text(),
                 "Time": moment(clock.now)}
        last = self.own.get("LastOSVersion")
        if last != self.version_text():
            found["Options"] = {"previous_os_version": last or "<unknown>"}
            self.own["LastOSVersion"] = self.version_text()
        return found

    def note_fate(self, day, fate, clock):
        """Notes the fate of a day that is over; what a clock that is ahead does for a
        future day is not its fate."""
        if day < clock.true // SECONDS_PER_DAY:
            self.fates[day] = fate

    def gated(self, clock, build_day):
        """Performs a daily run: returns the line about days without a run, and the effects of the
        tasks; None when the gate is closed."""
        day = clock.today - 1
        last = self.own.get(LAST_RUN)
        if (last or 0) >= day:
            if day not in self.fates:
                self.note_fate(day, "no run before the clock has passed the last one", clock)
            return None
        line = None
        if last is not None and 1 < day - last <= 3660:
            passed = range(last + 1, day)
            line = (f"1 day had no daily run, and has a log only if one was forced: {passed[0]}" if len(passed) == 1
                    else f"{len(passed)} days had no daily run, and have logs only if forced: "
                         f"{passed[0]} to {passed[-1]}")
            for each in passed:
                if each not in self.fates:
                    self.note_fate(each, "no run", clock)
        effects = self.tasks(day, clock, build_day)
        effects["line"] = line
        self.own["LastLogOutcome"] = effects["outcome"]
        self.own[LAST_RUN] = day
        return effects

    def tasks(self, day, clock, build_day):
        self.fold(clock, build_day)
        effects = {"day": day, "log": None, "metadata": None, "deletes": not self.permitted,
                   "sends": False, "nand": None}
        if not self.permitted:
            self.first_day = None
        log = self.log(day, clock)
        effects["outcome"] = log if isinstance(log, str) else "filed"
        if self.last_lost is not None and day <= self.last_lost <= clock.today:
            effects["outcome"] = IN_PART.get(effects["outcome"], effects["outcome"])
        if not isinstance(log, str):
            effects["log"], effects["metadata"] = log, self.metadata(clock)
            if self.options("Scalar", "com.norvane.zentrix.bhd.database.corruptions") is not None:
                self.corruptions = 0
        if self.fates.get(day) not in REPORTED:
            self.note_fate(day, "reported" if effects["log"] else effects["outcome"], clock)
        if self.last_nand is None or clock.now - self.last_nand >= NAND_PERIOD:
            effects["nand"] = "pending" if self.covers(clock.today) else "withheld"
            self.last_nand = clock.now
        self.stored.take(clock.today, 0, "s", "com.norvane.lumenhall.DiskUsageUserTotalBlocks",
                         CAPACITY >> 20)
        if self.events:
            self.records.setdefault(clock.today, []).extend(self.events)
            self.events = []
        self.track(clock, effects)
        return effects

    def track(self, clock, effects):
        build = self.version["ProductBuildVersion"]
        if self.own.get("LastOSUpdate", {}).get("version") != build:
            self.own["LastOSUpdate"] = {"version": build, "day": clock.today}
        if self.scheduled is None:
            return
        if (self.own.get("TaskingID"), self.own.get("TaskingOS")) != (
                self.scheduled["TaskingID"], build):
            if "TaskingID" in self.own:
                for setting in self.own["TaskingPayload"]:
                    self.domains[setting["Domain"]].pop(setting["Key"], None)
            for setting in self.scheduled["TaskingPayload"]:
                self.domains[setting["Domain"]][setting["Key"]] = setting["Value"]
            self.own.update(self.scheduled, TaskingOS=build)
        days = self.domains[DA].get("AggressiveSubmissionDays", 0)
        effects["sends"] = (self.permitted and
                            abs(clock.today - self.own["LastOSUpdate"]["day"]) < days)
