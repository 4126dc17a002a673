#include "platform/linux/limits/tidy.h"

#include <algorithm>
#include <utility>

#include "platform/persisted_state.h"

namespace tavrel {
namespace {

// Free space that stays in the store's file for coming days: shortening it by a day's worth, only
// for the next day to extend it again, would wear the flash. About two days' worth, and at most
// this fraction of the bound.
constexpr std::int64_t kReserveDays = 2;
constexpr std::int64_t kLargestReservePart = 8;

// The first of these that exists holds the lock that lets one process tidy at a time.
constexpr std::string_view kLockFolders[] = {"/run/tavrel", "/var/lib/tavrel", "/var/mobile"};

// Bringing a large store down to its limit takes minutes.
constexpr LockPatience kPatience{600'000, "it is tidying: try again later"};

std::int64_t reserveOf(std::int64_t bytesInUse, std::int64_t days, const Bounds& bounds) {
  return std::min(kReserveDays * bytesInUse / std::max<std::int64_t>(days, 1),
                  bounds.bytes / kLargestReservePart);
}

}  // namespace

TidyReport Tidy::run() {
  TidyReport report;
  trim(report);
  remember(report);
  return report;
}

void Tidy::trim(TidyReport& report) {
  const auto limits = DeviceLimits::read(root_, files_, propertyLists_);
  if (!limits) return report.failures.push_back(limits.error().message);
  Expected<Descriptor> lock = Descriptor();
  const auto* const folder = std::ranges::find_if(
      kLockFolders, [&](auto path) { return FileSystem::status(root_.path(path)).has_value(); });
  // Without such a folder, there is nothing to remove.
  if (folder != std::end(kLockFolders)) lock = files_.lockFolder(root_.path(*folder), kPatience);
  if (!lock) return report.failures.push_back(lock.error().message);
  for (const KeptKind& kind : kKeptKinds) {
    TidiedKind& tidied = report.kinds.emplace_back();
    tidied.kind = &kind;
    tidied.bounds = limits->of(kind.kind);
    if (kind.kind == Kept::Store) continue;
    const auto folderLock = KeptFiles::lock(kind.kind, root_, files_);
    if (!folderLock) {
      report.failures.push_back(folderLock.error().message);
      continue;
    }
    auto files = KeptFiles::list(kind.kind, root_, files_, store_.BHDaysSince1970());
    if (!files) {
      report.failures.push_back(files.error().message);
      continue;
    }
    const TrimmedFiles trimmed = files->trim(tidied.bounds);
    tidied.removed = trimmed.removed;
    if (!trimmed.status) report.failures.push_back(trimmed.status.error().message);
  }
  TidiedKind& store = report.kinds[static_cast<std::size_t>(Kept::Store)];
  trimStore(store.bounds, store, report.failures);
  count(report, report.failures);
}

// When the file cannot be written, the caller still reports the failures.
void Tidy::remember(const TidyReport& report) {
  const std::string path = root_.path(kTidyFailuresFile);
  std::string lines;
  for (const std::string& failure : report.failures)
    lines += failure + '\n';
  if (lines.empty()) return files_.discard(path);
  static_cast<void>(files_.replace(path, asBytes(lines), 0644));
}

std::optional<std::int64_t> Tidy::lastRunDay() {
  bool hasRun = false;
  const std::int64_t day =
      lowInt32(preferences_.ZTXPreferencesGetIntegerValue(kLastRunDayKey, kTavrelDomain, &hasRun));
  return hasRun ? std::optional(day) : std::nullopt;
}

// Days recorded while the clock was ahead, then the oldest. Days that wait to be reported are left
// out: today, yesterday until its run, and the two days after the last run, which were today and
// yesterday before a clock went wrong.
std::vector<std::int32_t> Tidy::removalOrder(const std::vector<std::int32_t>& days) {
  const std::int64_t today = store_.BHDaysSince1970();
  const auto lastRun = lastRunDay();
  std::vector<std::int32_t> order;
  std::ranges::copy_if(days, std::back_inserter(order), [&](std::int32_t day) {
    if (day == today) return false;
    if (lastRun && day <= *lastRun) return true;
    return day != today - 1 && !(lastRun && day <= *lastRun + 2);
  });
  std::stable_partition(order.begin(), order.end(),
                        [&](std::int32_t day) { return isAhead(day, today); });
  return order;
}

// A damaged store is set aside. In one that the device cannot read in part, other days go instead
// of those that stay.
void Tidy::trimStore(const Bounds& bounds, TidiedKind& tidied, std::vector<std::string>& failures) {
  auto trim = store_.beginTrim();
  if (!trim) return failures.push_back(trim.error().message);
  if (!*trim) return;
  const std::int32_t yesterday = previousDay(store_.BHDaysSince1970());
  const bool isReported = lastRunDay().value_or(INT64_MIN) >= yesterday;
  bool isPartlyUnreadable = false;
  // The second look reads the whole store: once is enough.
  const auto goesOnAfter = [&](const Error& error) {
    if (std::exchange(isPartlyUnreadable, true)) return true;
    const bool looksDamaged = (*trim)->damage().has_value();
    // Before the run of yesterday, the store may hold rows to report.
    const Status replaced =
        isReported ? store_.replaceDamaged(*std::move(trim), error) : Status(error);
    failures.push_back(replaced ? "statistics store: it was damaged and is set aside, with all "
                                  "its days"
                                : replaced.error().message);
    if (replaced || !looksDamaged) return false;
    trim = store_.beginTrim();
    return trim && *trim;
  };
  auto days = (*trim)->days();
  if (!days && goesOnAfter(days.error())) days = (*trim)->readableDays();
  if (!days) return;
  auto left = static_cast<std::int64_t>(days->size());
  auto bytes = (*trim)->bytesInUse();
  const auto exceeds = [&] { return left > bounds.days || (bytes && *bytes > bounds.bytes); };
  for (const std::int32_t day : removalOrder(*days)) {
    if (!bytes || !exceeds()) break;
    if (Status removed = (*trim)->removeDay(day); !removed) {
      if (!(*trim)->damage()) {
        failures.push_back(removed.error().message);
        break;
      }
      if (!goesOnAfter(removed.error())) return;
      continue;
    }
    tidied.days.push_back(day);
    ++tidied.removed;
    tidied.early += left <= bounds.days ? 1 : 0;
    --left;
    bytes = (*trim)->bytesInUse();
  }
  if (!bytes) return static_cast<void>(goesOnAfter(bytes.error()));
  // Until the run of yesterday, which frees that day, the device may well keep its limits.
  const bool isRunDue = std::ranges::binary_search(*days, yesterday) && !isReported;
  tidied.exceeds = failures.empty() && exceeds() && !isRunDue;
  const Status given = (*trim)->giveBack(reserveOf(*bytes, left, bounds));
  if (!given) goesOnAfter(given.error());
}

// The counts are committed, or kept beside the store when there is no room.
void Tidy::count(const TidyReport& report, std::vector<std::string>& failures) {
  const std::int32_t today = store_.BHDaysSince1970();
  bool hasCounted = false;
  const auto add = [&](std::string_view statistic, std::int64_t removed) {
    if (removed == 0) return;
    std::int64_t sum = removed;
    if (const auto history = store_.openHistory(); history && (*history)->hasStore()) {
      const Status read = (*history)->walkScalar(
          statistic, today, today, [&](std::string_view, std::int32_t, std::int64_t value, bool&) {
            sum = wrappingAdd(sum, value);
          });
      if (!read) failures.push_back(read.error().message);
    }
    store_.BHClientSetValueForScalarKey(statistic, sum);
    hasCounted = true;
  };
  for (const TidiedKind& tidied : report.kinds) {
    add(tidied.kind->statistic, tidied.removed);
    add(kEarlyDaysStatistic, tidied.early);
  }
  if (hasCounted && !store_.commit()) failures.emplace_back("what was removed is not counted");
}

Expected<KeptUse> Tidy::measureStore() {
  auto history = store_.openHistory();
  if (!history) return history.error();
  if (!(*history)->hasStore()) return KeptUse();
  const auto days = (*history)->days();
  const auto bytes = (*history)->bytesInUse();
  if (!days) return days.error();
  if (!bytes) return bytes.error();
  const auto count = static_cast<std::int64_t>(days->size());
  return KeptUse{count, count, *bytes};
}

Expected<std::vector<MeasuredKind>> Tidy::measure() {
  const auto limits = DeviceLimits::read(root_, files_, propertyLists_);
  if (!limits) return limits.error();
  std::vector<MeasuredKind> measured;
  for (const KeptKind& kind : kKeptKinds) {
    KeptUse use;
    if (kind.kind == Kept::Store) {
      const auto store = measureStore();
      if (!store) return store.error();
      use = *store;
    } else {
      const auto files = KeptFiles::list(kind.kind, root_, files_, store_.BHDaysSince1970());
      if (!files) return files.error();
      use = files->use();
    }
    measured.push_back({&kind, limits->of(kind.kind), use});
  }
  return measured;
}

}  // namespace tavrel
