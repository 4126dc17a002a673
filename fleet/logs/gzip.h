// Decompresses gzip data, with a limit on its expanded size.
#pragma once

#include <cstddef>
#include <string>

#include "base/bytes.h"
#include "base/expected.h"

namespace tavrel::fleet {

bool isGzip(ByteSpan bytes);

/// Replaces `out` with the content of all members. Fails when the data is damaged, cut short or
/// longer than `limit` once expanded.
Status gunzip(ByteSpan bytes, std::size_t limit, std::string& out);

}  // namespace tavrel::fleet
