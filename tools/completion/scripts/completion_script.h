// Completion scripts of shells, generated from the commands, so that they fit them always.
#pragma once

#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "tools/shared/command_model.h"

namespace tavrel {

/// What the scripts need to know of a program.
struct CompletedProgram {
  CommandModel model;
  /// The option that may stand anywhere on the line and changes what values there are.
  std::string anywhere;
  /// What `PROGRAM completion LIST` lists, by the name of the value in the help.
  std::vector<std::pair<std::string_view, std::string_view>> lists = {};
  /// The same for some commands, by the beginnings of their paths; they come first.
  struct Exception {
    std::string_view path, value, list;
  };
  std::vector<Exception> exceptions = {};

  const std::string& name() const { return model.name; }
  /// The beginning of its names in scripts: "tavrel_fleet".
  std::string identifier() const;
  const OptionModel& anywhereOption() const;

  /// What completes a value: "files", "folders", "none", or a list.
  std::string_view valueKind(const CommandModel& command, const OptionModel& option) const;
};

/// `text` with the program's name for @program@, its identifier for @id@ and the option that may
/// stand anywhere for @anywhere@.
std::string filledIn(std::string_view text, const CompletedProgram& program);

std::string bashScript(const CompletedProgram& program);
std::string zshScript(const CompletedProgram& program);
std::string fishScript(const CompletedProgram& program);

/// `text` in single quotes, with `escape` for a single quote in it.
std::string shellQuoted(std::string_view text, std::string_view escape = "'\\''");

/// Words with a blank between them.
std::string joined(const std::vector<std::string>& words);

}  // namespace tavrel
