#include "tools/completion/scripts/completion_script.h"

namespace tavrel {
namespace {

constexpr std::string_view kBegin = R"(# bash completion for @program@. Generated: do not edit.

)";

// Names from the device are compared but never expanded: anybody who records values chooses them.
constexpr std::string_view kEnd = R"(
_@id@_complete() {
  local kind=$1 value
  case $kind in
    none) ;;
    files) compopt -o filenames 2>/dev/null; mapfile -t COMPREPLY < <(compgen -f -- "$cur") ;;
    folders) compopt -o filenames 2>/dev/null; mapfile -t COMPREPLY < <(compgen -d -- "$cur") ;;
    words:*) mapfile -t COMPREPLY < <(compgen -W "${kind#words:}" -- "$cur") ;;
    *)
      while IFS= read -r value; do
        [[ $value == "$cur"* ]] && COMPREPLY+=("$value")
      done < <(@program@ "${anywhere[@]}" completion "$kind" 2>/dev/null)
      [[ $kind == logs && $cur == */* ]] && mapfile -t COMPREPLY < <(compgen -f -- "$cur")
      ;;
  esac
}

# Sets `words` to those of the line up to the cursor. Bash takes them apart at colons and equals
# signs, which addresses of databases have in them.
_@id@_words() {
  local line=$COMP_LINE word gap i
  words=()
  for ((i = 0; i <= COMP_CWORD; i++)); do
    word=${COMP_WORDS[i]} gap=${line%%[![:blank:]]*}
    line=${line#"$gap"}
    line=${line#"$word"}
    if ((i > 0)) && [[ -z $gap && ( $word == [:=]* || ${words[-1]} == *[:=] ) ]]; then
      words[-1]+=$word
    else
      words+=("$word")
    fi
  done
}

_@id@() {
  local piece=${COMP_WORDS[COMP_CWORD]} cur path='' given=0 wanted='' word
  local -a words anywhere=() commands options arguments
  local -A values
  local repeats=0
  COMPREPLY=()
  _@id@_of ''
  _@id@_words
  cur=${words[-1]}
  for word in "${words[@]:1:${#words[@]}-2}"; do
    if [[ -z $wanted && $word == --*=* ]]; then
      wanted=${word%%=*} word=${word#*=}
    fi
    if [[ -n $wanted ]]; then
      # The program gets what the shell would give it.
      [[ $wanted == @anywhere@ ]] && anywhere=(@anywhere@ "${word//[\'\"\\]/}")
      wanted=''
    elif [[ $word == @anywhere@ || ( $word == -* && -n ${values[$word]} ) ]]; then
      wanted=$word
    elif [[ $word != -* && " ${commands[*]} " == *" $word "* ]]; then
      path+=${path:+ }$word
      _@id@_of "$path"
    elif [[ $word != -* ]]; then
      ((given++))
    fi
  done
  if [[ -z $wanted && $cur == --*=* ]]; then
    wanted=${cur%%=*} cur=${cur#*=}
  fi
  if [[ $wanted == @anywhere@ ]]; then
    _@id@_complete @kind@
  elif [[ -n $wanted ]]; then
    _@id@_complete "${values[$wanted]:-none}"
  elif [[ $cur == -* ]]; then
    mapfile -t COMPREPLY < <(compgen -W "${options[*]} @anywhere@ --help" -- "$cur")
  elif ((${#commands[@]})); then
    mapfile -t COMPREPLY < <(compgen -W "${commands[*]}" -- "$cur")
  elif ((${#arguments[@]})); then
    # The last argument may be the one that repeats.
    ((given < ${#arguments[@]})) || { ((repeats)) && given=$((${#arguments[@]} - 1)); }
    ((given < ${#arguments[@]})) && _@id@_complete "${arguments[given]}"
  fi
  # Bash replaces only the last piece of the word.
  [[ $piece == *[!:=]* ]] || piece=''
  COMPREPLY=("${COMPREPLY[@]#"${cur%"$piece"}"}")
}

complete -F _@id@ @program@
)";

std::string kindOf(const CompletedProgram& program, const CommandModel& command,
                   const OptionModel& option) {
  if (!option.choices.empty()) return shellQuoted("words:" + joined(option.choices));
  return std::string(program.valueKind(command, option));
}

void addCase(const CompletedProgram& program, const CommandModel& command, std::string& script) {
  std::vector<std::string> commands, options, values, arguments;
  for (const CommandModel& below : command.commands)
    commands.push_back(below.name);
  bool repeats = false;
  for (const OptionModel& option : command.options) {
    for (const std::string& name : option.names) {
      options.push_back(name);
      if (!option.isFlag()) values.push_back("[" + name + "]=" + kindOf(program, command, option));
    }
  }
  for (const OptionModel& argument : command.arguments) {
    arguments.push_back(kindOf(program, command, argument));
    repeats = argument.mayRepeat;
  }
  script += "    " + shellQuoted(command.path) + ")\n";
  script += "      commands=(" + joined(commands) + ") options=(" + joined(options) + ")\n";
  script += "      values=(" + joined(values) + ") arguments=(" + joined(arguments) +
            ") repeats=" + (repeats ? "1" : "0") + " ;;\n";
}

}  // namespace

std::string bashScript(const CompletedProgram& program) {
  std::string script(kBegin);
  script += "_@id@_of() {\n  case $1 in\n";
  walk(program.model, [&](const CommandModel& command) { addCase(program, command, script); });
  script += "  esac\n}\n";
  script += kEnd;
  script.replace(script.find("@kind@"), 6, program.valueKind({}, program.anywhereOption()));
  return filledIn(script, program);
}

}  // namespace tavrel
