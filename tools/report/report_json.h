// Report channels and their values as JSON.
#pragma once

#include "base/plist.h"
#include "tools/shared/json_list.h"

namespace tavrel {

/// Adds an object for each channel: driver, group, name, id, format and the like. Ids are unsigned.
void addChannels(JsonList& list, const plist::Dictionary& channels);

/// The same with timestamp and "value", "values", "states" or "buckets" according to the format.
/// "converted" has a value in a familiar unit: "bytes", "°C" or an SI unit.
/// What a channel does not tell is null. Counts of a delta are differences, and may be negative.
void addSamples(JsonList& list, const plist::Dictionary& samples, bool isDelta);

}  // namespace tavrel
