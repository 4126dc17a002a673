#include "tools/shared/command_line.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <utility>

#include "base/format.h"

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

// Describes what is wrong with a command line, and names the subcommand whose help to read.
std::string usageFault(const CLI::App& app, const std::vector<std::string>& arguments,
                       const CLI::ParseError& error) {
  const CLI::App* command = &app;
  std::string line = app.get_name();
  while (!command->get_subcommands().empty()) {
    command = command->get_subcommands().front();
    line += ' ' + command->get_name();
  }
  std::string fault = error.what();
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
        format("%s: must not be empty: see '%s --help'", option, app.get_name()));
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
