// Finds the faults of a document that should be a tallied log.
#pragma once

#include <string>
#include <vector>

#include "base/plist.h"

namespace tavrel {

/// Whether a property list is meant as a tallied log: a dictionary with a log's main entries.
bool isTalliedLog(const plist::Value& document);

/// Members that have the wrong type or are unknown, such as "BHScalars: is a string, not a
/// dictionary", ordered by place. Empty for a valid log.
std::vector<std::string> faultsOf(const plist::Dictionary& log);

}  // namespace tavrel
