#include "fleet/engine/open/open_engine.h"

#include <string>

#include "fleet/engine/clickhouse/address.h"
#include "fleet/engine/clickhouse/clickhouse_engine.h"
#include "fleet/engine/sqlite/sqlite_engine.h"

namespace tavrel::fleet {

std::string databaseFault(const std::string& where) {
  if (where.empty()) return "names no file";
  if (!isServerAddress(where)) {
    const std::size_t scheme = where.find("://");
    if (scheme == where.npos || where.find('/') < scheme) return "";
    return "no database has an address that begins with \"" + where.substr(0, scheme + 3) +
           "\": write clickhouse:// for a server; ./" + where.substr(0, scheme + 3) + "… is a file";
  }
  try {
    parseServerAddress(where);
  } catch (const EngineError& error) {
    return error.what();
  }
  return "";
}

std::string databaseName(const std::string& where) {
  return isServerAddress(where) ? parseServerAddress(where).name : where;
}

std::unique_ptr<Engine> openEngine(std::string_view where, OpenMode mode) {
  if (isServerAddress(where)) return openClickhouseEngine(where, mode);
  return openSqliteEngine(std::string(where), mode);
}

}  // namespace tavrel::fleet
