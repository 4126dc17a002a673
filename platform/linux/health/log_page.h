// Takes figures out of log pages by a table of places.
#pragma once

#include <span>

#include "base/bytes.h"
#include "platform/linux/health/figure.h"

namespace tavrel::health {

/// Appends what the page tells. Values beyond 2^63-1 become that. A field of two bytes or more in
/// which all bits are set, and a field that the page is too short for, is left out.
void appendFields(ByteSpan page, std::span<const FigureKind> kinds, Figures& figures);

/// Whether all bytes are the same, as in the answer of a drive that gives none.
bool isBlank(ByteSpan page);

}  // namespace tavrel::health
