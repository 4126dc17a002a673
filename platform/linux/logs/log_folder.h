// Folders of submitted logs: each log with its metadata beside it. Files with other names are left
// alone.
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"
#include "platform/linux/files/file_system.h"

namespace tavrel {

inline constexpr std::string_view kLogEnding = ".log";

/// The ending of a log's metadata file, whose name otherwise equals the log's.
inline constexpr std::string_view kLogMetadataEnding = ".metadata.plist";

/// `file` without `ending`; empty when it ends otherwise.
std::string withoutEnding(const std::string& file, std::string_view ending);

struct RemovedLogs {
  std::size_t logs = 0;  // the same name in two folders counts once
  std::optional<Error> failure;
};

/// Deletes all logs in the folders, leftover metadata and files still being written. Links are
/// deleted, not their targets. Each log goes before its metadata. When a log cannot be deleted, the
/// others still are; the first failure is reported.
RemovedLogs removeLogsIn(FileSystem& files, const std::vector<std::string>& folders);

/// Deletes all but the newest `count` logs of a folder, by the stamps in their names. The log named
/// `fresh` counts as the newest, whatever its stamp says.
void keepNewestLogs(FileSystem& files, const std::string& folder, std::size_t count,
                    const std::string& fresh);

}  // namespace tavrel
