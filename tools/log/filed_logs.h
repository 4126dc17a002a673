// Lists the logs filed for submission.
#pragma once

#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <sys/stat.h>
#include <vector>

#include "platform/linux/logs/file_submission.h"
#include "tools/log/log_document.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

/// A log, with the status of its file.
struct FiledLog : FileSubmission::FiledLog {
  std::optional<struct stat> status;  // nothing when unknown
};

/// "pending", "outbox", "withheld" or "refused".
std::string_view nameOf(FileSubmission::Place place);

LogEnvelope envelopeOf(const FiledLog& log);

/// The name of its file, with the extension.
std::string fileNameOf(const FiledLog& log);

/// Why the logs of a folder cannot be seen.
struct Unseen : Error {
  FileSubmission::Place place;
};

struct FiledLogs {
  std::vector<FiledLog> logs;  // oldest first
  std::size_t older = 0;       // older logs that were left out
  std::vector<Unseen> unseen;  // folders of withheld or refused ones
};

/// The newest logs of all folders, at most `most`, chosen by file name:
/// metadata is read only for these.
Expected<FiledLogs> filedLogs(ToolContext& context, std::size_t most);

/// The logs that `name` identifies: that of this path or of this file name, with or without the
/// extension; when there is none, those whose names begin with `name`, oldest first. `unseen`
/// receives the reasons why withheld or refused logs cannot be seen, unless the name is that of a
/// log.
Expected<std::vector<FiledLog>> filedLogsNamed(ToolContext& context, std::string_view name,
                                               std::vector<Unseen>& unseen);

/// The newest log whose name begins with `namePrefix` and that `accepts` takes; nothing when there
/// is none. The choice goes by file names, so few metadata files are read. `unseen` receives the
/// reasons why withheld or refused logs cannot be seen.
Expected<std::optional<FiledLog>> newestLog(ToolContext& context, std::string_view namePrefix,
                                            const std::function<bool(const FiledLog&)>& accepts,
                                            std::vector<Unseen>& unseen);

/// Says once why logs lack metadata. A failure when metadata exists but cannot be read.
void noteMissingMetadata(ToolContext& context, const std::vector<FiledLog>& logs);

}  // namespace tavrel
