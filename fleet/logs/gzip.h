// gzip's form, with a bound on what it expands to.
#pragma once

#include <cstddef>
#include <string>

#include "base/bytes.h"
#include "base/expected.h"

namespace tavrel::fleet {

bool isGzip(ByteSpan bytes);

/// Replaces `out` with the content of all members. Fails when it is damaged, cut short or longer
/// than `limit`.
Status gunzip(ByteSpan bytes, std::size_t limit, std::string& out);

}  // namespace tavrel::fleet
