// Makes a manual page from prose, with usage lines and option tables taken from the commands.
#pragma once

#include <string>
#include <string_view>

#include "base/expected.h"
#include "tools/console/command_model.h"
#include "tools/console/tool_output.h"

namespace tavrel {

/// Lines of the template that begin with "@":
///
///   @command log list    the usage of a command. Several of these lines in a row share the prose
///                        that follows. Their options, except --json, come after that prose, before
///                        the next such line or heading
///   @others TITLE        under that heading, the commands without a line of their own
///
/// Fails on a command that the program does not have.
Expected<std::string> manPage(std::string_view pageTemplate, const CommandModel& program);

/// Prints what becomes of the template in the file.
void printManPage(ToolOutput& output, const std::string& file, const CommandModel& program);

}  // namespace tavrel
