#include "fleet/questions/ledger.h"

#include <algorithm>
#include <utility>

#include "fleet/questions/crossing.h"

namespace tavrel::fleet {

bool Ledger::allows(const std::string& subject, const LogSet& logs) const {
  if (!hasEnough(logs)) return false;
  const auto found = shown_.find(subject);
  if (found == shown_.end()) return true;
  const Sets& sets = found->second;
  const Sets& rests = rests_.at(subject);
  LogSet rest = logs;
  for (std::size_t i = 0; i < sets.size(); ++i) {
    const LogSet& other = *sets[i];
    if (logs == other) continue;
    if (!logs.differsByAtLeast(other, devicesAtLeast_, table_)) return false;
    if (other.includes(logs) && !isNoneOrEnough(rests[i]->without(logs))) return false;
    if (!rest.empty() && logs.includes(other)) rest = rest.without(other);
  }
  return isNoneOrEnough(rest);
}

std::shared_ptr<const LogSet> Ledger::noteShown(const std::string& subject, const LogSet& logs) {
  std::shared_ptr<const LogSet> kept;
  const std::size_t hash = logs.hash();
  const auto [first, last] = known_.equal_range(hash);
  for (auto known = first; known != last && !kept; ++known) {
    if (*known->second == logs) kept = known->second;
  }
  if (!kept) {
    kept = std::make_shared<const LogSet>(logs);
    known_.emplace(hash, kept);
  }
  Sets& sets = shown_[subject];
  Sets& rests = rests_[subject];
  if (std::find(sets.begin(), sets.end(), kept) != sets.end()) return kept;
  std::shared_ptr<const LogSet> rest = kept;
  const auto take = [](std::shared_ptr<const LogSet>& from, const LogSet& part) {
    if (!from->empty()) from = std::make_shared<const LogSet>(from->without(part));
  };
  for (std::size_t i = 0; i < sets.size(); ++i) {
    if (sets[i]->includes(logs)) take(rests[i], logs);
    if (logs.includes(*sets[i])) take(rest, *sets[i]);
  }
  sets.push_back(kept);
  rests.push_back(std::move(rest));
  return kept;
}

void Ledger::noteDivision(const std::string& subject, const LogSet& whole,
                          const std::vector<const LogSet*>& parts) {
  Parts noted{noteShown(subject, whole), {}};
  for (const LogSet* part : parts)
    noted.parts.push_back(noteShown(subject, *part));
  divisions_[subject].push_back(std::move(noted));
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
  return (kind == KeyKind::kScalar ? "scalar " : "distribution ") + key;
}

std::string subjectOfMeans(KeyKind kind, const std::string& key) {
  return kind == KeyKind::kScalar ? subjectOf(kind, key) : "mean of " + subjectOf(kind, key);
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

  struct Part {
    std::size_t devices;
    std::size_t position;  // among the groups
    bool isAllowed;
  };
  std::vector<Part> parts;
  for (std::size_t i = 0; i < groups.size(); ++i) {
    const LogSet& logs = groups[i].logs;
    const bool isAllowed = groups[i].name.kind != PartKind::kOther && ledger.allows(subject, logs);
    parts.push_back({logs.devices(table), i, isAllowed});
  }
  std::stable_sort(parts.begin(), parts.end(), [](const Part& a, const Part& b) {
    return a.isAllowed != b.isAllowed ? b.isAllowed : a.devices < b.devices;
  });

  std::vector<std::size_t> order;
  order.reserve(parts.size());
  for (const Part& part : parts)
    order.push_back(part.position);
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
  for (const Part& part : parts)
    if (!part.isAllowed) join(part.position);
  const auto groupsToJoin = [&]() -> std::vector<std::size_t> {
    if (joined != 0 && !ledger.allows(subject, other))
      return {*std::ranges::find(order, false, [&](std::size_t i) { return isJoined[i]; })};
    for (const Crossing& crossing : crossings) {
      auto found = crossing.groupsToJoin(isJoined, order);
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
  if (joined != 0) division.groups.push_back({{PartKind::kOther}, std::move(other)});
  sets.clear();
  for (const Group& group : division.groups)
    sets.push_back(&group.logs);
  ledger.noteDivision(subject, division.whole, sets);
  return division;
}

}  // namespace tavrel::fleet
