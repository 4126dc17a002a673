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

/// Pairs channels by their identity. The system's own delta pairs them by position: after a channel
/// that was absent before, it finds no partner for any other, and leaves their values since boot.
SampleChanges changesBetween(const plist::Dictionary& previous, const plist::Dictionary& current);

}  // namespace tavrel
