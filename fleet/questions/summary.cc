#include "fleet/questions/summary.h"

#include "fleet/questions/grouping.h"

namespace tavrel::fleet {

namespace {

CountedGroup countedGroup(const LogTable& table, const std::string& title, const LogSet& logs) {
  CountedGroup result{title, logs.logs(), logs.devices(table), 0, 0};
  bool isFirst = true;
  logs.forEach([&](LogIndex log) {
    if (isFirst) result.firstDay = table.day(log);
    isFirst = false;
    result.lastDay = table.day(log);
  });
  return result;
}

}  // namespace

SummaryAnswer summarise(Engine& engine, Ledger& ledger, const DayRange& days) {
  const LogTable& table = ledger.table();
  SummaryAnswer answer;
  answer.devicesAtLeast = ledger.devicesAtLeast();
  answer.days = days;
  LogSet logs(table);
  for (LogIndex log = 0; log < table.size(); ++log) {
    if (days.contains(table.day(log))) logs.insert(log);
  }
  for (const GroupBy by : {GroupBy::kOs, GroupBy::kRegion, GroupBy::kDigest, GroupBy::kDay}) {
    const Division division =
        divide(ledger, "logs", groupsOf(table, logs, by, ledger.devicesAtLeast()));
    if (!division.isShown) return answer;
    SummaryPart part{by, {}, division.joined};
    for (const Group& group : division.groups) {
      part.groups.push_back(countedGroup(table, group.title, group.logs));
    }
    answer.parts.push_back(std::move(part));
  }
  answer.isShown = true;
  answer.whole = countedGroup(table, "all", logs);
  for (const Key& key : engine.keys()) {
    std::size_t& count = key.kind == KeyKind::kScalar         ? answer.scalarKeys
                         : key.kind == KeyKind::kDistribution ? answer.distributionKeys
                                                              : answer.histogramKeys;
    ++count;
  }
  return answer;
}

}  // namespace tavrel::fleet
