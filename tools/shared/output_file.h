// Files that a command line names for output.
#pragma once

#include <string>
#include <string_view>

#include "base/expected.h"
#include "tools/shared/tool_output.h"

namespace tavrel {

/// Makes `bytes` the content of a file of this machine, in one step; "-" is standard output. The
/// folder must exist; refuses anything but a regular file.
Status writeOutput(ToolOutput& output, const std::string& file, std::string_view bytes);

}  // namespace tavrel
