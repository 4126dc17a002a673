// The list of filed logs, and logs by the beginning of their names.
#pragma once

#include <cstddef>
#include <string>

#include "base/expected.h"
#include "tools/log/log_document.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

/// Prints the newest logs of both folders, at most so many, oldest first, with the day that each
/// reports.
void listLogs(ToolContext& context, std::size_t most);

/// The one filed log whose name begins with `name`. When there is none, a file of this machine, or
/// standard input for "-". When there are several, the error says how many.
Expected<LogEnvelope> logBeginning(ToolContext& context, const std::string& name);

}  // namespace tavrel
