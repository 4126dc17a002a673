// Statistics buffers from JSON.
//
// docs/nand.md describes the form. In short, an object whose "entries" are
//
//   ["hostWrites", 7]                a statistic by name or number, with a value
//   ["ECBins", [1, 2]]               with values
//   ["ECBins0", 1], ["ECBins1", 2]   the same, as `nand parse --json` prints it
//   {"key": 54, "count": 9, "values": []}   a record whose header says what it likes
//   {"hex": "00 ff"}                 bytes as they are
#pragma once

#include <string>

#include "base/expected.h"
#include "base/plist.h"

namespace tavrel {

/// Yields the bytes of the buffer. The error says which entry is wrong.
Expected<std::string> buildStatistics(const plist::Value& document);

}  // namespace tavrel
