// Bytes as base64 text.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/bytes.h"

namespace tavrel {

std::string base64Text(ByteSpan bytes);

/// Blanks and line ends are passed over. Nothing for any other text that is no base64.
std::optional<std::vector<std::byte>> parseBase64(std::string_view text);

}  // namespace tavrel
