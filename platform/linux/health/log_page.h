// Extracts figures from log pages by a table of places.
#pragma once

#include <span>

#include "base/bytes.h"
#include "platform/linux/health/figure.h"

namespace tavrel::health {

/// Appends the figures of a page. Values beyond 2^63-1 become 2^63-1. A field of two bytes or more
/// in which all bits are set, or one beyond the end of the page, is left out.
void appendFields(ByteSpan page, std::span<const FigureKind> kinds, Figures& figures);

/// Whether all bytes are the same, as in the page of a drive that does not fill it.
bool isBlank(ByteSpan page);

}  // namespace tavrel::health
