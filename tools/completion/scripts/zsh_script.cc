#include <algorithm>

#include "tools/completion/scripts/completion_script.h"

namespace tavrel {
namespace {

constexpr std::string_view kBegin = R"zsh(#compdef @program@
# zsh completion for @program@. Generated: do not edit.

# What there is depends on @anywhere@.
_@id@_list() {
  local -a found anywhere
  local word last
  for word in "${(@Q)_@id@_line}"; do
    if [[ $last == @anywhere@ ]]; then
      anywhere=(@anywhere@ $word)
    elif [[ $word == @anywhere@=* ]]; then
      anywhere=($word)
    fi
    last=$word
  done
  found=(${(f)"$(_call_program values @program@ "${(@q)anywhere}" completion $1 2>/dev/null)"})
  compadd -a found
}

)zsh";

std::string functionName(const CommandModel& command) {
  std::string name = command.path.empty() ? "_@id@" : "_@id@ " + command.path;
  std::replace(name.begin(), name.end(), ' ', '_');
  return name;
}

// Escapes text within an argument of _arguments or _describe.
std::string plain(std::string_view text) {
  std::string result;
  for (const char character : text) {
    if (character == ':' || character == '[' || character == ']' || character == '\\')
      result += '\\';
    result += character;
  }
  return result;
}

std::string valueText(const CompletedProgram& program, const CommandModel& command,
                      const OptionModel& option) {
  std::string text = ":" + plain(option.value) + ":";
  if (!option.choices.empty()) return text + "(" + joined(option.choices) + ")";
  const std::string_view kind = program.valueKind(command, option);
  if (kind == "none") return text;
  if (kind == "files") return text + "_files";
  if (kind == "folders") return text + "_files -/";
  return text + "{_@id@_list " + std::string(kind) + "}";
}

std::string argumentOf(const CompletedProgram& program, const CommandModel& command,
                       const OptionModel& option, const std::string& name) {
  std::string text = "(" + joined(option.names);
  for (const std::string& other : option.excludes)
    text += ' ' + other;
  // "=" allows --name=VALUE as well as --name VALUE.
  const bool allowsBoth = !option.isFlag() && name.starts_with("--");
  text += ")" + name + (allowsBoth ? "=" : "") + "[" + plain(option.description) + "]";
  return shellQuoted(option.isFlag() ? text : text + valueText(program, command, option));
}

void addArguments(const CompletedProgram& program, const CommandModel& command,
                  std::string& script) {
  for (const OptionModel& option : command.options) {
    for (const std::string& name : option.names)
      script += " \\\n    " + argumentOf(program, command, option, name);
  }
}

void addGroup(const CompletedProgram& program, const CommandModel& command, std::string& script) {
  script += "  local context state line\n  local -a commands=(\n";
  for (const CommandModel& below : command.commands)
    script += "    " + shellQuoted(below.name + ":" + plain(below.description)) + '\n';
  script += "  )\n  _arguments -C $anywhere";
  addArguments(program, command, script);
  script += " \\\n    '1:command:->command' '*::argument:->argument'\n  case $state in\n";
  script += "    command) _describe -t commands command commands ;;\n";
  script += "    argument)\n      case $words[1] in\n";
  for (const CommandModel& below : command.commands)
    script += "        " + below.name + ") " + functionName(below) + " ;;\n";
  script += "      esac ;;\n  esac\n";
}

void addFunction(const CompletedProgram& program, const CommandModel& command,
                 std::string& script) {
  for (const CommandModel& below : command.commands)
    addFunction(program, below, script);
  script += functionName(command) + "() {\n";
  // In `words`, commands see only what follows their names.
  if (command.path.empty()) script += "  local -a _@id@_line=($words)\n";
  script += "  local -a anywhere=(" +
            argumentOf(program, {}, program.anywhereOption(), program.anywhere) +
            " '--help[Show how it is used]')\n";
  if (!command.commands.empty()) {
    addGroup(program, command, script);
  } else {
    script += "  _arguments $anywhere";
    addArguments(program, command, script);
    for (const OptionModel& argument : command.arguments) {
      const std::string text = valueText(program, command, argument);
      script += " \\\n    " + shellQuoted((argument.mayRepeat ? "*" : "") + text);
    }
    script += '\n';
  }
  script += "}\n\n";
}

}  // namespace

std::string zshScript(const CompletedProgram& program) {
  CommandModel model = program.model;
  // Each function adds this option itself.
  std::erase_if(model.options,
                [&](const OptionModel& option) { return option.name() == program.anywhere; });
  std::string script(kBegin);
  addFunction(program, model, script);
  return filledIn(script + "_@id@ \"$@\"\n", program);
}

}  // namespace tavrel
