#include "tools/console/command_line.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <sstream>
#include <string_view>
#include <utility>

#include "base/format.h"
#include "tools/console/word_list.h"

namespace tavrel {
namespace {

// Whether another argument could be a value of the command.
bool takesMore(const CLI::App& command) {
  return !command
              .get_options([](const CLI::Option* option) {
                return option->get_positional() &&
                       std::cmp_less(option->count(), option->get_items_expected_max());
              })
              .empty();
}

// CLI11's words for a fault, in the words of the other messages.
std::string inOurWords(const CLI::ParseError& error) {
  constexpr std::string_view kNoSubcommand = "A subcommand is required";
  constexpr std::string_view kTooMany = "Requires at most 1 options be given from [";
  constexpr std::string_view kNoValue = ": 1 required ";
  constexpr std::string_view kMissing = " missing";
  constexpr std::string_view kExcludes = " excludes ";
  const std::string fault = error.what();
  if (fault == kNoSubcommand) return "name a subcommand";
  if (fault.starts_with(kTooMany) && fault.ends_with(']')) {
    std::vector<std::string> options;
    std::istringstream list(fault.substr(kTooMany.size(), fault.size() - kTooMany.size() - 1));
    for (std::string option; std::getline(list, option, ',');)
      options.push_back(option);
    return "give at most one of " + listed(options, "and");
  }
  if (const std::size_t at = fault.find(kNoValue);
      at != std::string::npos && fault.ends_with(kMissing)) {
    const std::size_t type = at + kNoValue.size();
    return fault.substr(0, at) +
           " needs a value: " + fault.substr(type, fault.size() - type - kMissing.size());
  }
  // Other faults quote what the user typed, which may contain the same words.
  if (const std::size_t at = fault.find(kExcludes);
      at != std::string::npos && dynamic_cast<const CLI::ExcludesError*>(&error) != nullptr) {
    return fault.substr(0, at) + " and " + fault.substr(at + kExcludes.size()) +
           " exclude each other";
  }
  return fault;
}

// Describes what is wrong with a command line, and names the subcommand whose help to read.
std::string usageFault(const CLI::App& app, const std::vector<std::string>& arguments,
                       const CLI::ParseError& error) {
  const CLI::App* command = &app;
  std::string line = app.get_name();
  while (!command->get_subcommands().empty()) {
    command = command->get_subcommands().front();
    line += ' ' + command->get_name();
  }
  std::string fault = inOurWords(error);
  const auto unknown = app.remaining(true);
  const bool isExtra = dynamic_cast<const CLI::ExtrasError*>(&error) != nullptr;
  const bool isMissing = dynamic_cast<const CLI::RequiredError*>(&error) != nullptr;
  if ((isExtra || isMissing) && !unknown.empty()) {
    const std::string& first = unknown.front();
    const auto values = std::ranges::find(arguments, "--");
    const bool isValue = std::find(values, arguments.end(), first) != arguments.end();
    if (first.size() > 1 && first.starts_with('-') && !isValue) {
      fault = format("no option '%s'", first);
      if (!first.starts_with("--") && takesMore(*command))
        fault += ": put -- before it if it is a value";
    } else if (command->get_require_subcommand_min() > 0) {
      fault = format("no subcommand '%s'", first);
    } else if (isExtra) {
      fault = format("unexpected argument '%s'", first);
    }
  }
  return format("%s: see '%s --help'", fault, line);
}

// The program and the subcommands that the arguments name.
std::string commandOf(const CLI::App& app, const std::vector<std::string>& arguments) {
  const CLI::App* command = &app;
  std::string line = app.get_name();
  for (const std::string& argument : arguments) {
    const auto inner = command->get_subcommands(
        [&argument](const CLI::App* below) { return below->get_name() == argument; });
    if (argument.empty() || inner.empty()) continue;
    command = inner.front();
    line += ' ' + argument;
  }
  return line;
}

// The first option that ends in "=": CLI11 would take the next argument as its value.
std::string emptyValueIn(const std::vector<std::string>& arguments) {
  for (const std::string& argument : arguments) {
    if (argument == "--") break;
    const std::size_t equals = argument.find('=');
    if (argument.starts_with('-') && equals > 1 && equals + 1 == argument.size())
      return argument.substr(0, equals);
  }
  return {};
}

}  // namespace

void runCommandLine(CLI::App& app, const std::vector<std::string>& arguments, ToolOutput& output) {
  if (const std::string option = emptyValueIn(arguments); !option.empty()) {
    return output.failUsage(
        format("%s: must not be empty: see '%s --help'", option, commandOf(app, arguments)));
  }
  try {
    app.parse(std::vector<std::string>(arguments.rbegin(), arguments.rend()));
  } catch (const CLI::ParseError& error) {
    if (error.get_exit_code() == static_cast<int>(CLI::ExitCodes::Success)) {
      app.exit(error, output.out(), output.error());
    } else {
      output.failUsage(usageFault(app, arguments, error));
    }
  }
}

}  // namespace tavrel
