// The logs that were filed for submission, as the tool lists them.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <sys/stat.h>
#include <vector>

#include "platform/linux/logs/file_submission.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

/// A log, with what the file system knows of its file.
struct FiledLog : FileSubmission::FiledLog {
  std::optional<struct stat> status;  // nothing when it cannot be told
};

/// "pending" or "outbox".
std::string_view nameOf(FileSubmission::Place place);

/// The name of its file, with the ending.
std::string fileNameOf(const FiledLog& log);

/// The logs of both folders, oldest first.
Expected<std::vector<FiledLog>> filedLogs(ToolContext& context);

/// Says once why logs stand without metadata.
void noteMissingMetadata(ToolContext& context, const std::vector<FiledLog>& logs);

}  // namespace tavrel
