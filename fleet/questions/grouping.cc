#include "fleet/questions/grouping.h"

#include <algorithm>

#include "base/ascii.h"
#include "base/civil_time.h"

namespace tavrel::fleet {

namespace {

constexpr std::size_t kMostGroups = 1000;

std::size_t digitsFrom(std::string_view text, std::size_t begin) {
  std::size_t end = begin;
  while (end < text.size() && isDigit(text[end]))
    ++end;
  return end - begin;
}

}  // namespace

bool versionLess(std::string_view a, std::string_view b) {
  std::size_t i = 0;
  std::size_t j = 0;
  while (i < a.size() && j < b.size()) {
    if (isDigit(a[i]) && isDigit(b[j])) {
      while (i < a.size() && a[i] == '0')
        ++i;
      while (j < b.size() && b[j] == '0')
        ++j;
      const std::size_t aDigits = digitsFrom(a, i);
      const std::size_t bDigits = digitsFrom(b, j);
      if (aDigits != bDigits) return aDigits < bDigits;
      const int order = a.substr(i, aDigits).compare(b.substr(j, bDigits));
      if (order != 0) return order < 0;
      i += aDigits;
      j += bDigits;
    } else if (a[i] != b[j]) {
      return a[i] < b[j];
    } else {
      ++i;
      ++j;
    }
  }
  if (a.size() - i != b.size() - j) return a.size() - i < b.size() - j;
  return a < b;
}

std::vector<Group> groupsOf(const LogTable& table, const LogSet& logs, GroupBy by,
                            std::size_t logsAtLeast) {
  if (by == GroupBy::None) return {{{PartKind::Whole}, logs}};

  // Reduces each attribute to an index into its values.
  const Attribute of = by == GroupBy::Os       ? Attribute::Os
                       : by == GroupBy::Region ? Attribute::Region
                                               : Attribute::Digest;
  const bool byDay = by == GroupBy::Day;
  const auto valueOf = [&](LogIndex log) {
    return byDay ? table.dayIndex(log) : table.attribute(of, log);
  };
  const auto texts = table.texts(of);
  std::vector<std::size_t> counts(byDay ? table.days().size() : texts.size());
  logs.forEach([&](LogIndex log) { ++counts[valueOf(log)]; });
  std::vector<std::uint32_t> order;
  std::size_t smallValues = 0;
  for (std::uint32_t value = 0; value < counts.size(); ++value) {
    if (counts[value] >= std::max<std::size_t>(logsAtLeast, 1)) {
      order.push_back(value);
    } else if (counts[value] != 0) {
      ++smallValues;
    }
  }
  if (order.size() > kMostGroups && !byDay) {
    std::nth_element(order.begin(), order.begin() + kMostGroups, order.end(), [&](auto a, auto b) {
      // Texts are numbered in the order of loading.
      return counts[a] != counts[b] ? counts[a] > counts[b] : texts[a] < texts[b];
    });
    smallValues += order.size() - kMostGroups;
    order.resize(kMostGroups);
  }
  std::sort(order.begin(), order.end(),
            [&](auto a, auto b) { return byDay ? a < b : versionLess(texts[a], texts[b]); });

  std::vector<Group> groups;
  std::vector<std::size_t> groupOf(counts.size(), order.size());
  for (const std::uint32_t value : order) {
    groupOf[value] = groups.size();
    const std::string text =
        byDay ? dateText(civilFromDays(table.days()[value].day)) : texts[value];
    groups.push_back({{text.empty() ? PartKind::NotReported : PartKind::Value, text}, LogSet()});
  }
  groups.push_back({{PartKind::Other}, LogSet(), smallValues});
  logs.forEach([&](LogIndex log) { groups[groupOf[valueOf(log)]].logs.insert(log); });
  return groups;
}

void leaveSmallOut(std::vector<Group>& groups, const Ledger& ledger) {
  std::erase_if(groups, [&](const Group& group) {
    return group.name.kind == PartKind::Other || !ledger.hasEnough(group.logs);
  });
}

std::vector<std::string> shownVersions(const Ledger& ledger, const DayRange& days) {
  const LogTable& table = ledger.table();
  const auto texts = table.texts(Attribute::Os);
  std::vector<std::size_t> devices(texts.size());
  std::vector<std::size_t> ofDay(texts.size());
  for (const LogTable::Day& day : table.days()) {
    if (!days.contains(day.day)) continue;
    for (LogIndex log = day.begin; log < day.end; ++log) {
      const std::uint32_t version = table.attribute(Attribute::Os, log);
      devices[version] = std::max(devices[version], ++ofDay[version]);
    }
    for (LogIndex log = day.begin; log < day.end; ++log)
      ofDay[table.attribute(Attribute::Os, log)] = 0;
  }
  std::vector<std::string> versions;
  for (std::size_t version = 0; version < texts.size(); ++version) {
    if (!texts[version].empty() && devices[version] >= ledger.devicesAtLeast())
      versions.push_back(texts[version]);
  }
  std::sort(versions.begin(), versions.end(), versionLess);
  return versions;
}

}  // namespace tavrel::fleet
