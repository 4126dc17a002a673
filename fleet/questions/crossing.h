// Two divisions of the same logs, and whether a reader who has seen both can work out figures of
// few devices.
//
// All that such a reader can do is to add up groups of one division and subtract groups of the
// other that lie within that sum. What remains consists of intersections of a group of one with a
// group of the other.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <vector>

#include "fleet/questions/log_set.h"

namespace tavrel::fleet {

class Crossing {
 public:
  using Sets = std::vector<std::shared_ptr<const LogSet>>;

  /// The groups share no log, and neither do the earlier ones. Both are divisions of the same logs.
  Crossing(const LogTable& table, const std::vector<const LogSet*>& groups, const Sets& earlier,
           std::size_t devicesAtLeast);

  /// Empty when nothing of fewer than `devicesAtLeast` devices can be derived while the joined
  /// groups count as one. Otherwise groups to join with them, the first in `order` that may help;
  /// then ask again. When all are joined, nothing small can be derived.
  std::vector<std::size_t> groupsToJoin(const std::vector<bool>& isJoined,
                                        std::span<const std::size_t> order) const;

 private:
  /// The logs of one day in a group and an earlier group.
  struct Cell {
    std::uint32_t group;
    std::uint32_t earlier;  // counted on from the number of groups
    std::uint32_t day;
    std::uint32_t logs;
  };

  class Components;
  struct Few {
    std::vector<std::uint32_t> components;
    std::size_t groupsToJoin = 0;
  };

  /// Unites components that are taken or subtracted only together, until there are none. Returns
  /// the intersections that remain, of components in place of groups.
  std::vector<Cell> settle(Components& components) const;
  /// `between` are the intersections of components. Returns components some of which could leave
  /// few devices.
  Few componentsThatLeaveFew(const std::vector<Cell>& between) const;

  const std::size_t groups_;
  const std::size_t earlier_;
  const std::size_t days_;
  const std::size_t devicesAtLeast_;
  std::vector<Cell> cells_;
};

}  // namespace tavrel::fleet
