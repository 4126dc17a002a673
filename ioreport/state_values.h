// What is worked out over all the states of a channel, for those that need it of many of them.
#pragma once

#include <cstddef>
#include <cstdint>

#include "base/plist.h"
#include "ioreport/elements.h"

namespace tavrel {

/// The names of all states, which are kept in the channel; an empty handle when one has none.
plist::Array stateNames(const plist::Dictionary& channel);

/// In two's complement.
std::uint64_t totalResidency(const Elements& states);

/// Not-a-number when the total is 0.
double dutyCycle(const Elements& states, std::size_t index, std::uint64_t total);

}  // namespace tavrel
