#include "fleet/commands/completion_command.h"

#include <algorithm>
#include <optional>
#include <ostream>
#include <string>

#include "fleet/commands/question.h"
#include "tools/completion/scripts/completion.h"

namespace tavrel::fleet {
namespace {

/// The first word of the version that no other version contains.
std::optional<std::string> wordFor(const Question& question, const std::string& version) {
  std::string_view rest = version;
  while (!rest.empty()) {
    const std::string word(rest.substr(0, rest.find(' ')));
    rest.remove_prefix(std::min(rest.size(), word.size() + 1));
    try {
      if (isPlainWord(word) && question.readVersion(word) == version) return word;
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
  addCompletion(top, context, completedProgram,
                {{"versions", [&context] { listVersions(context); }}});
}

}  // namespace tavrel::fleet
