// Report channels and their values as JSON.
#pragma once

#include "base/plist.h"
#include "tools/tool_context.h"

namespace tavrel {

/// An array of objects: driver, group, name, id, format and the like of each channel. Ids are
/// unsigned.
Json channelsJson(const plist::Dictionary& channels);

/// The same with timestamp and "value", "values", "states" or "buckets" according to the format.
/// What a channel does not tell is null. Counts of a delta are differences, and may be negative.
Json samplesJson(const plist::Dictionary& samples, bool isDelta);

}  // namespace tavrel
