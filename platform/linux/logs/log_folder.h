// Folders of submitted logs: each log with its metadata beside it. Files of other names are left
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

/// The end of the name of a log's metadata, which begins as the log's.
inline constexpr std::string_view kLogMetadataEnding = ".metadata.plist";

/// `file` without `ending`; empty when it has another.
std::string withoutEnding(const std::string& file, std::string_view ending);

struct RemovedLogs {
  std::size_t logs = 0;  // those in two folders under one name count once
  std::optional<Error> failure;
};

/// Deletes all logs of the folders, what is left of others, and what is being written. Links are
/// deleted, not what they name. Each log goes before its metadata. A log that cannot be deleted
/// does not keep others; the first failure is reported.
RemovedLogs removeLogsIn(FileSystem& files, const std::vector<std::string>& folders);

/// Deletes all but the newest `count` logs of a folder, by the stamps in their names. The one named
/// `fresh` counts as the newest, whatever the clock said.
void keepNewestLogs(FileSystem& files, const std::string& folder, std::size_t count,
                    const std::string& fresh);

}  // namespace tavrel
