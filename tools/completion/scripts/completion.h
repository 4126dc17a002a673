// The hidden command `completion`, with which a program describes itself to shells and the build.
#pragma once

#include <functional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "tools/completion/scripts/completion_script.h"
#include "tools/console/tool_output.h"

namespace tavrel {

/// Names go to shells. Plain words need no quoting, and no name that somebody recorded can mean
/// anything to a shell: programs print no others.
bool isPlainWord(std::string_view word);

/// The lists that only the program knows, with what prints each.
using CompletionLists = std::vector<std::pair<std::string, std::function<void()>>>;

/// The program must have all its commands by the time this one runs.
void addCompletion(Command program, ToolOutput& output,
                   CompletedProgram (*describe)(const Command& program), CompletionLists lists);

}  // namespace tavrel
