// Two divisions of the same logs, and whether they can be subtracted to derive few devices.
//
// Everything that sums of groups of one division, less sums of groups of the other, say about a set
// of logs amounts to this: some groups of one, less groups of the other that these cover. What
// remains is made of intersections of a group of one with a group of the other.
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

  /// Empty when fewer devices than `devicesAtLeast` cannot be derived, given that the joined groups
  /// count as one. Otherwise groups that should join them, the first of `order` that may help;
  /// nothing small can be derived at the latest when all are joined.
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
