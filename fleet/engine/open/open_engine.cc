#include "fleet/engine/open/open_engine.h"

#include <string>

#include "fleet/engine/clickhouse/address.h"
#include "fleet/engine/clickhouse/clickhouse_engine.h"
#include "fleet/engine/sqlite/sqlite_engine.h"

namespace tavrel::fleet {

std::unique_ptr<Engine> openEngine(std::string_view where, OpenMode mode) {
  const bool writes = mode == OpenMode::kWrite;
  if (isServerAddress(where)) return openClickhouseEngine(where, writes);
  return openSqliteEngine(std::string(where), writes);
}

}  // namespace tavrel::fleet
