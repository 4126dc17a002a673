// The identity of a log.
#pragma once

#include <array>
#include <cstddef>

#include "base/bytes.h"
#include "fleet/model/log_record.h"

namespace tavrel::fleet {

/// SHA-256 of everything in a record whose rows are in order, except for what comes from the log's
/// metadata: the same log is known again when its metadata is lost, or found.
std::array<std::byte, 32> digestOf(const LogRecord& record);

/// SHA-256 of bytes.
std::array<std::byte, 32> sha256Of(ByteSpan bytes);

}  // namespace tavrel::fleet
