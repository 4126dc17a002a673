// Files records in the tables of a ClickHouse database.
//
// The server has no transactions. A portion's rows get numbers of logs that no other attempt uses,
// and the rows of table "log" follow last: before them, all the rest belongs to logs that are not
// filed. An attempt whose outcome is not known is repeated with other numbers. When both succeeded,
// or two loaders brought the same log, table "log" has its digest twice, and readers take one.
#pragma once

#include <array>
#include <cstddef>
#include <random>
#include <set>
#include <span>
#include <string>
#include <vector>

#include "fleet/engine/clickhouse/server.h"
#include "fleet/engine/engine.h"

namespace tavrel::fleet {

class ClickhouseAppending {
 public:
  explicit ClickhouseAppending(Server& server) : server_(server) {}

  Engine::Appended append(std::span<const LogRecord> records);

 private:
  using Records = std::vector<const LogRecord*>;

  Records unknownOf(std::span<const LogRecord> records);
  void readKeys();
  void addRows(const LogRecord& record, LogId log);
  void addKey(KeyKind kind, std::string_view key);
  void insertPortion(std::span<const LogRecord* const> records);

  Server& server_;
  std::random_device random_;
  std::array<std::set<std::string, std::less<>>, 3> keys_;  // those that are filed, by kind
  bool keysAreRead_ = false;

  // The rows of a portion.
  std::string logs_;
  std::string newKeys_;
  std::string scalars_;
  std::string distributions_;
  std::string cells_;
  std::string activations_;
};

}  // namespace tavrel::fleet
