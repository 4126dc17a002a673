#include "fleet/questions/crossing.h"

#include <algorithm>
#include <numeric>
#include <optional>
#include <tuple>

namespace tavrel::fleet {

namespace {

/// All choices of so many components are tried. Of more, some are joined first.
constexpr std::size_t kMostComponents = 12;

}  // namespace

/// Disjoint sets of groups. The smallest group of a set stands for it, in whatever order they were
/// united: cells are in the order of loading, and answers must not depend on it.
class Crossing::Components {
 public:
  explicit Components(std::size_t groups) : parent_(groups) {
    std::iota(parent_.begin(), parent_.end(), 0U);
  }

  std::uint32_t of(std::size_t group) {
    while (parent_[group] != group) {
      parent_[group] = parent_[parent_[group]];
      group = parent_[group];
    }
    return static_cast<std::uint32_t>(group);
  }
  void unite(std::size_t a, std::size_t b) {
    const auto [smaller, larger] = std::minmax({of(a), of(b)});
    parent_[larger] = smaller;
  }

 private:
  std::vector<std::uint32_t> parent_;
};

Crossing::Crossing(const LogTable& table, const std::vector<const LogSet*>& groups,
                   const Sets& earlier, std::size_t devicesAtLeast)
    : groups_(groups.size()),
      earlier_(earlier.size()),
      days_(table.days().size()),
      devicesAtLeast_(devicesAtLeast) {
  std::vector<std::uint32_t> earlierOf(table.size());
  for (std::uint32_t i = 0; i < earlier_; ++i)
    earlier[i]->forEach([&](LogIndex log) { earlierOf[log] = i; });
  std::vector<std::size_t> cellOf(earlier_);  // position in cells_, plus 1
  for (std::uint32_t group = 0; group < groups_; ++group) {
    const std::size_t begin = cells_.size();
    groups[group]->forEach([&](LogIndex log) {
      const std::uint32_t other = earlierOf[log];
      const std::uint32_t day = table.dayIndex(log);
      std::size_t& cell = cellOf[other];
      if (cell <= begin || cells_[cell - 1].day != day) {
        cells_.push_back({group, static_cast<std::uint32_t>(groups_ + other), day, 0});
        cell = cells_.size();
      }
      ++cells_[cell - 1].logs;
    });
  }
}

// Whoever subtracts a group has taken all groups of the other division that share logs with it, and
// whoever takes one has subtracted all those with which it shares many logs: otherwise many remain.
// Groups that are taken or subtracted only together form a component.
std::vector<std::size_t> Crossing::groupsToJoin(const std::vector<bool>& isJoined,
                                                std::span<const std::size_t> order) const {
  Components components(groups_ + earlier_);
  std::optional<std::size_t> joined;
  for (std::size_t group = 0; group < groups_; ++group) {
    if (!isJoined[group]) continue;
    if (joined) components.unite(group, *joined);
    joined = group;
  }
  for (const Cell& cell : cells_)
    if (cell.logs >= devicesAtLeast_) components.unite(cell.group, cell.earlier);

  const Few few = componentsThatLeaveFew(settle(components));
  std::vector<std::size_t> result;
  std::vector<bool> isInvolved(groups_ + earlier_);
  for (const std::uint32_t component : few.components)
    isInvolved[component] = true;
  // Joining groups of one component changes nothing.
  if (joined) isInvolved[components.of(*joined)] = false;
  for (const bool wantsInvolved : {true, false}) {
    for (const std::size_t group : order) {
      if (result.size() < few.groupsToJoin && !isJoined[group] &&
          isInvolved[components.of(group)] == wantsInvolved) {
        result.push_back(group);
      }
    }
    if (!result.empty()) break;
  }
  return result;
}

std::vector<Crossing::Cell> Crossing::settle(Components& components) const {
  const auto pairOf = [](const Cell& cell) { return std::tuple(cell.group, cell.earlier); };
  std::vector<Cell> between;
  for (bool hasChanged = true; hasChanged;) {
    hasChanged = false;
    between.clear();
    for (const Cell& cell : cells_) {
      const std::uint32_t group = components.of(cell.group);
      const std::uint32_t earlier = components.of(cell.earlier);
      if (group != earlier) between.push_back({group, earlier, cell.day, cell.logs});
    }
    std::sort(between.begin(), between.end(), [](const Cell& a, const Cell& b) {
      return std::tie(a.group, a.earlier, a.day) < std::tie(b.group, b.earlier, b.day);
    });
    std::size_t logs = 0;
    for (std::size_t i = 0; i < between.size(); ++i) {
      const Cell& cell = between[i];
      const bool goesOn = i != 0 && pairOf(between[i - 1]) == pairOf(cell);
      logs = goesOn && between[i - 1].day == cell.day ? logs + cell.logs : cell.logs;
      // With intersections in both directions, either both or none remain, of opposite sign.
      if (logs >= devicesAtLeast_ ||
          (!goesOn &&
           std::ranges::binary_search(between, std::tuple(cell.earlier, cell.group), {}, pairOf))) {
        components.unite(cell.group, cell.earlier);
        hasChanged = true;
      }
    }
  }
  return between;
}

Crossing::Few Crossing::componentsThatLeaveFew(const std::vector<Cell>& between) const {
  std::vector<std::uint32_t> components;
  for (const Cell& cell : between)
    components.insert(components.end(), {cell.group, cell.earlier});
  std::ranges::sort(components);
  components.erase(std::unique(components.begin(), components.end()), components.end());
  if (components.size() > kMostComponents)
    return {components, (components.size() - kMostComponents + 1) / 2};

  const auto bitOf = [&](std::uint32_t component) {
    return std::size_t{1} << (std::ranges::lower_bound(components, component) - components.begin());
  };
  struct Remainder {
    std::size_t taken;
    std::size_t subtracted;
    const Cell* cell;
  };
  std::vector<Remainder> remainders;
  remainders.reserve(between.size());
  for (const Cell& cell : between)
    remainders.push_back({bitOf(cell.group), bitOf(cell.earlier), &cell});
  std::vector<std::size_t> logsOf(days_);
  for (std::size_t chosen = 1; chosen < std::size_t{1} << components.size(); ++chosen) {
    const bool isPossible = std::ranges::all_of(remainders, [&](const Remainder& one) {
      return (chosen & one.subtracted) == 0 || (chosen & one.taken) != 0;
    });
    if (!isPossible) continue;
    std::fill(logsOf.begin(), logsOf.end(), 0);
    std::vector<std::uint32_t> ends;
    const bool areFew = std::ranges::all_of(remainders, [&](const Remainder& one) {
      if ((chosen & one.taken) == 0 || (chosen & one.subtracted) != 0) return true;
      ends.insert(ends.end(), {one.cell->group, one.cell->earlier});
      return (logsOf[one.cell->day] += one.cell->logs) < devicesAtLeast_;
    });
    if (areFew && !ends.empty()) return {std::move(ends), 1};
  }
  return {};
}

}  // namespace tavrel::fleet
