#include "tools/completion/completion_script.h"

namespace tavrel {
namespace {

constexpr std::string_view kBegin = R"(# bash completion for tavrelctl. Generated: do not edit.

)";

// Names from the device are compared and never expanded: whoever records chooses them.
constexpr std::string_view kEnd = R"(
_tavrelctl_complete() {
  local kind=$1 value
  case $kind in
    none) ;;
    files) compopt -o filenames 2>/dev/null; mapfile -t COMPREPLY < <(compgen -f -- "$cur") ;;
    folders) compopt -o filenames 2>/dev/null; mapfile -t COMPREPLY < <(compgen -d -- "$cur") ;;
    words:*) mapfile -t COMPREPLY < <(compgen -W "${kind#words:}" -- "$cur") ;;
    *)
      while IFS= read -r value; do
        [[ $value == "$cur"* ]] && COMPREPLY+=("$value")
      done < <(tavrelctl "${root[@]}" completion "$kind" 2>/dev/null)
      [[ $kind == logs && $cur == */* ]] && mapfile -t COMPREPLY < <(compgen -f -- "$cur")
      ;;
  esac
}

_tavrelctl() {
  # Of --option=value, bash makes three words.
  local cur=${COMP_WORDS[COMP_CWORD]#=} path='' given=0 wanted='' word i
  local -a root=() commands options arguments
  local -A values
  local repeats=0
  COMPREPLY=()
  _tavrelctl_of ''
  for ((i = 1; i < COMP_CWORD; i++)); do
    word=${COMP_WORDS[i]}
    [[ $word == = ]] && continue
    if [[ -n $wanted ]]; then
      [[ $wanted == --root ]] && root=(--root "$word")
      wanted=''
    elif [[ $word == --root || ( $word == -* && -n ${values[$word]} ) ]]; then
      wanted=$word
    elif [[ $word != -* && " ${commands[*]} " == *" $word "* ]]; then
      path+=${path:+ }$word
      _tavrelctl_of "$path"
    elif [[ $word != -* ]]; then
      ((given++))
    fi
  done
  if [[ $wanted == --root ]]; then
    _tavrelctl_complete folders
  elif [[ -n $wanted ]]; then
    _tavrelctl_complete "${values[$wanted]}"
  elif [[ $cur == -* ]]; then
    mapfile -t COMPREPLY < <(compgen -W "${options[*]} --root --help" -- "$cur")
  elif ((${#commands[@]})); then
    mapfile -t COMPREPLY < <(compgen -W "${commands[*]}" -- "$cur")
  elif ((${#arguments[@]})); then
    # The last argument may be the one that repeats.
    ((given < ${#arguments[@]})) || { ((repeats)) && given=$((${#arguments[@]} - 1)); }
    ((given < ${#arguments[@]})) && _tavrelctl_complete "${arguments[given]}"
  fi
}

complete -F _tavrelctl tavrelctl
)";

std::string kindOf(const CommandModel& command, const OptionModel& option) {
  if (!option.choices.empty()) return shellQuoted("words:" + joined(option.choices));
  return std::string(valueKind(command, option));
}

void addCase(const CommandModel& command, std::string& script) {
  std::vector<std::string> commands, options, values, arguments;
  for (const CommandModel& below : command.commands)
    commands.push_back(below.name);
  bool repeats = false;
  for (const OptionModel& option : command.options) {
    for (const std::string& name : option.names) {
      options.push_back(name);
      if (!option.isFlag()) values.push_back("[" + name + "]=" + kindOf(command, option));
    }
  }
  for (const OptionModel& argument : command.arguments) {
    arguments.push_back(kindOf(command, argument));
    repeats = argument.mayRepeat;
  }
  script += "    " + shellQuoted(command.path) + ")\n";
  script += "      commands=(" + joined(commands) + ") options=(" + joined(options) + ")\n";
  script += "      values=(" + joined(values) + ") arguments=(" + joined(arguments) +
            ") repeats=" + (repeats ? "1" : "0") + " ;;\n";
}

}  // namespace

std::string bashScript(const CommandModel& program) {
  std::string script(kBegin);
  script += "_tavrelctl_of() {\n  case $1 in\n";
  walk(program, [&](const CommandModel& command) { addCase(command, script); });
  script += "  esac\n}\n";
  script += kEnd;
  return script;
}

}  // namespace tavrel
