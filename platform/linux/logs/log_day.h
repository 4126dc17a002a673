// The day whose statistics a log of statistics reports. Its metadata does not hold it.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

#include "base/plist.h"
#include "platform/property_list_coding.h"

namespace tavrel {

/// Of a log that has been read; nothing for one of another kind.
std::optional<std::int32_t> dayOfLog(const plist::Dictionary& log);

/// Of a log's bytes; nothing too for what is no property list.
std::optional<std::int32_t> dayOfLog(std::string_view bytes, PropertyListCoding& propertyLists);

}  // namespace tavrel
