// Looks up the key of a statistic in the NAND information.
#pragma once

#include <string_view>

#include "storage/key_map_table.h"

namespace tavrel {

/// The row of the statistic with that name, null when it is not reported; in constant time. A name
/// comes from a list entry, so it is never longer than the table can hold.
const KeyMapRow* findKeyMapRow(std::string_view name);

}  // namespace tavrel
