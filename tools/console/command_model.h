// The possible content of a command line as plain data, for completions and manual pages.
#pragma once

#include <string>
#include <vector>

#include "tools/console/command.h"

namespace tavrel {

/// An option, or an argument that has no dash.
struct OptionModel {
  std::vector<std::string> names;    // "-v", "--verbose"; none for an argument
  std::string value;                 // "DAY"; empty for a flag
  std::vector<std::string> choices;  // the only values, when there are few
  std::string description;
  bool isRequired = false;
  bool mayRepeat = false;
  std::vector<std::string> excludes;  // the last names of options that it rules out

  bool isFlag() const { return value.empty(); }
  /// The last name, which is the long one when there are two.
  const std::string& name() const { return names.back(); }
};

struct CommandModel {
  std::string path;  // "log list"; empty for the program
  std::string name;  // "list"
  std::string description;
  std::vector<OptionModel> options;    // without --help
  std::vector<OptionModel> arguments;  // in order
  std::vector<CommandModel> commands;
};

/// Leaves out commands that the help hides.
CommandModel modelOf(const Command& program);

/// Calls `visit` for the command and all commands below it, in the order of the help.
template <class Visit>
void walk(const CommandModel& command, const Visit& visit) {
  visit(command);
  for (const CommandModel& below : command.commands)
    walk(below, visit);
}

}  // namespace tavrel
