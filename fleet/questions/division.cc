#include "fleet/questions/division.h"

#include <algorithm>
#include <span>
#include <utility>

#include "fleet/questions/crossing.h"

namespace tavrel::fleet {
namespace {

// Positions of groups in the order in which they are joined: those that may not be shown, then the
// others, each by devices.
struct JoinOrder {
  std::vector<std::size_t> positions;
  std::size_t forbidden = 0;  // how many may not be shown
};

JoinOrder joinOrder(const Ledger& ledger, const std::string& subject,
                    const std::vector<Group>& groups) {
  JoinOrder order;
  std::vector<std::pair<bool, std::size_t>> ranks;
  for (const Group& group : groups) {
    const bool isAllowed = group.name.kind != PartKind::Other && ledger.allows(subject, group.logs);
    if (!isAllowed) ++order.forbidden;
    order.positions.push_back(ranks.size());
    ranks.emplace_back(isAllowed, group.logs.devices(ledger.table()));
  }
  std::ranges::stable_sort(order.positions, {},
                           [&](std::size_t position) { return ranks[position]; });
  return order;
}

}  // namespace

Division divide(Ledger& ledger, const std::string& subject, std::vector<Group> groups) {
  const LogTable& table = ledger.table();
  Division division{{}, false, {}, 0};
  std::erase_if(groups, [](const Group& group) { return group.logs.empty(); });
  for (const Group& group : groups)
    division.whole.add(group.logs);
  if (!ledger.allows(subject, division.whole)) return division;
  division.isShown = true;
  ledger.noteShown(subject, division.whole);

  const JoinOrder order = joinOrder(ledger, subject, groups);
  std::vector<const LogSet*> sets;
  sets.reserve(groups.size() + 1);
  for (const Group& group : groups)
    sets.push_back(&group.logs);
  std::vector<Crossing> crossings;
  for (const Ledger::Sets& earlier : ledger.divisionsOf(subject, division.whole))
    crossings.emplace_back(table, sets, earlier, ledger.devicesAtLeast());

  LogSet other;
  std::vector<bool> isJoined(groups.size());
  std::size_t joined = 0;
  const auto join = [&](std::size_t position) {
    isJoined[position] = true;
    ++joined;
    other.add(groups[position].logs);
    division.joined += groups[position].values;
  };
  std::ranges::for_each(std::span(order.positions).first(order.forbidden), join);
  const auto groupsToJoin = [&]() -> std::vector<std::size_t> {
    if (joined != 0 && !ledger.allows(subject, other)) {
      return {*std::ranges::find(order.positions, false,
                                 [&](std::size_t position) { return isJoined[position]; })};
    }
    for (const Crossing& crossing : crossings) {
      auto found = crossing.groupsToJoin(isJoined, order.positions);
      if (!found.empty()) return found;
    }
    return {};
  };
  while (joined < groups.size()) {
    const std::vector<std::size_t> found = groupsToJoin();
    if (found.empty()) break;
    std::ranges::for_each(found, join);
  }
  if (joined == groups.size()) return division;

  for (std::size_t i = 0; i < groups.size(); ++i) {
    if (!isJoined[i]) division.groups.push_back(std::move(groups[i]));
  }
  if (joined != 0) division.groups.push_back({{PartKind::Other}, std::move(other)});
  sets.clear();
  for (const Group& group : division.groups)
    sets.push_back(&group.logs);
  ledger.noteDivision(subject, division.whole, sets);
  return division;
}

}  // namespace tavrel::fleet
