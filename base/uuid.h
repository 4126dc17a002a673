// UUIDs as text: five groups of 8, 4, 4, 4 and 12 upper-case hexadecimal digits joined by "-".
#pragma once

#include <array>
#include <cstddef>
#include <optional>
#include <string>
#include <string_view>

namespace tavrel {

using UuidBytes = std::array<std::byte, 16>;

std::string uuidText(const UuidBytes& bytes);

/// The UUID in `text`, in upper case; nothing when it is no UUID.
std::optional<std::string> normalisedUuid(std::string_view text);

}  // namespace tavrel
