// The elements of XML property lists whose text is a value.
#pragma once

#include <cstdint>
#include <string_view>

#include "fleet/logs/log_builder.h"

namespace tavrel::fleet {

enum class XmlValue : std::uint8_t { Key, String, Integer, Real, Date, Data };

/// Passes the text of an element to the builder; false when the log is refused.
bool buildValue(LogBuilder& builder, XmlValue element, std::string_view text);

}  // namespace tavrel::fleet
