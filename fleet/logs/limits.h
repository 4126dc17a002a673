// Limits on logs that come from outside, with their units and reasons.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tavrel::fleet::limits {

/// Bytes of an expanded log: the most that a device writes.
inline constexpr std::size_t kLogBytes = 64U << 20;

/// Rows that one log becomes. The largest whitelist, of 4 MiB, names some 70,000 keys.
inline constexpr std::size_t kLogRows = 100'000;

/// Bytes of a key, a version or any other text. Each becomes a row of a table of names that all
/// logs share, so its length must be bounded.
inline constexpr std::size_t kTextBytes = 4'096;

/// Nesting of containers. The skipped parts of a log, such as tasking settings, may have any form,
/// so nothing else bounds their depth.
inline constexpr std::size_t kDepth = 128;

/// The days that a log can report, since 1970: 2000 to 2099. A device whose clock was never set
/// reports a day in 1970, which says nothing about the real date.
inline constexpr std::int32_t kFirstDay = 10'957;
inline constexpr std::int32_t kLastDay = 47'481;

}  // namespace tavrel::fleet::limits
