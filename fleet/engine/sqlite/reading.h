// Hands out the rows of an SQLite file.
#pragma once

#include <cstdint>
#include <string_view>
#include <vector>

#include "fleet/engine/engine.h"
#include "fleet/engine/sqlite/connection.h"

namespace tavrel::fleet {

class Reading {
 public:
  explicit Reading(Connection& connection);

  void logs(std::int32_t firstDay, std::int32_t lastDay, const Visitor<LogRow>& visit);
  std::vector<Key> keys();
  void scalars(std::string_view key, const Visitor<ScalarValue>& visit);
  void distributions(std::string_view key, const Visitor<DistributionValue>& visit);
  void cells(std::string_view key, const Visitor<CellValue>& visit);

 private:
  struct Block {
    std::int64_t id = 0;
    std::int64_t firstLog = 0;
  };

  /// The number of a key, 0 when there is none.
  std::int64_t find(KeyKind kind, std::string_view key);
  void refreshBlocks();

  /// Hands out all rows of a name. `make` makes a row of the statement's and the log.
  template <class Row, class Make>
  void visitRows(Statement& statement, std::int64_t name, const Visitor<Row>& visit,
                 const Make& make);

  Connection& connection_;
  Statement findKey_;
  Statement newBlocks_;
  Statement buckets_;
  Statement scalars_;
  Statement distributions_;
  Statement cells_;
  std::vector<Block> blocks_;
};

}  // namespace tavrel::fleet
