#include "fleet/commands/summary_command.h"

#include <nlohmann/json.hpp>
#include <ostream>

#include "base/civil_time.h"
#include "catalogue/catalogue.h"
#include "fleet/commands/csv_writer.h"
#include "fleet/commands/question.h"
#include "fleet/questions/summary.h"
#include "tools/console/table.h"

namespace tavrel::fleet {
namespace {

struct SummaryOptions : QuestionOptions {
  bool keys = false;
};

struct PartTitle {
  GroupBy by;
  const char* name;   // in JSON and CSV
  const char* title;  // of the column
};
constexpr PartTitle kParts[] = {{GroupBy::Os, "os", "OS VERSION"},
                                {GroupBy::Region, "region", "REGION"},
                                {GroupBy::Digest, "digest", "WHITELIST"},
                                {GroupBy::Day, "day", "DAY"}};

const PartTitle& titleOf(GroupBy by) {
  for (const PartTitle& part : kParts) {
    if (part.by == by) return part;
  }
  return kParts[0];
}

std::string date(std::int32_t day) {
  return dateText(civilFromDays(day));
}

void printText(FleetContext& context, const SummaryAnswer& answer) {
  std::ostream& out = context.out();
  if (!answer.isShown) {
    out << "All logs: " << tooFewText(answer.devicesAtLeast) << "\n";
    return;
  }
  out << "Logs        " << answer.whole.logs << ", " << date(answer.whole.firstDay) << " to "
      << date(answer.whole.lastDay) << "\n"
      << "Devices     at least " << answer.whole.devices << "\n"
      << "Statistics  " << counted(answer.scalarKeys, "scalar") << ", "
      << counted(answer.distributionKeys, "distribution") << ", "
      << counted(answer.histogramKeys, "histogram") << "\n";
  for (const SummaryPart& part : answer.parts) {
    out << "\n";
    using Align = Table::Align;
    Table table({{titleOf(part.by).title, Align::Whole},
                 {"DEVICES", Align::Right},
                 {"LOGS", Align::Right, 1},
                 {"FIRST DAY", Align::Whole, 3},
                 {"LAST DAY", Align::Whole, 2}});
    for (const CountedGroup& group : part.groups) {
      table.add({group.name.text(), std::to_string(group.devices), std::to_string(group.logs),
                 date(group.firstDay), date(group.lastDay)});
    }
    if (!table.empty()) table.print(context.page());
    const std::string joined = joinedText(part.joined, !part.groups.empty(), answer.devicesAtLeast);
    if (table.empty()) out << titleOf(part.by).title << "\n";
    if (!joined.empty()) out << joined << "\n";
  }
}

Json groupJson(const CountedGroup& group) {
  Json json = partJson(group.name);
  json["devices"] = group.devices;
  json["logs"] = group.logs;
  json["first_day"] = date(group.firstDay);
  json["last_day"] = date(group.lastDay);
  return json;
}

Json summaryJson(const SummaryAnswer& answer) {
  Json json = {{"devices_at_least", answer.devicesAtLeast},
               {"days", daysJson(answer.days)},
               {"shown", answer.isShown}};
  if (!answer.isShown) return json;
  json["all"] = groupJson(answer.whole);
  for (const SummaryPart& part : answer.parts) {
    Json groups = Json::array();
    for (const CountedGroup& group : part.groups)
      groups.push_back(groupJson(group));
    json["by"][titleOf(part.by).name] = {{"groups", std::move(groups)}, {"joined", part.joined}};
  }
  json["statistics"] = {{"scalars", answer.scalarKeys},
                        {"distributions", answer.distributionKeys},
                        {"histograms", answer.histogramKeys}};
  return json;
}

void printCsv(std::ostream& out, const SummaryAnswer& answer) {
  CsvWriter csv(out);
  csv.titles({"by", "part", "group", "devices", "logs", "first_day", "last_day"});
  const auto row = [&](const char* by, const CountedGroup& group) {
    csv.title(by).title(kindText(group.name)).text(group.name.value);
    csv.integer(group.devices).integer(group.logs);
    csv.title(date(group.firstDay)).title(date(group.lastDay)).endRow();
  };
  if (!answer.isShown) return;
  row("none", answer.whole);
  for (const SummaryPart& part : answer.parts) {
    for (const CountedGroup& group : part.groups)
      row(titleOf(part.by).name, group);
  }
}

void printKeys(FleetContext& context, const QuestionOptions& options, const std::vector<Key>& keys,
               std::size_t devicesAtLeast) {
  const auto entryOf = [](const Key& key) {
    const catalogue::Entry* entry = catalogue::findStatistic(key.name);
    return entry != nullptr ? *entry : catalogue::Entry{};
  };
  if (context.json()) {
    Json list = Json::array();
    for (const Key& key : keys) {
      const catalogue::Entry entry = entryOf(key);
      list.push_back({{"key", key.name},
                      {"kind", kindText(key.kind)},
                      {"unit", entry.unit},
                      {"meaning", entry.meaning}});
    }
    return context.printJson({{"keys", std::move(list)}});
  }
  if (options.csv) {
    CsvWriter csv(context.out());
    csv.titles({"key", "kind", "unit", "meaning"});
    for (const Key& key : keys) {
      const catalogue::Entry entry = entryOf(key);
      csv.text(key.name).title(kindText(key.kind)).title(entry.unit).title(entry.meaning).endRow();
    }
    return;
  }
  Table table({{"KEY", Table::Align::Whole}, {"KIND", Table::Align::Whole}, {"UNIT"}, {"MEANING"}});
  for (const Key& key : keys) {
    const catalogue::Entry entry = entryOf(key);
    table.add({key.name, kindText(key.kind), std::string(entry.unit), std::string(entry.meaning)});
  }
  if (table.empty()) {
    context.out() << "no statistic of at least " << devicesAtLeast << " devices\n";
    return;
  }
  table.print(context.page());
}

}  // namespace

void addSummaryCommand(Command top, FleetContext& context) {
  const Command summary = top.addCommand(
      "summary", "Show how many logs there are, and their versions, regions and days");
  auto options = std::make_shared<SummaryOptions>();
  addQuestionOptions(summary, *options);
  addFormOptions(summary, context, *options);
  summary.addFlag("--keys", options->keys, "List the statistics instead");
  summary.onRun([&context, options] {
    ask(context, *options, [&](Question& question) {
      if (options->keys) {
        return printKeys(context, *options,
                         shownKeys(question.engine(), question.ledger(),
                                   logsOn(question.table(), question.days())),
                         question.ledger().devicesAtLeast());
      }
      const SummaryAnswer answer = summarise(question.engine(), question.ledger(), question.days());
      if (context.json()) return context.printJson(summaryJson(answer));
      if (options->csv) return printCsv(context.out(), answer);
      printText(context, answer);
    });
  });
}

}  // namespace tavrel::fleet
