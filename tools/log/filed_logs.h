// Lists the logs that were filed for submission.
#pragma once

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

/// "pending" or "outbox".
std::string_view nameOf(FileSubmission::Place place);

/// The name of its file, with the ending.
std::string fileNameOf(const FiledLog& log);

/// The logs of both folders, oldest first.
Expected<std::vector<FiledLog>> filedLogs(ToolContext& context);

/// Says once why logs have no metadata.
void noteMissingMetadata(ToolContext& context, const std::vector<FiledLog>& logs);

}  // namespace tavrel
