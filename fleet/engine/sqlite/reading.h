// Hands out the rows of an SQLite file.
#pragma once

#include <cstdint>
#include <exception>
#include <functional>
#include <string_view>
#include <vector>

#include "fleet/engine/engine.h"
#include "fleet/engine/sqlite/connection.h"

struct sqlite3_value;

namespace tavrel::fleet {

class Reading {
 public:
  explicit Reading(Connection& connection);
  Reading(const Reading&) = delete;
  Reading& operator=(const Reading&) = delete;

  void logs(std::int32_t firstDay, std::int32_t lastDay, const Visitor<LogRow>& visit);
  std::vector<Key> keys();
  void scalars(std::string_view key, const Visitor<ScalarValue>& visit);
  void distributions(std::string_view key, const Visitor<DistributionValue>& visit);
  void cells(std::string_view key, const Visitor<CellValue>& visit);

  /// The context of the SQL function that receives the rows.
  struct Taking {
    std::function<void(sqlite3_value** values)> take;
    std::exception_ptr failure;
  };

 private:
  struct Block {
    std::int64_t id = 0;
    std::int64_t firstLog = 0;
  };

  /// The number of a key; 0 when there is none.
  std::int64_t find(KeyKind kind, std::string_view key);
  void refreshBlocks();

  /// Hands out all rows of a name. `make` builds a row from its log and its SQL values.
  template <class Row, class Make>
  void visitRows(Statement& statement, std::int64_t name, const Visitor<Row>& visit,
                 const Make& make);
  void takeRows(Statement& statement);

  Connection& connection_;
  Taking taking_;
  Statement findKey_;
  Statement newBlocks_;
  Statement buckets_;
  Statement scalars_;
  Statement distributions_;
  Statement cells_;
  std::vector<Block> blocks_;
};

}  // namespace tavrel::fleet
