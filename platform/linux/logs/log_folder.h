// Folders of submitted logs: each log with its metadata beside it. Files with other names are left
// alone.
//
// Metadata appears before its log and disappears after it, so each visible log has its metadata. A
// process that files or moves a log meanwhile holds the lock of `kSubmissionFolder`. Under that
// lock metadata without a log means nothing: a killed process left it, and it is removed.
#pragma once

#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <optional>
#include <string>
#include <string_view>
#include <tuple>
#include <vector>

#include "base/expected.h"
#include "platform/linux/files/file_system.h"
#include "platform/tallied_log.h"

namespace tavrel {

/// Holds the folders of logs, and the lock of all of them.
inline constexpr std::string_view kSubmissionFolder = "/var/mobile/Library/Logs/Submission";
inline constexpr std::string_view kPendingFolder = "pending";    // on their way to the outbox
inline constexpr std::string_view kOutboxFolder = "outbox";      // to be sent
inline constexpr std::string_view kWithheldFolder = "withheld";  // never sent
inline constexpr std::string_view kRefusedFolder = "refused";    // by the server

/// The number of withheld logs that are kept, the newest.
inline constexpr std::size_t kWithheldLogs = 8;

/// True for a day after tomorrow: it was recorded while the clock was ahead.
constexpr bool isAhead(std::int64_t day, std::int64_t today) {
  return day > today + 1;
}

/// Orders files for removal: those dated after tomorrow first, then the oldest. `name` must outlive
/// the key.
std::tuple<bool, std::int64_t, std::string_view> removalKey(std::int64_t seconds,
                                                            std::string_view name,
                                                            std::int64_t today);

/// Names are those of logs, without ending.
class LogFolder {
 public:
  /// `submission`: the folder that contains all of them, on this machine.
  LogFolder(std::string_view submission, std::string_view name, FileSystem& files);

  const std::string& path() const { return path_; }
  std::string logPath(std::string_view name) const;
  std::string metadataPath(std::string_view name) const;

  struct Listing {
    std::vector<std::string> logs;     // by name
    std::vector<std::string> orphans;  // metadata without its log
  };
  /// Opens no file. A missing folder has no logs.
  Expected<Listing> list() const;
  /// When a log was filed, in seconds since 1970, by its name or else its last change.
  std::int64_t timeOf(const std::string& name) const;

  /// Moves a log with its metadata, or without when that cannot be read; one that has gone needs no
  /// move. Where files can have several names, this needs no free space. The caller holds the lock.
  Status moveLog(const std::string& name, const LogFolder& to);
  /// Removes a log with its metadata. It may already be gone.
  Status removeLog(const std::string& name);
  /// The caller holds the lock, and has held it since the folder was listed.
  void removeOrphans(const Listing& listing);

  /// Removes all but the newest `count` logs of at most `bytes` together, in the order of
  /// `removalKey`. The log named `fresh` counts as the newest and always stays. One that cannot be
  /// removed does not stop the others; the first failure is returned.
  Status keepNewest(std::size_t count, std::uint64_t bytes, std::string_view fresh,
                    std::int64_t today);

 private:
  Status giveMetadata(const std::string& name, const LogFolder& to);

  std::string path_;
  FileSystem& files_;
};

struct RemovedLogs {
  std::size_t logs = 0;  // the same name in two folders counts once
  std::optional<Error> failure;
};

/// Deletes all logs in these folders of `submission`, leftover metadata and files still being
/// written. Links are deleted, not their targets; a folder named like a log is none, and stays.
/// Each log goes before its metadata. When a log cannot be deleted, the others still are; the first
/// failure is reported.
RemovedLogs removeLogsIn(FileSystem& files, const std::string& submission,
                         std::initializer_list<std::string_view> folders);

}  // namespace tavrel
