// Looks up the key of a statistic in the NAND information.
#pragma once

#include <string_view>

#include "storage/key_map_table.h"

namespace tavrel {

/// The row of the statistic of that name, null when it is not reported; in constant time. A name is
/// the text of a list entry, and so never longer than the table can hold.
const KeyMapRow* findKeyMapRow(std::string_view name);

}  // namespace tavrel
