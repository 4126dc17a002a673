// Completion scripts of shells, generated from the commands, so that they fit them always.
#pragma once

#include <string>
#include <string_view>

#include "tools/shared/command_model.h"

namespace tavrel {

/// What completes a value: "files", "folders", "none", or what `tavrelctl completion` lists:
/// "keys", "days", "domains", "logs".
std::string_view valueKind(const CommandModel& command, const OptionModel& option);

std::string bashScript(const CommandModel& program);
std::string zshScript(const CommandModel& program);
std::string fishScript(const CommandModel& program);

/// `text` in single quotes, with `escape` for a single quote in it.
std::string shellQuoted(std::string_view text, std::string_view escape = "'\\''");

/// Words with a blank between them.
std::string joined(const std::vector<std::string>& words);

}  // namespace tavrel
