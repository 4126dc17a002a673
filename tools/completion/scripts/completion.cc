#include "tools/completion/scripts/completion.h"

#include <algorithm>
#include <memory>
#include <ostream>

#include "base/ascii.h"
#include "tools/completion/scripts/man_page.h"

namespace tavrel {

bool isPlainWord(std::string_view word) {
  return !word.empty() && word.front() != '-' && std::ranges::all_of(word, [](char character) {
    return isLetterOrDigit(character) ||
           std::string_view("._-+/@%,").find(character) != std::string_view::npos;
  });
}

void addCompletion(Command program, ToolOutput& output,
                   CompletedProgram (*describe)(const Command& program), CompletionLists lists) {
  struct Arguments {
    std::string what;
    std::string file;
  };
  const auto arguments = std::make_shared<Arguments>();
  std::vector<std::string> choices = {"bash", "zsh", "fish", "man"};
  for (const auto& [name, print] : lists)
    choices.push_back(name);
  const Command command =
      program.addCommand("completion", "Print what shells complete, or the manual page");
  command.hide();
  command.addOption("WHAT", arguments->what, "A shell, a list, or man").required().oneOf(choices);
  command.addOption("FILE", arguments->file, "Template of the manual page");
  command.onRun([=, &output, lists = std::move(lists)] {
    const std::string& what = arguments->what;
    for (const auto& [name, print] : lists)
      if (what == name) return print();
    if (what == "man" && arguments->file.empty()) {
      return output.failUsage("completion man needs FILE, the template of the page");
    }
    if (what == "man") return printManPage(output, arguments->file, modelOf(program));
    const CompletedProgram completed = describe(program);
    output.out() << (what == "bash"  ? bashScript(completed)
                     : what == "zsh" ? zshScript(completed)
                                     : fishScript(completed));
  });
}

}  // namespace tavrel
