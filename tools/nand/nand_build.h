// Builds statistics buffers from JSON.
//
// docs/nand.md describes the format. In short, it is an object whose "entries" are
//
//   ["hostWrites", 7]                a statistic by name or number, with a value
//   ["ECBins", [1, 2]]               with values
//   ["ECBins0", 1], ["ECBins1", 2]   the same, as `nand parse --json` prints it
//   {"key": 54, "count": 9, "values": []}   a record with any header, even a wrong one
//   {"hex": "00 ff"}                 raw bytes
#pragma once

#include <string>

#include "base/expected.h"
#include "base/plist.h"

namespace tavrel {

/// Returns the bytes of the buffer. The error names the entry that is wrong.
Expected<std::string> buildStatistics(const plist::Value& document);

}  // namespace tavrel
