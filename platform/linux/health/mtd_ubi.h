// Raw flash: MTD devices and the UBI layer over them, whose figures are sysfs files.
#pragma once

#include <span>
#include <string>

#include "platform/linux/health/figure.h"

namespace tavrel::health {

std::span<const FigureKind> mtdKinds();
std::span<const FigureKind> ubiKinds();

/// The figures of the kinds whose `source` is a file in `folder` with a decimal number.
Figures attributeFigures(const std::string& folder, std::span<const FigureKind> kinds);

}  // namespace tavrel::health
