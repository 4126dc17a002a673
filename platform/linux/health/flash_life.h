// eMMC and UFS, which report their wear in steps of a tenth: the card's EXT_CSD register, and the
// sysfs texts of both.
#pragma once

#include <optional>
#include <span>
#include <string_view>

#include "base/bytes.h"
#include "base/expected.h"
#include "platform/linux/health/figure.h"

namespace tavrel::health {

inline constexpr std::size_t kExtCsdBytes = 512;

std::span<const FigureKind> emmcKinds();
std::span<const FigureKind> ufsKinds();

/// Refuses a register of another size, a blank one, and revisions before eMMC 5.0, which lack the
/// figures.
Expected<Figures> emmcFigures(ByteSpan extCsd);
/// From the files `life_time` ("0x01 0x02") and `pre_eol_info` ("0x01" or "01").
Figures emmcFigures(std::optional<std::string_view> lifeTime,
                    std::optional<std::string_view> preEol);
/// From `life_time_estimation_a`, `life_time_estimation_b` and `eol_info` ("0x01").
Figures ufsFigures(std::optional<std::string_view> lifeA, std::optional<std::string_view> lifeB,
                   std::optional<std::string_view> preEol);

}  // namespace tavrel::health
