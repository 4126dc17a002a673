// The table that records how far each segment of the store's clients was folded. It changes in the
// transaction that takes a segment's values, so that each value is taken once.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "platform/linux/store/sqlite_connection.h"

namespace tavrel {

using SegmentIdentity = std::span<const std::byte, 16>;

/// A segment that the store remembers: the user who owns its file, and its random identity.
struct SegmentName {
  std::uint32_t owner = 0;
  std::array<std::byte, 16> identity{};
  bool operator==(const SegmentName&) const = default;
};

/// The operations throw `StoreFailure`. A store of schema version 1 has no such table.
namespace segment_table {

std::optional<std::string> position(SqliteConnection& connection, std::uint32_t owner,
                                    SegmentIdentity identity);
/// By owner, then by identity.
std::vector<SegmentName> names(SqliteConnection& connection);
/// Bytes of the positions of one user's segments, and of all.
std::int64_t positionBytes(SqliteConnection& connection, std::uint32_t owner);
std::int64_t positionBytes(SqliteConnection& connection);
/// Call these inside a transaction.
void setPosition(SqliteConnection& connection, std::uint32_t owner, SegmentIdentity identity,
                 std::string_view position);
void removePosition(SqliteConnection& connection, std::uint32_t owner, SegmentIdentity identity);

}  // namespace segment_table

}  // namespace tavrel
