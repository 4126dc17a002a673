// SATA: ATA SMART, as libatasmart understands the vendors' attributes.
#pragma once

#include <span>

#include "base/bytes.h"
#include "base/expected.h"
#include "platform/linux/health/figure.h"

namespace tavrel::health {

std::span<const FigureKind> ataKinds();

/// Reads the libatasmart blob that `DeviceCommands::ataSmart` returns.
Expected<Figures> ataFigures(ByteSpan blob);

}  // namespace tavrel::health
