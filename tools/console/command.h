// Subcommands and their options, built on CLI11. Only command.cc, command_model.cc, command_line.cc
// and the files that make the top of a program include its headers.
//
//   const Command group = top.addGroup("log", "Show submitted logs");
//   const Command list = group.addCommand("list", "List the pending logs");
//   list.addOption("--day", arguments->day, "Only those of one day").typeName("DAY");
//   list.onRun([&context, arguments] { ... });
//
// Both classes are handles: a copy refers to the same command or option. The targets of options
// must live until the command line has been parsed.
#pragma once

#include <functional>
#include <string>
#include <vector>

namespace CLI {
class App;
class Option;
}  // namespace CLI

namespace tavrel {

struct CommandModel;

class Option {
 public:
  explicit Option(CLI::Option& option) : option_(&option) {}

  Option required() const;
  /// The name of the value in the help, such as "DAY".
  Option typeName(const char* name) const;
  /// Shows the target's current value in the help.
  Option showDefault() const;
  Option oneOf(const std::vector<std::string>& values) const;
  /// `fault` returns what is wrong with the text of a value, or an empty string.
  Option check(std::function<std::string(const std::string& text)> fault) const;
  /// Refuses an empty value: in a script that is a variable without a value.
  Option notEmpty() const;
  Option excludes(const Option& other) const;

 private:
  CLI::Option* option_;
};

class Command {
 public:
  explicit Command(CLI::App& app) : app_(&app) {}

  Command addCommand(const char* name, const char* description) const;
  /// A command that consists only of subcommands, one of which is required.
  Command addGroup(const char* name, const char* description) const;
  /// A group of options under its own heading, of which at most one may be given.
  Command addChoice(const char* heading) const;

  /// "-v,--verbose" is an option, whose value may not be empty; "FILE" is an argument. Targets may
  /// be std::string, double, 32-bit unsigned integers, which are decimal and may be optional, and
  /// std::vector<std::string> for repeated arguments.
  template <class Target>
  Option addOption(const char* names, Target& target, const char* description) const;
  Option addFlag(const char* names, bool& target, const char* description) const;
  Option addFlag(const char* names, std::function<void()> onGiven, const char* description) const;

  /// Sets the text after the options in the help.
  void setFooter(std::string text) const;

  /// Hides the command from the help, because only other programs use it.
  void hide() const;

  void onRun(std::function<void()> action) const;

 private:
  friend CommandModel modelOf(const Command& program);
  CLI::App* app_;
};

}  // namespace tavrel
