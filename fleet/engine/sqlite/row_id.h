// The row identifiers of the tables that hold a log's values.
//
// SQLite keeps a table in the order of its 64-bit row identifiers. Here they consist of the number
// of a block of logs (24 bits), that of a name (25 bits) and the place of the log in the block (14
// bits). The rows that one loader appends thus go to the end of their table, which costs less than
// half of inserting them elsewhere, and within a block the rows of a name lie together.
#pragma once

#include <cstdint>

namespace tavrel::fleet {

inline constexpr int kPlaceBits = 14;
inline constexpr int kNameBits = 25;
inline constexpr std::int64_t kLogsInBlock = std::int64_t{1} << kPlaceBits;
inline constexpr std::int64_t kMaxNames = std::int64_t{1} << kNameBits;
inline constexpr std::int64_t kMaxBlocks = std::int64_t{1} << (63 - kPlaceBits - kNameBits);

/// The identifier of the row of a block's first log.
constexpr std::int64_t firstRowId(std::int64_t block, std::int64_t name) {
  return (block << kNameBits | name) << kPlaceBits;
}

constexpr std::int64_t placeOf(std::int64_t rowId) {
  return rowId & (kLogsInBlock - 1);
}

}  // namespace tavrel::fleet
