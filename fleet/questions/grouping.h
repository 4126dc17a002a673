// Divides logs by an attribute.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "fleet/engine/engine.h"
#include "fleet/questions/division.h"
#include "fleet/questions/ledger.h"

namespace tavrel::fleet {

enum class GroupBy : std::uint8_t { None, Os, Region, Day, Digest };

/// Orders texts the way people number versions: "4.9" before "4.10".
bool versionLess(std::string_view a, std::string_view b);

/// One group for each value of the attribute that occurs among `logs`, in order (versions by
/// number, days by date); `None` yields one group. Values with fewer than `logsAtLeast` logs form
/// one group of the kind `Other`, and so do those beyond the thousand most frequent, except days.
std::vector<Group> groupsOf(const LogTable& table, const LogSet& logs, GroupBy by,
                            std::size_t logsAtLeast);

/// Removes the groups of too few devices, and the one of the kind `Other`.
void leaveSmallOut(std::vector<Group>& groups, const Ledger& ledger);

/// The versions that have enough devices on these days, by number.
std::vector<std::string> shownVersions(const Ledger& ledger, const DayRange& days);

}  // namespace tavrel::fleet
