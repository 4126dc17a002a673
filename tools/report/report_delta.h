// What changed between two samples, channel by channel.
#pragma once

#include <cstddef>
#include <string>

#include "base/plist.h"

namespace tavrel {

/// A delta without the channels that could not be subtracted.
struct PartialDelta {
  plist::Dictionary samples;
  std::size_t leftOut = 0;
  std::string firstLeftOut;  // "DRIVER GROUP SUBGROUP NAME: REASON"
};

/// For samples whose delta cannot be computed as a whole. A channel that has no
/// earlier sample keeps its values.
PartialDelta subtractEach(const plist::Dictionary& previous, const plist::Dictionary& current);

}  // namespace tavrel
