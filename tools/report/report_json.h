// Report channels and their values as JSON.
#pragma once

#include "base/plist.h"
#include "tools/console/json_list.h"

namespace tavrel {

/// Adds an object for each channel: driver, group, name, id, format and so on. Ids are unsigned.
void addChannels(JsonList& list, const plist::Dictionary& channels);

/// The same, plus the timestamp and "value", "values", "states" or "buckets" depending on the
/// format. "converted" has the value in a familiar unit: "bytes", "°C" or an SI unit. Whatever a
/// channel does not provide is null. Counts of a delta are differences and may be negative.
void addSamples(JsonList& list, const plist::Dictionary& samples, bool isDelta);

}  // namespace tavrel
