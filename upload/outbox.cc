#include "upload/outbox.h"

#include <algorithm>
#include <tuple>
#include <utility>

#include "base/limits.h"
#include "platform/linux/logs/file_submission.h"
#include "platform/linux/logs/log_file_name.h"

namespace tavrel::upload {
namespace {

constexpr std::string_view kFolder = "/var/mobile/Library/Logs/Submission";
constexpr std::string_view kPending = "pending";
constexpr std::string_view kOutbox = "outbox";
constexpr std::string_view kRefused = "refused";
constexpr std::string_view kLogEnding = ".log";
constexpr mode_t kMode = 0640;

}  // namespace

Outbox::Outbox(const DeviceRoot& root, FileSystem& files)
    : folder_(root.path(kFolder)), files_(files) {}

std::string Outbox::path(std::string_view place, std::string_view name,
                         std::string_view ending) const {
  std::string path = folder_;
  path += '/';
  path += place;
  path += '/';
  path += name;
  path += ending;
  return path;
}

std::string Outbox::logPath(std::string_view name) const {
  return path(kOutbox, name, kLogEnding);
}

std::string Outbox::metadataPath(std::string_view name) const {
  return path(kOutbox, name, kLogMetadataEnding);
}

Expected<std::vector<WaitingLog>> Outbox::logsIn(std::string_view place,
                                                 std::vector<std::string>& orphans) {
  auto files = files_.list(path(place, {}, {}));
  if (!files) return files.error();
  std::vector<WaitingLog> logs;
  for (std::string& file : *files) {
    if (file.ends_with(kLogEnding)) {
      file.resize(file.size() - kLogEnding.size());
      std::int64_t filed = 0;
      if (const auto parsed = parseLogFileName(file)) {
        filed = parsed->seconds;
      } else if (const auto status = FileSystem::status(path(place, file, kLogEnding))) {
        filed = status->st_mtim.tv_sec;
      }
      logs.push_back({filed, std::move(file)});
    } else if (file.ends_with(kLogMetadataEnding)) {
      file.resize(file.size() - kLogMetadataEnding.size());
      // Sorted by name, a log comes right before its metadata.
      if (logs.empty() || logs.back().name != file) orphans.push_back(std::move(file));
    }
  }
  std::sort(logs.begin(), logs.end(), [](const WaitingLog& a, const WaitingLog& b) {
    return std::tie(a.filed, a.name) < std::tie(b.filed, b.name);
  });
  return logs;
}

Expected<std::vector<WaitingLog>> Outbox::logs() {
  std::vector<std::string> orphans;
  auto logs = logsIn(kOutbox, orphans);
  for (const std::string& name : orphans) {
    // The log of new metadata may be about to arrive from pending/. Look for it there first,
    // because a log never moves back.
    if (!FileSystem::status(path(kPending, name, kLogEnding)) &&
        !FileSystem::status(logPath(name))) {
      files_.discard(metadataPath(name));
    }
  }
  return logs;
}

Status Outbox::removeFrom(std::string_view place, std::string_view name) {
  if (Status removed = files_.remove(path(place, name, kLogEnding)); !removed) return removed;
  return files_.remove(path(place, name, kLogMetadataEnding));
}

Status Outbox::remove(std::string_view name) {
  return removeFrom(kOutbox, name);
}

Status Outbox::removeAll(std::size_t& count) {
  if (!FileSystem::status(folder_)) return Done{};
  const auto lock = files_.lockFolder(folder_);
  if (!lock) return lock.error();
  Status outcome = Done{};
  const auto keepFirst = [&](const Error& error) {
    if (outcome) outcome = error;
  };
  for (const std::string_view place : {kPending, kOutbox}) {
    std::vector<std::string> orphans;
    const auto logs = logsIn(place, orphans);
    if (!logs) {
      keepFirst(logs.error());
      continue;
    }
    for (const WaitingLog& log : *logs) {
      if (Status removed = removeFrom(place, log.name)) {
        ++count;
      } else {
        keepFirst(removed.error());
      }
    }
  }
  return outcome;
}

Status Outbox::move(std::string_view name, std::string_view from, std::string_view to) {
  const std::string log = path(from, name, kLogEnding);
  if (!FileSystem::status(log)) return Done{};
  const std::string metadata = path(from, name, kLogMetadataEnding);
  const auto content = files_.readIfPresent(metadata, limits::kPropertyListBytes);
  if (!content) return content.error();
  const Status ready =
      *content ? files_.replace(path(to, name, kLogMetadataEnding), asBytes(**content), kMode)
               : files_.makeFolders(folder_ + "/" + std::string(to));
  if (!ready) return ready;
  if (Status moved = files_.rename(log, path(to, name, kLogEnding)); !moved) return moved;
  files_.discard(metadata);
  return Done{};
}

Status Outbox::takePending(const std::function<bool()>& mayMove) {
  std::vector<std::string> orphans;
  const auto logs = logsIn(kPending, orphans);
  if (!logs) return logs.error();
  Status outcome = Done{};
  for (const WaitingLog& log : *logs) {
    const auto lock = files_.lockFolder(folder_);
    if (!lock) return lock.error();
    if (!mayMove()) return outcome;
    if (Status moved = move(log.name, kPending, kOutbox); !moved && outcome) outcome = moved;
  }
  return outcome;
}

Status Outbox::refuse(std::string_view name) {
  const auto lock = files_.lockFolder(folder_);
  if (!lock) return lock.error();
  if (Status moved = move(name, kOutbox, kRefused); !moved) return moved;
  return boundRefused();
}

Status Outbox::boundRefused() {
  std::vector<std::string> orphans;
  auto logs = logsIn(kRefused, orphans);
  if (!logs) return logs.error();
  for (const std::string& name : orphans)
    files_.discard(path(kRefused, name, kLogMetadataEnding));
  std::reverse(logs->begin(), logs->end());
  std::size_t count = 0;
  std::uint64_t bytes = 0;
  for (const WaitingLog& log : *logs) {
    const auto status = FileSystem::status(path(kRefused, log.name, kLogEnding));
    if (status) bytes += static_cast<std::uint64_t>(status->st_size);
    if (++count <= limits::kRefusedLogs && bytes <= limits::kRefusedBytes) continue;
    if (Status removed = removeFrom(kRefused, log.name); !removed) return removed;
  }
  return Done{};
}

}  // namespace tavrel::upload
