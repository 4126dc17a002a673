// The list of filed logs, and the lookup of a log by its name.
#pragma once

#include <cstddef>
#include <string>

#include "base/expected.h"
#include "tools/log/log_document.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

/// Prints the newest logs of all folders, at most `most`, oldest first, with the
/// day that each log reports.
void listLogs(ToolContext& context, std::size_t most);

/// The filed log of this path or name, or the only one whose name begins with `name`; when there is
/// none, a file of this machine, or standard input for "-". When several names begin so, the error
/// says how many.
Expected<LogEnvelope> logNamed(ToolContext& context, const std::string& name);

}  // namespace tavrel
