// Lists the logs that were filed for submission.
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <sys/stat.h>
#include <vector>

#include "platform/linux/logs/file_submission.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

/// A log, with the status of its file.
struct FiledLog : FileSubmission::FiledLog {
  std::optional<struct stat> status;  // nothing when unknown
};

/// "pending", "outbox" or "withheld".
std::string_view nameOf(FileSubmission::Place place);

/// The name of its file, with the ending.
std::string fileNameOf(const FiledLog& log);

struct FiledLogs {
  std::vector<FiledLog> logs;        // oldest first
  std::size_t older = 0;             // that were left out
  std::optional<Error> unseen = {};  // why those that are withheld cannot be seen
};

/// The newest logs of all folders, at most so many, chosen by the names of their files: only the
/// metadata of those is read.
Expected<FiledLogs> filedLogs(ToolContext& context, std::size_t most);

/// The logs of all folders whose names begin so, oldest first.
Expected<std::vector<FiledLog>> filedLogsBeginning(ToolContext& context, std::string_view name);

/// The newest log whose name begins with `namePrefix` and that `accepts` takes. It is chosen by
/// file names, so few metadata files are read. Nothing when there is none.
Expected<std::optional<FiledLog>> newestLog(ToolContext& context, std::string_view namePrefix,
                                            const std::function<bool(const FiledLog&)>& accepts);

/// The filed log that `name` means: its path, or the name of its file with or without the ending.
std::optional<FiledLog> filedLogNamed(ToolContext& context, std::string_view name);

/// Says once why logs stand without metadata. It is a failure when that cannot be read.
void noteMissingMetadata(ToolContext& context, const std::vector<FiledLog>& logs);

}  // namespace tavrel
