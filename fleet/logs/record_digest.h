// The identity of a log.
#pragma once

#include <array>
#include <cstddef>

#include "base/bytes.h"
#include "fleet/model/log_record.h"

namespace tavrel::fleet {

/// SHA-256 of everything in a record, whose rows must be in order, except the log's metadata. A log
/// is thus recognised even when its metadata was lost or has turned up since.
std::array<std::byte, 32> digestOf(const LogRecord& record);

/// SHA-256 of bytes.
std::array<std::byte, 32> sha256Of(ByteSpan bytes);

}  // namespace tavrel::fleet
