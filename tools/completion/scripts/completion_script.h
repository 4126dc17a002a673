// Generates shell completion scripts from the commands, so that they always match.
#pragma once

#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "tools/console/command_model.h"

namespace tavrel {

/// What the scripts need to know about a program.
struct CompletedProgram {
  CommandModel model;
  /// The option that is allowed anywhere on the line and determines which values exist.
  std::string anywhere;
  /// The LIST of `PROGRAM completion LIST` that has the values, by the value's name in the help.
  std::vector<std::pair<std::string_view, std::string_view>> lists = {};
  /// The same for commands whose paths begin with `path`; these take precedence.
  struct Exception {
    std::string_view path, value, list;
  };
  std::vector<Exception> exceptions = {};

  const std::string& name() const { return model.name; }
  /// The prefix of the program's names in scripts: "tavrel_fleet".
  std::string identifier() const;
  const OptionModel& anywhereOption() const;

  /// How a value is completed: "files", "folders", "none", or the name of a list.
  std::string_view valueKind(const CommandModel& command, const OptionModel& option) const;
};

/// `text` with @program@ replaced by the program's name, @id@ by its identifier, and @anywhere@ by
/// the option that is allowed anywhere.
std::string filledIn(std::string_view text, const CompletedProgram& program);

std::string bashScript(const CompletedProgram& program);
std::string zshScript(const CompletedProgram& program);
std::string fishScript(const CompletedProgram& program);

/// `text` in single quotes; `escape` replaces each single quote within it.
std::string shellQuoted(std::string_view text, std::string_view escape = "'\\''");

/// Joins words with blanks.
std::string joined(const std::vector<std::string>& words);

}  // namespace tavrel
