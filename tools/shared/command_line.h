// Parsing of a command line, with usage errors in the form of all our programs.
#pragma once

#include <string>
#include <vector>

#include "tools/shared/tool_output.h"

namespace CLI {
class App;
}  // namespace CLI

namespace tavrel {

/// Parses the arguments and runs the subcommand that they name. Help, the version and usage errors
/// go to `output`. What a subcommand throws is thrown on.
void runCommandLine(CLI::App& app, const std::vector<std::string>& arguments, ToolOutput& output);

}  // namespace tavrel
