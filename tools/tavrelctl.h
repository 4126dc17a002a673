// The command line of tavrelctl, without the process around it.
#pragma once

#include <string>
#include <vector>

#include "tools/console/tool_output.h"

namespace tavrel {

/// Runs one command line, given without the program's name, and returns the exit status: 0 for
/// success, 1 for failure, 2 for wrong usage. Throws nothing.
int runTavrelctl(const std::vector<std::string>& arguments, const ToolStreams& streams);

}  // namespace tavrel
