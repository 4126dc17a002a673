// What changed between two samples, channel by channel.
#pragma once

#include <cstddef>
#include <string>

#include "base/plist.h"

namespace tavrel {

/// The changes of the channels that could be subtracted.
struct SampleChanges {
  plist::Dictionary samples;
  std::size_t leftOut = 0;
  std::string firstLeftOut;  // "DRIVER GROUP SUBGROUP NAME: REASON"
};

/// Pairs channels by their identity. The system's own delta pairs them by position, and takes
/// values since boot for the change of each channel for which it finds no earlier one: when one was
/// absent before, of all that follow it.
SampleChanges changesBetween(const plist::Dictionary& previous, const plist::Dictionary& current);

}  // namespace tavrel
