#include "platform/linux/store/sqlite_site.h"

#include <cerrno>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include "base/arithmetic.h"
#include "base/civil_time.h"
#include "base/format.h"
#include "base/instant.h"
#include "base/system_text.h"
#include "platform/linux/files/file_opening.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/files/stamp.h"
#include "platform/linux/store/damage_check.h"
#include "platform/statistics_store.h"

namespace tavrel {
namespace {

constexpr std::string_view kSetAsideMark = ".corrupt-";
// 2020-01-01: a clock that shows an earlier day was not set.
constexpr std::int64_t kFirstPlausibleDay = 18262;

// A name for which neither the file nor its log files exist yet.
std::string freeName(const std::string& wanted) {
  std::string name = wanted;
  for (int attempt = 1; FileIdentity::of(name) || FileIdentity::of(name + "-wal"); ++attempt) {
    name = wanted + "." + std::to_string(attempt);
  }
  return name;
}

// Of a store that was set aside and keeps the name `file`.
StoreFailure lossOf(const std::string& file) {
  return {StoreFault::Damaged, "rows may be missing: they were in " + file +
                                   ", which is damaged: inspect or remove that file"};
}

bool moveFile(const std::string& from, const std::string& to) {
  return rename(from.c_str(), to.c_str()) == 0 || errno == ENOENT;
}

}  // namespace

std::optional<FileIdentity> FileIdentity::of(const std::string& path) {
  struct stat status;
  if (lstat(path.c_str(), &status) != 0) return std::nullopt;
  return FileIdentity{status.st_dev, status.st_ino};
}

void withholdFromOthers(const std::string& path) {
  for (const char* ending : {"", "-wal", "-shm"}) {
    const std::string file = path + ending;
    struct stat status;
    if (lstat(file.c_str(), &status) == 0 && S_ISREG(status.st_mode) &&
        (status.st_mode & S_IRWXO) != 0) {
      static_cast<void>(chmod(file.c_str(), status.st_mode & 07770));
    }
  }
}

std::optional<FileVersion> FileVersion::of(const std::string& path) {
  struct stat status;
  if (lstat(path.c_str(), &status) != 0) return std::nullopt;
  return FileVersion{{status.st_dev, status.st_ino},
                     status.st_size,
                     status.st_mtim.tv_sec,
                     status.st_mtim.tv_nsec};
}

StoreFolderLock::StoreFolderLock(const std::string& storePath, BusyBudget& busy) {
  auto lock = FileSystem().openFolderLock(folderOf(storePath));
  if (!lock) throw StoreFailure{StoreFault::Refused, lock.error().message};
  descriptor_ = *std::move(lock);
  while (flock(descriptor_.get(), LOCK_EX | LOCK_NB) != 0) {
    const int code = errno;
    if ((code != EWOULDBLOCK && code != EINTR) || !busy.wait()) {
      throw StoreFailure{StoreFault::Busy,
                         "its folder cannot be locked: " + systemText(code) +
                             ": try again when the process that holds it has finished"};
    }
  }
}

std::string StoreSite::describe(const StoreFailure& failure) const {
  return "statistics store " + path + ": " + failure.message;
}

void StoreSite::logFailure(const StoreFailure& failure, std::string_view consequence) const {
  const bool passes = failure.fault == StoreFault::Busy || failure.fault == StoreFault::Other;
  if (!passes && !logged->insert(failure.message).second) return;
  log.write(LogLevel::Error, describe(failure).append(consequence));
}

std::optional<StoreFailure> StoreSite::setAside(const std::optional<FileIdentity>& damaged,
                                                const StoreFailure& failure) const {
  if (!damaged || FileIdentity::of(path) != damaged) return std::nullopt;
  if (auto other = confirmDamage(path, busy, changesNothing)) return other;
  if (changesNothing) {
    return StoreFailure{failure.fault, failure.message + "; the next run sets it aside"};
  }
  try {
    const StoreFolderLock lock(path, *busy);
    if (FileIdentity::of(path) != damaged) return std::nullopt;
    withholdFromOthers(path);
    const std::string name =
        freeName(path + std::string(kSetAsideMark) + compactStamp(clock.now()));
    // The log goes first. If the process is killed in between, the file is found damaged again; a
    // log left without its file would be taken for that of a new store.
    if (!moveFile(path + "-wal", name + "-wal") || !moveFile(path + "-shm", name + "-shm") ||
        !moveFile(path, name)) {
      throw StoreFailure{StoreFault::Refused, std::string("it cannot be set aside: ") +
                                                  systemText(errno) +
                                                  ": run as the owner of its folder"};
    }
    logged->insert(lossOf(name).message);
    log.write(LogLevel::Error, describe(failure) + "; it is now " + name +
                                   " and a new store begins: inspect or remove that file");
  } catch (const StoreFailure& obstacle) {
    return StoreFailure{failure.fault, failure.message + "; " + obstacle.message};
  }
  const std::int64_t count =
      preferences.ZTXPreferencesGetIntegerValue(kStoreCorruptionsKey, kStoreCorruptionsDomain);
  preferences.ZTXPreferencesSetValue(kStoreCorruptionsKey, plist::Number(wrappingAdd(count, 1)),
                                     kStoreCorruptionsDomain);
  preferences.ZTXPreferencesSynchronize(kStoreCorruptionsDomain);
  return std::nullopt;
}

StoreLoss StoreSite::lastLoss() const {
  const std::string folder = folderOf(path);
  const auto names = FileSystem().list(folder);
  if (!names) return {INT64_MAX, {StoreFault::Refused, names.error().message}};
  const std::string beginning = path.substr(folder.size() + 1) + std::string(kSetAsideMark);
  const std::int64_t today = dayOf(clock.now());
  StoreLoss last{INT64_MIN, {StoreFault::Damaged, {}}};
  for (const std::string& name : *names) {
    if (!name.starts_with(beginning) || name.ends_with("-wal") || name.ends_with("-shm")) continue;
    const std::string file = folder + '/' + name;
    const auto isPlausible = [&](const std::optional<std::int64_t>& day) {
      return day && *day >= kFirstPlausibleDay && *day <= today;
    };
    std::optional<std::int64_t> day = dayInStamp(std::string_view(name).substr(beginning.size()));
    // When the clock was wrong then, the last change tells more. Setting it aside sets the ctime,
    // which is before the last change only if the clock was behind, or ahead at that change;
    // inspecting or copying the file changes both.
    if (const auto status = FileSystem::status(file)) {
      const std::int64_t changed = dayOfSecond(status->st_mtim.tv_sec);
      const bool wasBehind = status->st_ctim.tv_sec < status->st_mtim.tv_sec && changed <= today;
      if (!isPlausible(day) || (wasBehind && changed > *day)) day = changed;
    }
    if (isPlausible(day) && *day >= last.lastDay) last = {*day, lossOf(file)};
  }
  return last;
}

}  // namespace tavrel
