#include "platform/linux/logs/log_folder.h"

#include <algorithm>
#include <functional>
#include <set>
#include <utility>

#include "base/civil_time.h"
#include "base/limits.h"
#include "platform/linux/logs/log_file_name.h"

namespace tavrel {
namespace {

// Logs that may leave are readable by their owner and a group of operators.
constexpr mode_t kMode = 0640;

bool isFolder(const std::string& path) {
  const auto status = FileSystem::status(path);
  return status && S_ISDIR(status->st_mode);
}

// `file` without `ending`; empty when it ends otherwise.
std::string withoutEnding(const std::string& file, std::string_view ending) {
  return file.ends_with(ending) ? file.substr(0, file.size() - ending.size()) : std::string();
}

}  // namespace

std::tuple<bool, std::int64_t, std::string_view> removalKey(std::int64_t seconds,
                                                            std::string_view name,
                                                            std::int64_t today) {
  return {!isAhead(dayOfSecond(seconds), today), seconds, name};
}

LogFolder::LogFolder(std::string_view submission, std::string_view name, FileSystem& files)
    : path_(submission), files_(files) {
  path_ += '/';
  path_ += name;
}

std::string LogFolder::logPath(std::string_view name) const {
  return std::string(path_).append("/").append(name).append(kLogEnding);
}

std::string LogFolder::metadataPath(std::string_view name) const {
  return std::string(path_).append("/").append(name).append(kLogMetadataEnding);
}

Expected<LogFolder::Listing> LogFolder::list() const {
  const auto entries = files_.list(path_);
  if (!entries) return entries.error();
  Listing listing;
  for (const std::string& entry : *entries) {
    if (std::string log = withoutEnding(entry, kLogEnding); !log.empty()) {
      listing.logs.push_back(std::move(log));
    } else if (std::string name = withoutEnding(entry, kLogMetadataEnding);
               !name.empty() &&
               !std::ranges::binary_search(*entries, std::string(name).append(kLogEnding))) {
      listing.orphans.push_back(std::move(name));
    }
  }
  return listing;
}

std::int64_t LogFolder::timeOf(const std::string& name) const {
  if (const auto known = parseLogFileName(name)) return known->seconds;
  const auto status = FileSystem::status(logPath(name));
  return status ? std::int64_t{status->st_mtim.tv_sec} : 0;
}

Status LogFolder::moveLog(const std::string& name, const LogFolder& to) {
  const std::string log = logPath(name);
  if (!FileSystem::status(log)) return Done{};
  if (Status made = files_.makeFolders(to.path()); !made) return made;
  if (Status given = giveMetadata(name, to); !given) return given;
  if (Status moved = files_.rename(log, to.logPath(name)); !moved) return moved;
  files_.discard(metadataPath(name));
  return Done{};
}

// Not renamed, since the log would lack its metadata until it follows. A link, unlike a copy, works
// on a full disk and with content that cannot be read.
Status LogFolder::giveMetadata(const std::string& name, const LogFolder& to) {
  const std::string path = metadataPath(name);
  if (files_.link(path, to.metadataPath(name))) return Done{};
  const auto metadata = files_.readIfPresent(path, limits::kPropertyListBytes);
  if (!metadata || !*metadata) return Done{};
  return files_.replace(to.metadataPath(name), asBytes(**metadata), kMode);
}

Status LogFolder::removeLog(const std::string& name) {
  if (Status removed = files_.remove(logPath(name)); !removed) return removed;
  return files_.remove(metadataPath(name));
}

void LogFolder::removeOrphans(const Listing& listing) {
  for (const std::string& name : listing.orphans)
    files_.discard(metadataPath(name));
}

Status LogFolder::keepNewest(std::size_t count, std::uint64_t bytes, std::string_view fresh,
                             std::int64_t today) {
  const auto listing = list();
  if (!listing) return listing.error();
  std::vector<std::pair<std::int64_t, std::string>> logs;  // by their seconds
  for (const std::string& name : listing->logs)
    logs.emplace_back(timeOf(name), name);
  std::ranges::sort(logs, std::greater(), [&](const auto& log) {
    return std::pair(log.second == fresh, removalKey(log.first, log.second, today));
  });
  Status outcome = Done{};
  std::size_t kept = 0;
  std::uint64_t bytesKept = 0;
  for (const auto& [seconds, name] : logs) {
    const auto status = FileSystem::status(logPath(name));
    const std::uint64_t size = status ? static_cast<std::uint64_t>(status->st_size) : 0;
    // A log that alone exceeds the bound displaces no others by its size.
    if (size <= bytes) bytesKept += size;
    if (size <= bytes || name == fresh) ++kept;
    if (name == fresh || (kept <= count && size <= bytes && bytesKept <= bytes)) continue;
    if (Status removed = removeLog(name); !removed && outcome) outcome = removed;
  }
  return outcome;
}

RemovedLogs removeLogsIn(FileSystem& files, const std::string& submission,
                         std::initializer_list<std::string_view> folders) {
  RemovedLogs removed;
  std::set<std::string> names;
  const auto note = [&removed](const Status& status) {
    if (!status && !removed.failure) removed.failure = status.error();
  };
  for (const std::string_view place : folders) {
    const std::string folder = LogFolder(submission, place, files).path();
    const auto entries = files.list(folder);
    if (!entries) {
      note(entries.error());
      continue;
    }
    std::set<std::string> stuck;
    for (const std::string_view ending : {kLogEnding, kLogMetadataEnding}) {
      for (const std::string& entry : *entries) {
        std::string name = withoutEnding(entry, ending);
        if (name.empty() || stuck.contains(name)) continue;
        std::string path = folder;
        path += '/';
        path += entry;
        if (Status gone = files.remove(path); !gone) {
          if (!isFolder(path)) note(gone);
          stuck.insert(std::move(name));
        } else if (ending == kLogEnding) {
          names.insert(std::move(name));
        }
      }
    }
    files.discardTemporaries(folder);
    note(files.flushFolder(folder));
  }
  removed.logs = names.size();
  return removed;
}

}  // namespace tavrel
