#include "tools/console/command.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdint>
#include <memory>
#include <optional>
#include <type_traits>
#include <utility>
#include <vector>

#include "base/ascii.h"
#include "base/format.h"
#include "base/parse_number.h"
#include "tools/console/word_list.h"

namespace tavrel {
namespace {

// CLI11 reads 010 as octal.
std::string withoutLeadingZeros(std::string text) {
  const bool isDecimal = std::ranges::all_of(text, isDigit);
  if (isDecimal) text.erase(0, std::min(text.find_first_not_of('0'), text.size() - 1));
  return text;
}

// CLI11 heads a choice with "[Option Group: ...]" and a line of blanks.
struct ChoiceFormatter final : CLI::Formatter {
  std::string make_expanded(const CLI::App* choice) const override {
    return make_groups(choice, CLI::AppFormatMode::Sub);
  }
};

}  // namespace

Option Option::required() const {
  option_->required();
  return *this;
}

Option Option::typeName(const char* name) const {
  option_->type_name(name);
  return *this;
}

Option Option::showDefault() const {
  option_->capture_default_str();
  return *this;
}

Option Option::oneOf(const std::vector<std::string>& values) const {
  // The description in braces is what modelOf() reads.
  std::string choices;
  for (const std::string& value : values)
    choices += (choices.empty() ? "" : ",") + value;
  option_->check(CLI::Validator(
      [values](const std::string& text) {
        const bool isOne = std::ranges::find(values, text) != values.end();
        return isOne ? std::string() : format("not %s: %s", listed(values, "or"), text);
      },
      "{" + choices + "}"));
  return *this;
}

Option Option::check(std::function<std::string(const std::string& text)> fault) const {
  option_->check(std::move(fault));
  return *this;
}

Option Option::notEmpty() const {
  return check([](const std::string& text) { return text.empty() ? "must not be empty" : ""; });
}

Option Option::excludes(const Option& other) const {
  option_->excludes(other.option_);
  return *this;
}

Command Command::addCommand(const char* name, const char* description) const {
  return Command(*app_->add_subcommand(name, description));
}

Command Command::addGroup(const char* name, const char* description) const {
  CLI::App* const group = app_->add_subcommand(name, description);
  group->require_subcommand(1);
  return Command(*group);
}

Command Command::addChoice(const char* heading) const {
  CLI::App* const choice = app_->add_option_group(heading);
  choice->require_option(0, 1);
  app_->formatter(std::make_shared<ChoiceFormatter>());
  return Command(*choice);
}

template <class Target>
Option Command::addOption(const char* names, Target& target, const char* description) const {
  CLI::Option* const option = app_->add_option(names, target, description);
  constexpr bool isInteger =
      std::is_same_v<Target, std::uint32_t> || std::is_same_v<Target, std::optional<std::uint32_t>>;
  if constexpr (isInteger) {
    option->transform(withoutLeadingZeros);
    option->check([](const std::string& text) {
      const bool isNumber = text.empty() || parseNumber<std::uint32_t>(text);
      return isNumber ? std::string()
                      : "give a number up to 4294967295, in decimal digits, not " + text;
    });
  }
  if (names[0] != '-') return Option(*option);
  // Each use of the option takes one value; whatever follows is an argument.
  option->allow_extra_args(false);
  return Option(*option).notEmpty();
}
template Option Command::addOption(const char*, std::string&, const char*) const;
template Option Command::addOption(const char*, double&, const char*) const;
template Option Command::addOption(const char*, std::uint32_t&, const char*) const;
template Option Command::addOption(const char*, std::optional<std::uint32_t>&, const char*) const;
template Option Command::addOption(const char*, std::vector<std::string>&, const char*) const;

Option Command::addFlag(const char* names, bool& target, const char* description) const {
  return Option(*app_->add_flag(names, target, description));
}

Option Command::addFlag(const char* names, std::function<void()> onGiven,
                        const char* description) const {
  CLI::Option* const flag = app_->add_flag_callback(names, std::move(onGiven), description);
  const bool isOfChoice = app_->get_name().empty();
  if (isOfChoice) flag->group(app_->get_group() + ", at most one");
  return Option(*flag);
}

void Command::setFooter(std::string text) const {
  app_->footer(std::move(text));
}

void Command::hide() const {
  app_->group("");
}

void Command::onRun(std::function<void()> action) const {
  app_->callback(std::move(action));
}

}  // namespace tavrel
