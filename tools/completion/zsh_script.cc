#include <algorithm>

#include "tools/completion/completion_script.h"

namespace tavrel {
namespace {

constexpr std::string_view kBegin = R"zsh(#compdef tavrelctl
# zsh completion for tavrelctl. Generated: do not edit.

_tavrelctl_list() {
  local -a found
  found=(${(f)"$(_call_program values tavrelctl completion $1 2>/dev/null)"})
  compadd -a found
}

)zsh";

std::string functionName(const CommandModel& command) {
  std::string name = command.path.empty() ? "_tavrelctl" : "_tavrelctl " + command.path;
  std::replace(name.begin(), name.end(), ' ', '_');
  return name;
}

// A text within an argument of _arguments or _describe.
std::string plain(std::string_view text) {
  std::string result;
  for (const char character : text) {
    if (character == ':' || character == '[' || character == ']' || character == '\\')
      result += '\\';
    result += character;
  }
  return result;
}

std::string valueText(const CommandModel& command, const OptionModel& option) {
  std::string text = ":" + plain(option.value) + ":";
  if (!option.choices.empty()) return text + "(" + joined(option.choices) + ")";
  const std::string_view kind = valueKind(command, option);
  if (kind == "none") return text;
  if (kind == "files") return text + "_files";
  if (kind == "folders") return text + "_files -/";
  return text + "{_tavrelctl_list " + std::string(kind) + "}";
}

std::string argumentOf(const CommandModel& command, const OptionModel& option,
                       const std::string& name) {
  std::string text = "(" + joined(option.names);
  for (const std::string& other : option.excludes)
    text += ' ' + other;
  // "=" allows --name=VALUE beside --name VALUE.
  const bool allowsBoth = !option.isFlag() && name.starts_with("--");
  text += ")" + name + (allowsBoth ? "=" : "") + "[" + plain(option.description) + "]";
  return shellQuoted(option.isFlag() ? text : text + valueText(command, option));
}

void addArguments(const CommandModel& command, std::string& script) {
  for (const OptionModel& option : command.options) {
    for (const std::string& name : option.names)
      script += " \\\n    " + argumentOf(command, option, name);
  }
}

void addGroup(const CommandModel& command, std::string& script) {
  script += "  local context state line\n  local -a commands=(\n";
  for (const CommandModel& below : command.commands)
    script += "    " + shellQuoted(below.name + ":" + plain(below.description)) + '\n';
  script += "  )\n  _arguments -C $root";
  addArguments(command, script);
  script += " \\\n    '1:command:->command' '*::argument:->argument'\n  case $state in\n";
  script += "    command) _describe -t commands command commands ;;\n";
  script += "    argument)\n      case $words[1] in\n";
  for (const CommandModel& below : command.commands)
    script += "        " + below.name + ") " + functionName(below) + " ;;\n";
  script += "      esac ;;\n  esac\n";
}

void addFunction(const CommandModel& command, std::string& script) {
  for (const CommandModel& below : command.commands)
    addFunction(below, script);
  script += functionName(command) + "() {\n";
  script +=
      "  local -a root=('--root=[Folder of the device]:DIR:_files -/' '--help[Show how it is "
      "used]')\n";
  if (!command.commands.empty()) {
    addGroup(command, script);
  } else {
    script += "  _arguments $root";
    addArguments(command, script);
    for (const OptionModel& argument : command.arguments) {
      const std::string text = valueText(command, argument);
      script += " \\\n    " + shellQuoted((argument.mayRepeat ? "*" : "") + text);
    }
    script += '\n';
  }
  script += "}\n\n";
}

}  // namespace

std::string zshScript(const CommandModel& program) {
  std::string script(kBegin);
  CommandModel model = program;
  // Each function offers --root itself.
  std::erase_if(model.options, [](const OptionModel& option) { return option.name() == "--root"; });
  addFunction(model, script);
  return script + "_tavrelctl \"$@\"\n";
}

}  // namespace tavrel
