// What a command line may hold, as plain data: for completions and manual pages.
#pragma once

#include <string>
#include <vector>

#include "tools/shared/command.h"

namespace tavrel {

/// An option, or an argument without a dash.
struct OptionModel {
  std::vector<std::string> names;    // "-v", "--verbose"; of an argument none
  std::string value;                 // "DAY"; empty for a flag
  std::vector<std::string> choices;  // the only values, where they are few
  std::string description;
  bool isRequired = false;
  bool mayRepeat = false;
  std::vector<std::string> excludes;  // the last names of options that cannot be given with it

  bool isFlag() const { return value.empty(); }
  /// The last name, which is the long one where there are two.
  const std::string& name() const { return names.back(); }
};

struct CommandModel {
  std::string path;  // "log list"; empty for the program
  std::string name;  // "list"
  std::string description;
  std::vector<OptionModel> options;    // without --help
  std::vector<OptionModel> arguments;  // in their order
  std::vector<CommandModel> commands;
};

/// Commands without a heading in the help are left out.
CommandModel modelOf(const Command& program);

/// Calls `visit` for the command and all below it, in the order of the help.
template <class Visit>
void walk(const CommandModel& command, const Visit& visit) {
  visit(command);
  for (const CommandModel& below : command.commands)
    walk(below, visit);
}

}  // namespace tavrel
