// Parses a command line, with usage errors in the form that all our programs use.
#pragma once

#include <string>
#include <vector>

#include "tools/console/tool_output.h"

namespace CLI {
class App;
}  // namespace CLI

namespace tavrel {

/// Parses the arguments and runs the subcommand that they name. Prints help, the version and usage
/// errors to `output`. Exceptions from a subcommand reach the caller.
void runCommandLine(CLI::App& app, const std::vector<std::string>& arguments, ToolOutput& output);

}  // namespace tavrel
