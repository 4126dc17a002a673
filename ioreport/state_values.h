// The values of state channels, one element per state. See sample_values.h for the results for a
// channel of another format or an index out of range.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

#include "base/plist.h"
#include "ioreport/elements.h"

namespace tavrel {

/// The number of states in the channel's type, whether or not it is sampled.
std::int32_t IOReportStateGetCount(const plist::Dictionary& channel);

std::int64_t IOReportStateGetIDForIndex(const plist::Dictionary& channel, std::int32_t index);
/// The last state that has the ID.
std::int32_t IOReportStateGetIndexForID(const plist::Dictionary& channel, std::int64_t stateID);

/// The name that the state's ID spells, borrowed from the channel, which caches the names of all
/// its states. Nothing when one of them has no name.
std::optional<std::string_view> IOReportStateGetNameForIndex(const plist::Dictionary& channel,
                                                             std::int32_t index);

/// How often the state was entered.
std::int64_t IOReportStateGetInTransitions(const plist::Dictionary& channel, std::int32_t index);
/// The total time spent in the state, unsigned, in the channel's unit.
std::int64_t IOReportStateGetResidency(const plist::Dictionary& channel, std::int32_t index);
/// Its residency as a fraction of the residency of all states.
double IOReportStateGetDutyCycle(const plist::Dictionary& channel, std::int32_t index);
/// The first state whose element has the latest timestamp; -1 when none has a timestamp.
std::int32_t IOReportStateGetCurrent(const plist::Dictionary& channel);

// -- All states of a channel at once, for callers that need many of them -------------------------

/// The names of all states, cached in the channel; an empty handle when one has none.
plist::Array stateNames(const plist::Dictionary& channel);

/// The sum of all residencies, in two's complement.
std::uint64_t totalResidency(const Elements& states);

/// The state's share of `total`; not-a-number when the total is 0.
double dutyCycle(const Elements& states, std::size_t index, std::uint64_t total);

}  // namespace tavrel
