// Bytes as base64 text.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "base/bytes.h"

namespace tavrel {

void appendBase64(std::string& out, ByteSpan bytes);

/// Reads base64, with white space anywhere, and replaces the content of `out`. False for any other
/// character, and for a text whose end does not fit its padding.
bool readBase64(std::string_view text, std::vector<std::byte>& out);

}  // namespace tavrel
