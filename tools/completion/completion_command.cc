#include "tools/completion/completion_command.h"

#include <algorithm>
#include <ostream>
#include <set>
#include <string>

#include "base/arithmetic.h"
#include "base/civil_time.h"
#include "catalogue/catalogue.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/logs/file_submission.h"
#include "platform/linux/preferences/file_preferences.h"
#include "tools/completion/scripts/completion.h"
#include "tools/stat/recorded.h"

namespace tavrel {
namespace {

void printWord(ToolContext& context, std::string_view word) {
  if (isPlainWord(word)) context.out() << word << '\n';
}

// Lists the keys of yesterday and today only: a walk over all days would take too long.
void listKeys(ToolContext& context) {
  const std::int32_t today = context.platform().statistics->BHDaysSince1970();
  auto history = openRecorded(
      context, {.key = "", .firstDay = previousDay(today), .lastDay = today, .hasValues = false});
  if (!history) return context.fail(history.error().message);
  std::set<std::string> keys;
  Status read = history->walkScalars(
      [&](std::string_view key, std::int32_t, std::int64_t, bool&) { keys.emplace(key); });
  if (read) {
    read = history->walkDistributions([&](std::string_view key, std::int32_t, std::int64_t,
                                          BHHistoryDistributionEnumerator&,
                                          bool&) { keys.emplace(key); });
  }
  for (const std::string& key : keys)
    printWord(context, key);
  if (!read) context.fail(read.error().message);
}

void listDays(ToolContext& context) {
  constexpr std::int64_t kShown = 31;
  context.out() << "today\nyesterday\n";
  const auto history = context.storeForReading().openHistory();
  const auto held = history ? (*history)->daysHeld() : history.error();
  if (!held || !*held) return;
  for (std::int64_t day = std::max<std::int64_t>((*held)->last - kShown + 1, (*held)->first);
       day <= (*held)->last; ++day) {
    printWord(context, dateText(civilFromDays(day)));
  }
}

void listCatalogue(ToolContext& context) {
  for (const auto kind :
       {catalogue::Kind::Statistic, catalogue::Kind::Channel, catalogue::Kind::Controller}) {
    for (const catalogue::Entry& entry : catalogue::entries(kind)) {
      if (entry.key.find_first_of("<*") == std::string_view::npos) printWord(context, entry.key);
    }
  }
}

void listDomains(ToolContext& context) {
  const auto domains = context.preferences().domains();
  if (!domains) return context.fail(domains.error().message);
  for (const std::string& domain : *domains)
    printWord(context, domain);
}

void listLogs(ToolContext& context) {
  context.out() << "latest\n";
  using enum FileSubmission::Place;
  for (const auto place : {Pending, Outbox, Refused}) {
    const auto logs = context.linuxPlatform().submission().files(place);
    if (!logs) return context.fail(logs.error().message);
    for (const FileSubmission::FiledLog& log : *logs)
      printWord(context, log.name);
  }
}

CompletedProgram completedProgram(const Command& program) {
  return {.model = modelOf(program),
          .anywhere = "--root",
          .lists = {{"DAY", "days"}, {"KEY", "keys"}, {"PREFIX", "keys"}, {"DOMAIN", "domains"}},
          // Keys of preferences are not keys of statistics.
          .exceptions = {{"prefs", "KEY", "none"},
                         {"catalogue", "KEY", "catalogue"},
                         {"log show", "FILE", "logs"},
                         {"whitelist diff", "OLD", "files"},
                         {"whitelist diff", "NEW", "files"}}};
}

}  // namespace

void addCompletionCommand(Command program, ToolContext& context) {
  addCompletion(program, context, completedProgram,
                {{"keys", [&context] { listKeys(context); }},
                 {"days", [&context] { listDays(context); }},
                 {"catalogue", [&context] { listCatalogue(context); }},
                 {"domains", [&context] { listDomains(context); }},
                 {"logs", [&context] { listLogs(context); }}});
}

}  // namespace tavrel
