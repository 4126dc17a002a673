"""Lives through the days, accounts for each, and watches whether anything grows."""

import os

from device import RECORDS, SECONDS_PER_DAY, STORE
from life import expect
from mishaps import EVENTS, Mishaps

MOST = {  # the maximum at the end of a year; the limits of docs/limits.md
    "store KiB": (12 + 2 + 1) << 10, "days": 94, "positions": 64, "logs": 600, "withheld": 8,
    "records": 64, "aside KiB": 16 << 10, "run KiB": 16 << 10, "left over": 8, "disk KiB": 58 << 10}
MEMORY = ["tavrel", "tavrelctl stat fold", "tavrelctl tidy", "recorder", "tavrel-statsd",
          "stat collect"]  # the peaks of those that end, and the sizes of those that live on
FLAT = 1.1          # by this factor, the last year may exceed the first
FLAT_KIBIBYTES = 512
WARM_UP = 60        # days after which long-running programs have seen everything once


class Years(Mishaps):
    history = {}  # the events of each day

    def live(self, days, is_memory_flat):
        self.is_memory_flat = is_memory_flat
        self.off, self.wrong = set(), set()
        first = self.clock.true // SECONDS_PER_DAY
        year, self.figures = 0, []
        day, compare_at = first, first + 9
        while day < first + days:
            self.day(day)
            lived = day + 1 - first
            if self.chance.random() < 0.012:
                hole = self.chance.choice([1, 2, 5, 20, 45, 130])
                self.off.update(range(day + 1, min(day + 1 + hole, first + days)))
                self.count("days off", hole)
                day += hole
            day += 1
            if lived >= min(WARM_UP, days // 2) and not self.figures:
                self.figures.append(self.measure())
            if day >= compare_at:
                self.check_statistics()
                compare_at = day + 10
            if (day - first) // 365 > year or day >= first + days:
                year = (day - first) // 365
                self.end_of_year(year, day - first)
        self.account(first, first + days)

    def day(self, day):
        chance = self.chance
        today = [name for name, rate in EVENTS.items() if chance.random() < rate / 1000]
        self.history[day] = today
        moments = sorted(chance.sample(range(600, SECONDS_PER_DAY - 600, 7), 4))
        runs_at, happens_at = chance.randrange(4), chance.randrange(4)
        self.support_log()
        for number, second in enumerate(moments):
            self.clock.go_to(day * SECONDS_PER_DAY + second)
            if self.repair_clock_at is not None and self.clock.true >= self.repair_clock_at:
                self.repair_clock()
            self.activity()
            if number == happens_at:
                for name in today:
                    took_place = getattr(self, name)() is not False
                    self.count(f"event {name}" if took_place else f"event {name}, in vain")
            if self.clock.wrong:
                self.wrong.add(day)
            if number == runs_at:
                self.daily_run()
            if chance.random() < 0.5:
                self.fold()
        if chance.random() < 0.3 and len(self.model.events) < 4:
            self.memory_error()
        if self.uploads and chance.random() < 0.4:
            self.upload()
        if not self.model.permitted and not self.clock.wrong and chance.random() < 0.05:
            self.allow()
        if self.spoiled and chance.random() < 0.4:
            for repair in self.spoiled:
                repair()
            self.spoiled = ()
        self.age_leftovers()

    def support_log(self):
        path = self.device.path("var/mobile/Library/Logs/NorvaneCare/support.log")
        path.parent.mkdir(parents=True, exist_ok=True)
        with open(path, "ab") as file:
            file.write(b"a line\n")

    def age_leftovers(self):
        """Ages files that killed programs left by a day. The kernel dates them with the machine's
        clock, not the device's."""
        for path in self.device.path("var").rglob(".tavrel-*.tmp"):
            status = path.stat()
            os.utime(path, (status.st_atime, status.st_mtime - SECONDS_PER_DAY))

    def lately(self, day):
        """For a report: the day and its neighbours."""
        return [(each, self.history.get(each)) for each in range(day - 6, day + 3)]

    # -- What grows ---------------------------------------------------------------------------

    def measure(self):
        device = self.device
        size = sum((path.stat().st_size + 4095) // 4096 * 4 for folder in ("var", "etc")
                   for path in device.path(folder).rglob("*") if path.is_file())
        logs = device.logs()
        figures = {
            "store KiB": sum(path.stat().st_size // 1024 for path in
                             device.path(os.path.dirname(STORE)).glob("*.sqlitedb*")
                             if ".corrupt-" not in path.name),
            "days": len(self.days_held()),
            "positions": device.rows("SELECT count(*) FROM segments")[0][0],
            "logs": len(logs["pending"]) + len(logs["outbox"]), "withheld": len(logs["withheld"]),
            "records": len(list(device.path(RECORDS).glob("*.jsonl"))),
            "aside KiB": self.set_aside()[1],
            "run KiB": sum(path.stat().st_size // 1024
                           for path in device.path("run").rglob("*") if path.is_file()),
            "left over": len(list(device.path("var").rglob(".tavrel-*.tmp"))), "disk KiB": size}
        expect(len(list(device.path("var/mobile/Library/Logs/NorvaneCare").iterdir())) <= 6,
               "the support log grows")
        memory = {name: peak for name, peak in device.peaks.items() if name in MEMORY}
        device.peaks.clear()
        descriptors = {}
        for name in device.residents:
            memory[name], descriptors[name] = device.resident(name)
        return figures, memory, descriptors

    def end_of_year(self, year, days):
        self.fold()
        self.tidy()  # the last day may have put all that segments still hold into a new store
        self.check_statistics()
        figures, memory, descriptors = measured = self.measure()
        self.figures.append(measured)
        columns = {"year": year, "days lived": days, **figures,
                   **{f"{name} KiB": memory.get(name, 0) for name in MEMORY},
                   "descriptors": sum(descriptors.values())}
        if len(self.figures) == 2:
            print("| " + " | ".join(columns) + " |\n" + "|---" * len(columns) + "|")
        print("| " + " | ".join(map(str, columns.values())) + " |", flush=True)
        for name, most in MOST.items():
            # While the clock is wrong, ended programs' segments keep values that wait for a date.
            if name == "run KiB" and self.repair_clock_at is not None:
                continue
            expect(figures[name] <= most, f"{figures[name]} {name} are more than {most}")
        _, first_memory, first_descriptors = self.figures[0]
        expect(descriptors == first_descriptors, f"descriptors: {first_descriptors}, {descriptors}")
        for name, number in memory.items() if self.is_memory_flat else ():
            before = first_memory[name]
            if name not in self.device.residents:  # a peak, which depends on the events of a year
                before = max(early[name] for _, early, _ in self.figures[:2])
            expect(number <= before * FLAT + FLAT_KIBIBYTES,
                   f"{name} had {before} KiB and has {number}")

    # -- Each day -----------------------------------------------------------------------------

    def account(self, first, end):
        fates = {}
        last = self.clock.true // SECONDS_PER_DAY
        for day in range(first, end):
            fate = self.model.fates.get(day)
            if fate in (None, "no run"):
                fate = self.reason(day, last)
            fates[fate] = fates.get(fate, 0) + 1
        print(f"{end - first} days: " + ", ".join(f"{number} {fate}" for fate, number in
                                                 sorted(fates.items(), key=lambda item: -item[1])))
        for name, number in sorted(self.counts.items()):
            print(f"{number:9} {name}")
        for name, number in sorted(self.device.kills.items()):
            print(f"{number:9} kills of {name}")

    def check_mishaps(self, can_fill_disk):
        """What befalls every device in ten years must have taken place here."""
        for name in ("tavrel", "tavrelctl stat fold", "tavrelctl deny", "recorder"):
            expect(self.device.kills[name], f"no {name} was killed")
        expect(not can_fill_disk or self.counts.get("daily runs that a full disk disturbs"),
               "no daily run found the disk full")

    def reason(self, day, last):
        """Why there was no run for a day that is not reported."""
        if {day, day + 1} & self.off:
            return "no run: the device was off"
        if {day, day + 1} & self.wrong:
            return "no run: the clock was wrong"
        expect(day >= last, f"nobody knows what became of day {day}: {self.lately(day)}")
        return "not over"
