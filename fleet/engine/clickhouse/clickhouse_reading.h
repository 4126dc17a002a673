// Hands out the rows of a ClickHouse database.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "fleet/engine/clickhouse/server.h"
#include "fleet/engine/engine.h"

namespace tavrel::fleet {

class ClickhouseReading {
 public:
  explicit ClickhouseReading(Server& server) : server_(server) {}

  void logs(std::int32_t firstDay, std::int32_t lastDay, const Visitor<LogRow>& visit);
  std::vector<Key> keys();
  void scalars(std::string_view key, const Visitor<ScalarValue>& visit);
  void distributions(std::string_view key, const Visitor<DistributionValue>& visit);
  void cells(std::string_view key, const Visitor<CellValue>& visit);

 private:
  Server& server_;
  std::string bytes_;  // of an answer; kept to reuse its memory
};

}  // namespace tavrel::fleet
