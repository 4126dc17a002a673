// The day that a log of statistics reports, which its metadata does not contain.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

#include "base/plist.h"
#include "platform/property_list_coding.h"

namespace tavrel {

/// The day of a decoded log; nothing for logs of another kind.
std::optional<std::int32_t> dayOfLog(const plist::Dictionary& log);

/// The day of an encoded log; nothing also for bytes that are no property list.
std::optional<std::int32_t> dayOfLog(std::string_view bytes, PropertyListCoding& propertyLists);

}  // namespace tavrel
