#include "fleet/questions/ledger.h"

#include <algorithm>
#include <span>
#include <utility>

namespace tavrel::fleet {

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

}  // namespace tavrel::fleet
