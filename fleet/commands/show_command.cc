#include "fleet/commands/show_command.h"

#include <algorithm>
#include <nlohmann/json.hpp>

#include "fleet/commands/question.h"
#include "fleet/commands/show_output.h"
#include "fleet/questions/summary.h"
#include "tools/console/table.h"

namespace tavrel::fleet {
namespace {

struct ShowOptions : QuestionOptions {
  std::string key;
  std::string by = "none";
  std::string against;  // empty when not given
  bool buckets = false;
};

GroupBy groupBy(const std::string& name) {
  return name == "os"       ? GroupBy::Os
         : name == "region" ? GroupBy::Region
         : name == "day"    ? GroupBy::Day
         : name == "digest" ? GroupBy::Digest
                            : GroupBy::None;
}

/// Tries a whole version first, then a range of days, then a part of a version.
void readAgainst(Question& question, const std::string& text, ShowRequest& request) {
  if (std::ranges::find(question.versions(), text) == question.versions().end()) {
    try {
      request.againstDays = question.readDays(text);
      if (!request.againstDays || question.lacksDays())
        throw std::runtime_error(tooFewText(question.ledger().devicesAtLeast()));
    } catch (const UsageError&) {
      // Then it must be part of a version.
    }
  }
  if (!request.againstDays) {
    request.againstVersion = question.readVersion(text);
  } else if (request.againstDays->overlaps(request.days)) {
    const bool isNumber = text.find_first_not_of("0123456789") == std::string::npos;
    throw UsageError("--against: " + textOf(*request.againstDays) + " and " + textOf(request.days) +
                     " overlap: choose separate days with --days" +
                     (isNumber ? "; for a version, write more of its name" : ""));
  }
}

std::vector<ShowAnswer> answers(Question& question, const ShowOptions& options) {
  ShowRequest request;
  request.key = options.key;
  request.by = groupBy(options.by);
  request.days = question.days();
  if (!options.against.empty()) readAgainst(question, options.against, request);
  std::vector<ShowAnswer> result;
  for (const Key& key : question.engine().keys()) {
    if (key.name != options.key || key.kind == KeyKind::Histogram) continue;
    request.kind = key.kind;
    ShowAnswer answer = show(question.engine(), question.ledger(), request);
    // Not even whether a few devices have the statistic.
    if (std::ranges::any_of(answer.sides, &ShowSide::isShown) ||
        hasEnough(question.engine(), question.ledger(), logsOn(question.table(), {}), key)) {
      result.push_back(std::move(answer));
    }
  }
  if (result.empty()) {
    throw std::runtime_error("statistic \"" + printable(options.key) + "\" " +
                             inFewLogsText(question.ledger().devicesAtLeast()) +
                             ": tavrel-fleet summary --keys lists the statistics");
  }
  return result;
}

}  // namespace

void addShowCommand(Command top, FleetContext& context) {
  const Command command = top.addCommand("show", "Show how one statistic is distributed");
  auto options = std::make_shared<ShowOptions>();
  command.addOption("KEY", options->key, "The statistic").typeName("").required().notEmpty();
  command.addOption("--by", options->by, "Divide the devices")
      .typeName("WHAT")
      .oneOf({"none", "os", "region", "day", "digest"})
      .showDefault();
  command
      .addOption("--against", options->against,
                 "Show other days, or the logs of one OS version, beside the rest")
      .typeName("DAYS|VERSION");
  addQuestionOptions(command, *options);
  const Option json = addFormOptions(command, context, *options);
  command
      .addFlag("--buckets", options->buckets,
               "Print the histograms of all parts instead of their figures")
      .excludes(json);
  command.onRun([&context, options] {
    ask(context, *options, [&](Question& question) {
      const std::vector<ShowAnswer> shown = answers(question, *options);
      if (options->csv) {
        return options->buckets ? printBucketsCsv(context.out(), shown)
                                : printShownCsv(context.out(), shown);
      }
      if (context.json()) {
        Json list = Json::array();
        for (const ShowAnswer& answer : shown)
          list.push_back(shownJson(answer));
        return context.printJson({{"devices_at_least", question.ledger().devicesAtLeast()},
                                  {"days", daysJson(question.days())},
                                  {"answers", std::move(list)}});
      }
      for (const ShowAnswer& answer : shown) {
        if (&answer != &shown.front()) context.out() << "\n";
        printShown(context, answer, options->buckets);
      }
    });
  });
}

}  // namespace tavrel::fleet
