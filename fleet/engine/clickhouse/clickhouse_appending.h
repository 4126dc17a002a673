// Files records in the tables of a ClickHouse database.
//
// The server has no transactions. Each attempt to insert a portion gives its logs new numbers and
// writes the rows of table "log" last; until then its other rows belong to no filed log. An attempt
// whose outcome is unknown is repeated. If both succeeded, or two loaders filed the same log, table
// "log" has its digest twice, and readers use one of them.
#pragma once

#include <array>
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
  std::array<std::set<std::string, std::less<>>, 3> keys_;  // keys already filed, by kind
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
