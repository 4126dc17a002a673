#include "fleet/commands/completion_command.h"

#include <algorithm>
#include <memory>
#include <optional>
#include <ostream>
#include <string>

#include "fleet/commands/question.h"
#include "tools/completion/scripts/completion_script.h"
#include "tools/completion/scripts/man_page.h"

namespace tavrel::fleet {
namespace {

/// The names go to shells, so only those that need no quoting are printed.
bool isPlain(std::string_view word) {
  return !word.empty() && word.front() != '-' && std::ranges::all_of(word, [](char character) {
    return (character >= 'a' && character <= 'z') || (character >= 'A' && character <= 'Z') ||
           (character >= '0' && character <= '9') ||
           std::string_view("._-+/@%,").find(character) != std::string_view::npos;
  });
}

/// The first word of the version that no other version contains.
std::optional<std::string> wordFor(const Question& question, const std::string& version) {
  std::string_view rest = version;
  while (!rest.empty()) {
    const std::string word(rest.substr(0, rest.find(' ')));
    rest.remove_prefix(std::min(rest.size(), word.size() + 1));
    try {
      if (isPlain(word) && question.readVersion(word) == version) return word;
    } catch (const std::runtime_error&) {
      // Other versions contain it, too.
    }
  }
  return std::nullopt;
}

void listVersions(FleetContext& context) {
  Question question(context, {});
  for (const std::string& version : question.versions()) {
    if (const auto word = wordFor(question, version)) context.out() << *word << '\n';
  }
}

CompletedProgram completedProgram(const Command& program) {
  return {.model = modelOf(program),
          .anywhere = "--database",
          .lists = {{"OLD", "versions"}, {"NEW", "versions"}, {"DAYS|VERSION", "versions"}}};
}

}  // namespace

void addCompletionCommand(Command top, FleetContext& context) {
  struct Arguments {
    std::string what;
    std::string file;
  };
  const auto arguments = std::make_shared<Arguments>();
  const Command command =
      top.addCommand("completion", "Print what shells complete, or the manual page");
  command.hide();
  command.addOption("WHAT", arguments->what, "A shell, a list, or man")
      .required()
      .oneOf({"bash", "zsh", "fish", "man", "versions"});
  command.addOption("FILE", arguments->file, "Template of the manual page");
  command.onRun([&context, arguments, top] {
    const std::string& what = arguments->what;
    if (what == "versions") return listVersions(context);
    if (what == "man" && arguments->file.empty()) {
      return context.failUsage("completion man needs FILE, the template of the page");
    }
    if (what == "man") return printManPage(context, arguments->file, modelOf(top));
    const CompletedProgram program = completedProgram(top);
    context.out() << (what == "bash"  ? bashScript(program)
                      : what == "zsh" ? zshScript(program)
                                      : fishScript(program));
  });
}

}  // namespace tavrel::fleet
