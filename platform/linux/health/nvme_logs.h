// NVMe: the SMART log, page 02h, and the data-centre log C0h of drives that follow OCP.
#pragma once

#include <span>

#include "base/bytes.h"
#include "base/expected.h"
#include "platform/linux/health/figure.h"

namespace tavrel::health {

inline constexpr std::uint8_t kNvmeSmartLog = 0x02;
inline constexpr std::uint8_t kNvmeOcpLog = 0xC0;
inline constexpr std::size_t kNvmeLogBytes = 512;

std::span<const FigureKind> nvmeSmartKinds();
std::span<const FigureKind> nvmeOcpKinds();
/// Figures computed from both logs.
std::span<const FigureKind> nvmeDerivedKinds();

/// Refuses a page of another size and one whose bytes are all the same.
Expected<Figures> nvmeSmartFigures(ByteSpan page);
/// Refuses a page without the log's GUID, too: vendors may use C0h for anything.
Expected<Figures> nvmeOcpFigures(ByteSpan page);
/// Appends the write amplification when the figures include the bytes written to the media and by
/// the host.
void appendNvmeDerived(Figures& figures);

}  // namespace tavrel::health
