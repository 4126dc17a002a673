#include <set>

#include "tools/completion/scripts/completion_script.h"

namespace tavrel {
namespace {

constexpr std::string_view kQuoteEscape = "\\'";

constexpr std::string_view kBegin = R"(# fish completion for @program@. Generated: do not edit.

# The command that the line names so far, and the arguments after it.
function __@id@_words
    set -l words (commandline -opc)
    set -l path
    set -l skips 0
    for word in $words[2..-1]
        if test $skips = 1
            set skips 0
        else if contains -- $word $__@id@_valued
            set skips 1
        else if not string match -q -- '-*' $word
            set -a path $word
        end
    end
    string join -- ' ' $path
end

function __@id@_at
    set -l words (__@id@_words)
    test "$words" = "$argv[1]"; or string match -q -- "$argv[1] *" "$words"
end

function __@id@_before
    set -l words (__@id@_words)
    test "$words" = "$argv[1]"
end

# What there is depends on @anywhere@.
function __@id@_list
    set -l anywhere
    set -l last
    for word in (commandline -opc)
        if test "$last" = @anywhere@
            set anywhere @anywhere@ $word
        else if string match -q -- '@anywhere@=*' $word
            set anywhere $word
        end
        set last $word
    end
    @program@ $anywhere completion $argv[1] 2>/dev/null
end

)";

std::string fishQuoted(std::string_view text) {
  std::string doubled;
  for (const char character : text) {
    if (character == '\\') doubled += '\\';
    doubled += character;
  }
  return shellQuoted(doubled, kQuoteEscape);
}

// The options of fish's `complete` that describe a value; they follow the names of the option.
std::string valueText(const CompletedProgram& program, const CommandModel& command,
                      const OptionModel& option) {
  const std::string only = option.names.empty() ? "" : " -x";
  if (!option.choices.empty()) return only + " -a " + fishQuoted(joined(option.choices));
  const std::string_view kind = program.valueKind(command, option);
  if (kind == "none") return only;
  if (kind == "files") return option.names.empty() ? " -F" : " -r -F";
  if (kind == "folders") return only + " -a '(__fish_complete_directories)'";
  return only + " -a " + fishQuoted("(__@id@_list " + std::string(kind) + ")");
}

void addCommand(const CompletedProgram& program, const CommandModel& command, std::string& script) {
  const std::string at =
      "complete -c @program@ -n " + fishQuoted("__@id@_at " + fishQuoted(command.path));
  for (const CommandModel& below : command.commands) {
    script += "complete -c @program@ -n " +
              fishQuoted("__@id@_before " + fishQuoted(command.path)) + " -a " + below.name +
              " -d " + fishQuoted(below.description) + '\n';
  }
  for (const OptionModel& option : command.options) {
    script += command.path.empty() ? "complete -c @program@" : at;
    for (const std::string& name : option.names)
      script += name.starts_with("--") ? " -l " + name.substr(2) : " -s " + name.substr(1);
    if (!option.isFlag()) script += valueText(program, command, option);
    script += " -d " + fishQuoted(option.description) + '\n';
  }
  for (const OptionModel& argument : command.arguments) {
    if (const std::string values = valueText(program, command, argument); !values.empty())
      script += at + values + '\n';
  }
}

}  // namespace

std::string fishScript(const CompletedProgram& program) {
  std::set<std::string> valued;
  walk(program.model, [&](const CommandModel& command) {
    for (const OptionModel& option : command.options)
      if (!option.isFlag()) valued.insert(option.names.begin(), option.names.end());
  });
  std::string script(kBegin);
  script += "set -g __@id@_valued " + joined({valued.begin(), valued.end()}) + "\n\n";
  script += "complete -c @program@ -f\ncomplete -c @program@ -l help -d 'Show how it is used'\n";
  walk(program.model, [&](const CommandModel& command) { addCommand(program, command, script); });
  return filledIn(script, program);
}

}  // namespace tavrel
