// The elements of XML property lists that hold a value as text.
#pragma once

#include <cstdint>
#include <string_view>

#include "fleet/logs/log_builder.h"

namespace tavrel::fleet {

enum class XmlValue : std::uint8_t { kKey, kString, kInteger, kReal, kDate, kData };

/// Hands the text of an element to the builder; false when the log is refused.
bool buildValue(LogBuilder& builder, XmlValue element, std::string_view text);

}  // namespace tavrel::fleet
