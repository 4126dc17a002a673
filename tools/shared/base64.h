// Bytes as base64 text.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/bytes.h"

namespace tavrel {

std::string base64Text(ByteSpan bytes);

/// Ignores blanks and line ends. Nothing when the rest is not base64.
std::optional<std::vector<std::byte>> parseBase64(std::string_view text);

}  // namespace tavrel
