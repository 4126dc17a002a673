#include "fleet/questions/ledger.h"

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

bool Ledger::allows(const std::string& subject, const LogSet& logs) const {
  if (!hasEnough(logs)) return false;
  const auto found = shown_.find(subject);
  if (found == shown_.end()) return true;
  const Sets& sets = found->second;
  const Sets& rests = rests_.at(subject);
  // Most sets that include the logs include much more, so this ends after a few words.
  const auto leavesFew = [&](const LogSet& all) {
    if (!all.includes(logs)) return !isNoneOrEnough(all.without(logs));
    return all != logs && !all.differsByAtLeast(logs, devicesAtLeast_, table_);
  };
  LogSet rest = logs;
  for (std::size_t i = 0; i < sets.size(); ++i) {
    const LogSet& other = *sets[i];
    if (logs == other || logs.isApartFrom(other)) continue;
    if (!logs.differsByAtLeast(other, devicesAtLeast_, table_)) return false;
    if (other.includes(logs) && leavesFew(*rests[i])) return false;
    if (!rest.empty() && logs.includes(other)) rest = rest.without(other);
  }
  return isNoneOrEnough(rest);
}

std::shared_ptr<const LogSet> Ledger::noteShown(const std::string& subject, const LogSet& logs) {
  return noteDisjoint(subject, {&logs}).front();
}

Ledger::Sets Ledger::noteDisjoint(const std::string& subject,
                                  const std::vector<const LogSet*>& disjoint) {
  Sets& sets = shown_[subject];
  Sets& rests = rests_[subject];
  const auto take = [](std::shared_ptr<const LogSet>& from, const LogSet& part) {
    if (!from->empty() && !part.empty()) from = std::make_shared<const LogSet>(from->without(part));
  };
  // None of the new sets includes another, so each is compared with the earlier ones only.
  const std::size_t earlier = sets.size();
  Sets result;
  for (const LogSet* logs : disjoint) {
    const std::shared_ptr<const LogSet> kept = result.emplace_back(sets_.keep(*logs));
    if (std::ranges::count(std::span(sets).first(earlier), kept) != 0) continue;
    std::shared_ptr<const LogSet> rest = kept;
    for (std::size_t i = 0; i < earlier; ++i)
      if (kept->includes(*sets[i])) take(rest, *sets[i]);
    sets.push_back(kept);
    rests.push_back(std::move(rest));
  }
  for (std::size_t i = 0; i < earlier; ++i) {
    LogSet parts;
    for (std::size_t part = earlier; part < sets.size(); ++part)
      if (sets[i]->includes(*sets[part])) parts.add(*sets[part]);
    take(rests[i], parts);
  }
  return result;
}

void Ledger::noteDivision(const std::string& subject, const LogSet& whole,
                          const std::vector<const LogSet*>& parts) {
  auto kept = noteShown(subject, whole);
  divisions_[subject].push_back({std::move(kept), noteDisjoint(subject, parts)});
}

std::vector<Ledger::Sets> Ledger::divisionsOf(const std::string& subject,
                                              const LogSet& whole) const {
  std::vector<Sets> result;
  const auto found = divisions_.find(subject);
  if (found == divisions_.end()) return result;
  for (const Parts& division : found->second)
    if (*division.whole == whole) result.push_back(division.parts);
  return result;
}

std::string subjectOf(KeyKind kind, const std::string& key) {
  return (kind == KeyKind::Scalar ? "scalar " : "distribution ") + key;
}

std::string subjectOfMeans(KeyKind kind, const std::string& key) {
  return kind == KeyKind::Scalar ? subjectOf(kind, key) : "mean of " + subjectOf(kind, key);
}

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
