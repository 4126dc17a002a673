// Divides a set of logs into parts that may all be shown.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "fleet/questions/ledger.h"
#include "fleet/questions/log_set.h"
#include "fleet/questions/part_name.h"

namespace tavrel::fleet {

/// A group of the kind `Other` is never shown by itself.
struct Group {
  PartName name;
  LogSet logs;
  std::size_t values = 1;  // how many values of the attribute it stands for
};

/// A set of logs and its parts.
struct Division {
  LogSet whole;
  bool isShown = false;  // when false, nothing of it may be shown
  std::vector<Group> groups;
  /// How many values were joined into the last group, which is of the kind `Other`.
  std::size_t joined = 0;
};

/// Divides the union of the groups, which share no log, into parts that may be shown, and notes the
/// parts and the whole as shown. Joins groups of too few devices, and as many of the smallest
/// others as it takes until neither the rest of the whole nor a difference from an earlier division
/// (crossing.h) comes from few devices. Drops empty groups; a whole that cannot be divided has no
/// groups.
Division divide(Ledger& ledger, const std::string& subject, std::vector<Group> groups);

}  // namespace tavrel::fleet
