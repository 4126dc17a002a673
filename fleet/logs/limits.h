// Limits on logs that come from outside, with their units and reasons.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tavrel::fleet::limits {

/// Bytes of a log, expanded: what a device writes at most.
inline constexpr std::size_t kLogBytes = 64U << 20;

/// Rows that one log becomes. The largest whitelist, of 4 MiB, names some 70,000 keys.
inline constexpr std::size_t kLogRows = 100'000;

/// Bytes of a key, a version or another text. Each becomes a row of a table of names, which all
/// logs share, so none may be as long as its writer likes.
inline constexpr std::size_t kTextBytes = 4'096;

/// Nesting of containers. What a log may contain that is skipped, such as settings of tasking, has
/// no form of its own.
inline constexpr std::size_t kDepth = 128;

/// Days that a log can report, since 1970: from 2000 to 2099. A device whose clock was never set
/// reports a day of 1970, which tells nothing of when it was.
inline constexpr std::int32_t kFirstDay = 10'957;
inline constexpr std::int32_t kLastDay = 47'481;

}  // namespace tavrel::fleet::limits
