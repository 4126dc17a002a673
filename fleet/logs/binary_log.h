// A reader of binary property lists.
#pragma once

#include <string>

#include "base/bytes.h"
#include "fleet/logs/log_builder.h"

namespace tavrel::fleet {

/// Returns why the document is refused; empty when it was read.
std::string readBinaryLog(ByteSpan document, LogBuilder& builder);

}  // namespace tavrel::fleet
