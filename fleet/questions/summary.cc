#include "fleet/questions/summary.h"

#include <span>
#include <vector>

namespace tavrel::fleet {

namespace {

CountedGroup countedGroup(const Ledger& ledger, const PartName& name, const LogSet& logs) {
  const LogTable& table = ledger.table();
  CountedGroup result{name, logs.logs(), logs.devices(table), 0, 0};
  bool isFirst = true;
  logs.forEachDay(table, [&](std::size_t day, std::size_t count) {
    if (count < ledger.devicesAtLeast()) return;
    if (isFirst) result.firstDay = table.days()[day].day;
    isFirst = false;
    result.lastDay = table.days()[day].day;
  });
  return result;
}

bool hasValues(const ScalarValue&) {
  return true;
}

bool hasValues(const DistributionValue& row) {
  return row.numbers.count != 0;
}

bool hasValues(const CellValue& row) {
  return row.count != 0;
}

}  // namespace

bool hasEnough(Engine& engine, const Ledger& ledger, const LogSet& among, const Key& key) {
  const LogTable& table = ledger.table();
  DeviceCounter logs(table);
  const auto take = [&](const auto& rows) {
    for (const auto& row : rows) {
      if (!hasValues(row)) continue;
      const LogIndex log = table.find(row.log);
      if (log != kNoLog && among.contains(log)) logs.insert(log);
    }
    if (logs.devices() >= ledger.devicesAtLeast()) throw EnoughRows();
  };
  switch (key.kind) {
    case KeyKind::Scalar:
      engine.scalars(key.name, [&](std::span<const ScalarValue> rows) { take(rows); });
      break;
    case KeyKind::Distribution:
      engine.distributions(key.name, [&](std::span<const DistributionValue> rows) { take(rows); });
      break;
    case KeyKind::Histogram:
      engine.cells(key.name, [&](std::span<const CellValue> rows) { take(rows); });
      break;
  }
  return logs.devices() >= ledger.devicesAtLeast();
}

std::vector<Key> shownKeys(Engine& engine, const Ledger& ledger, const LogSet& among) {
  std::vector<Key> keys = engine.keys();
  std::erase_if(keys, [&](const Key& key) { return !hasEnough(engine, ledger, among, key); });
  return keys;
}

SummaryAnswer summarise(Engine& engine, Ledger& ledger, const DayRange& days, SmallVersions small) {
  const LogTable& table = ledger.table();
  SummaryAnswer answer;
  answer.devicesAtLeast = ledger.devicesAtLeast();
  answer.days = days;
  LogSet logs = logsOn(table, days);
  if (small == SmallVersions::LeftOut) {
    std::vector<Group> versions = groupsOf(table, logs, GroupBy::Os, ledger.devicesAtLeast());
    leaveSmallOut(versions, ledger);
    logs = LogSet();
    for (const Group& version : versions)
      logs.add(version.logs);
  }
  for (const GroupBy by : {GroupBy::Os, GroupBy::Region, GroupBy::Digest, GroupBy::Day}) {
    const Division division =
        divide(ledger, "logs", groupsOf(table, logs, by, ledger.devicesAtLeast()));
    if (!division.isShown) return answer;
    SummaryPart part{by, {}, division.joined};
    for (const Group& group : division.groups) {
      part.groups.push_back(countedGroup(ledger, group.name, group.logs));
    }
    answer.parts.push_back(std::move(part));
  }
  answer.isShown = true;
  answer.whole = countedGroup(ledger, {PartKind::Whole}, logs);
  answer.keys = shownKeys(engine, ledger, logs);
  for (const Key& key : answer.keys) {
    std::size_t& count = key.kind == KeyKind::Scalar         ? answer.scalarKeys
                         : key.kind == KeyKind::Distribution ? answer.distributionKeys
                                                             : answer.histogramKeys;
    ++count;
  }
  return answer;
}

}  // namespace tavrel::fleet
