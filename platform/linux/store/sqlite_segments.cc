#include "platform/linux/store/sqlite_segments.h"

#include <algorithm>

#include "base/bytes.h"

namespace tavrel::segment_table {
namespace {

void bindName(SqliteStatement& statement, std::uint32_t owner, SegmentIdentity identity) {
  statement.bind(1, std::int64_t{owner});
  statement.bind(2, asText(identity));
}

}  // namespace

std::optional<std::string> position(SqliteConnection& connection, std::uint32_t owner,
                                    SegmentIdentity identity) {
  SqliteStatement statement(connection,
                            "SELECT position FROM segments WHERE owner = ?1 AND identity = ?2");
  bindName(statement, owner, identity);
  if (!statement.step()) return std::nullopt;
  return std::string(statement.bytes(0));
}

std::vector<SegmentName> names(SqliteConnection& connection) {
  std::vector<SegmentName> found;
  SqliteStatement rows(connection, "SELECT owner, identity FROM segments ORDER BY owner, identity");
  while (rows.step()) {
    SegmentName& name = found.emplace_back();
    name.owner = static_cast<std::uint32_t>(rows.integer(0));
    const ByteSpan identity = asBytes(rows.bytes(1));
    std::copy_n(identity.begin(), std::min(identity.size(), name.identity.size()),
                name.identity.begin());
  }
  return found;
}

std::int64_t positionBytes(SqliteConnection& connection, std::uint32_t owner) {
  SqliteStatement sum(connection,
                      "SELECT ifnull(sum(length(position)), 0) FROM segments WHERE owner = ?1");
  sum.bind(1, std::int64_t{owner});
  return sum.step() ? sum.integer(0) : 0;
}

std::int64_t positionBytes(SqliteConnection& connection) {
  return connection.integer("SELECT ifnull(sum(length(position)), 0) FROM segments");
}

void setPosition(SqliteConnection& connection, std::uint32_t owner, SegmentIdentity identity,
                 std::string_view position) {
  SqliteStatement statement(
      connection,
      "INSERT OR REPLACE INTO segments (owner, identity, position) VALUES (?1, ?2, ?3)");
  bindName(statement, owner, identity);
  statement.bind(3, position);
  statement.run();
}

void removePosition(SqliteConnection& connection, std::uint32_t owner, SegmentIdentity identity) {
  SqliteStatement statement(connection, "DELETE FROM segments WHERE owner = ?1 AND identity = ?2");
  bindName(statement, owner, identity);
  statement.run();
}

}  // namespace tavrel::segment_table
