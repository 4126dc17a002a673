#include "tools/completion/scripts/man_page.h"

#include <algorithm>
#include <ostream>
#include <set>

#include "base/limits.h"
#include "platform/linux/files/file_system.h"

namespace tavrel {
namespace {

// Escapes text for a page: hyphens stay hyphens, and no line becomes a request.
std::string roff(std::string_view text) {
  std::string result;
  if (text.starts_with('.') || text.starts_with('\'')) result += "\\&";
  for (const char character : text) {
    if (character == '\\') {
      result += "\\e";
    } else if (character == '-') {
      result += "\\-";
    } else {
      result += character;
    }
  }
  return result;
}

std::string strong(std::string_view text) {
  return "\\fB" + roff(text) + "\\fR";
}

std::string valueText(const OptionModel& option) {
  std::string text;
  for (const std::string& choice : option.choices)
    text += (text.empty() ? "" : "|") + strong(choice);
  return text.empty() ? "\\fI" + roff(option.value) + "\\fR" : text;
}

std::string usageOf(const OptionModel& option) {
  if (option.names.empty()) return valueText(option) + (option.mayRepeat ? "..." : "");
  std::string text = strong(option.name());
  if (!option.isFlag()) text += ' ' + valueText(option);
  return text;
}

bool excludes(const OptionModel& option, const OptionModel& other) {
  return std::ranges::find(option.excludes, other.name()) != option.excludes.end();
}

// Options that all exclude each other share one pair of brackets.
std::string usageOf(const CommandModel& command) {
  std::string line = strong(command.path);
  std::set<std::string> written;
  for (const OptionModel& option : command.options) {
    if (!written.insert(option.name()).second) continue;
    std::string text = usageOf(option);
    std::vector<const OptionModel*> together{&option};
    for (const OptionModel& other : command.options) {
      const bool excludesAll = std::ranges::all_of(
          together, [&other](const OptionModel* one) { return excludes(*one, other); });
      if (!excludesAll || !written.insert(other.name()).second) continue;
      text += " | " + usageOf(other);
      together.push_back(&other);
    }
    line += option.isRequired ? ' ' + text : " [" + text + "]";
  }
  for (const OptionModel& argument : command.arguments) {
    const std::string text = usageOf(argument);
    line += argument.isRequired ? ' ' + text : " [" + text + "]";
  }
  return line;
}

std::string entryOf(const OptionModel& option) {
  std::string names;
  for (const std::string& name : option.names)
    names += (names.empty() ? "" : ", ") + strong(name);
  if (!option.isFlag()) names += ' ' + valueText(option);
  return ".TP\n" + names + "\n" + roff(option.description) + ".\n";
}

class ManPage {
 public:
  explicit ManPage(const CommandModel& program) {
    walk(program, [this](const CommandModel& command) {
      if (command.commands.empty()) commands_.emplace_back(&command);
    });
  }

  Status take(std::string_view line) {
    constexpr std::string_view kCommand = "@command ";
    constexpr std::string_view kOthers = "@others ";
    if (line.starts_with(kCommand)) return begin(line.substr(kCommand.size()));
    hasProse_ = true;
    if (line.starts_with(kOthers)) {
      addOthers(line.substr(kOthers.size()));
    } else {
      if (line.starts_with(".SS") || line.starts_with(".SH")) addOptions();
      text_ += line;
      text_ += '\n';
    }
    return Done{};
  }

  std::string end() {
    addOptions();
    return std::move(text_);
  }

 private:
  Status begin(std::string_view path) {
    const auto found = std::ranges::find_if(
        commands_, [&](const CommandModel* command) { return command->path == path; });
    if (found == commands_.end()) {
      return Error{"there is no command '" + std::string(path) + "': correct the template"};
    }
    add(**found);
    return Done{};
  }

  void add(const CommandModel& command) {
    if (hasProse_) addOptions();
    text_ += open_.empty() ? ".TP\n" : ".TQ\n";
    text_ += usageOf(command) + '\n';
    open_.push_back(&command);
    named_.insert(command.path);
    hasProse_ = false;
  }

  // Adds each option of the commands that share the prose, once.
  void addOptions() {
    std::set<std::string> written{"--json"};
    std::string entries;
    for (const CommandModel* const command : open_) {
      for (const OptionModel& option : command->options)
        if (written.insert(option.name()).second) entries += entryOf(option);
    }
    if (!entries.empty()) text_ += ".RS\n" + entries + ".RE\n";
    open_.clear();
  }

  void addOthers(std::string_view title) {
    addOptions();
    bool hasTitle = false;
    for (const CommandModel* const command : commands_) {
      if (named_.contains(command->path)) continue;
      if (!hasTitle) text_ += ".SS " + std::string(title) + '\n';
      hasTitle = true;
      add(*command);
      text_ += roff(command->description) + ".\n";
      hasProse_ = true;
    }
    addOptions();
  }

  std::vector<const CommandModel*> commands_;  // without groups
  std::set<std::string> named_;
  std::vector<const CommandModel*> open_;  // their options are still to come
  bool hasProse_ = false;                  // since the latest of them
  std::string text_;
};

}  // namespace

Expected<std::string> manPage(std::string_view pageTemplate, const CommandModel& program) {
  ManPage page(program);
  while (!pageTemplate.empty()) {
    const std::size_t end = std::min(pageTemplate.find('\n'), pageTemplate.size());
    if (const Status taken = page.take(pageTemplate.substr(0, end)); !taken) return taken.error();
    pageTemplate.remove_prefix(std::min(end + 1, pageTemplate.size()));
  }
  return page.end();
}

void printManPage(ToolOutput& output, const std::string& file, const CommandModel& program) {
  FileSystem files;
  const auto pageTemplate = files.read(file, limits::kPropertyListBytes);
  if (!pageTemplate) return output.fail(pageTemplate.error().message);
  const auto page = manPage(*pageTemplate, program);
  if (!page) return output.fail(file + ": " + page.error().message);
  output.out() << *page;
}

}  // namespace tavrel
