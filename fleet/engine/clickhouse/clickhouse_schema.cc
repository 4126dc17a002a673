#include "fleet/engine/clickhouse/clickhouse_schema.h"

#include <algorithm>
#include <array>
#include <string>

namespace tavrel::fleet {
namespace {

constexpr std::string_view kVersion = "1";

struct TableForm {
  const char* name;
  const char* columns;
  const char* order;
  const char* shard;  // all rows of a log are on one shard
};

// Keys are texts rather than numbers: sorted, they take hardly more room, and nobody has to
// coordinate numbers between several loaders.
constexpr std::array kTables = {
    TableForm{"log",
              "log UInt64, digest FixedString(32), day Int32, created Int64, os_version String, "
              "previous_os_version String, config_number String, whitelist_digest String, "
              "task_id String, language String, preferred_language String, region String",
              "digest, log", "log"},
    TableForm{"key", "kind UInt8, name String", "kind, name", "sipHash64(name)"},
    TableForm{"scalar", "key String, log UInt64, value Int64", "key, log", "log"},
    TableForm{"distribution",
              "key String, log UInt64, minimum Float64, maximum Float64, mean Float64, "
              "squared_deviations Float64, count UInt64",
              "key, log", "log"},
    TableForm{"cell",
              "key String, log UInt64, lower Float64, upper Float64, label String, count UInt64",
              "key, log", "log"},
    TableForm{"activation",
              "bundle String, log UInt64, version String, uuid String, orbo_id Int64, arch Int64, "
              "times UInt64",
              "bundle, log", "log"},
    TableForm{"tavrel_schema", "version UInt32", "version", "version"},
};

struct ViewForm {
  const char* name;
  const char* columns;
  const char* table;
};

constexpr std::array kViews = {
    ViewForm{"logs",
             "log, lower(hex(digest)) AS digest, day, toDate(day) AS date, created, os_version, "
             "previous_os_version, config_number, whitelist_digest, task_id, language, "
             "preferred_language, region",
             "log"},
    ViewForm{"scalars", "key, log, value", "scalar"},
    ViewForm{"distributions", "key, log, minimum, maximum, mean, squared_deviations, count",
             "distribution"},
    ViewForm{"cells", "key, log, lower, upper, label, count", "cell"},
    ViewForm{"applications", "bundle, version, uuid, orbo_id, arch, log, times", "activation"},
};

// When two loaders filed the same log at once, the copy with the lowest number counts. The views
// also hide rows without a filed log, which a killed load left behind.
void makeViews(Server& server, const std::string& database) {
  for (const ViewForm& view : kViews) {
    server.ask("CREATE VIEW IF NOT EXISTS " + database + "." + view.name + " AS SELECT " +
               view.columns + " FROM " + database + "." + view.table +
               " WHERE log GLOBAL IN (SELECT min(log) FROM " + database + ".log GROUP BY digest)");
  }
}

void checkVersion(const Server& server, std::string versions) {
  if (!versions.empty() && versions.back() == '\n') versions.pop_back();
  if (versions == kVersion) return;
  constexpr std::size_t kLongest = 100;
  std::replace(versions.begin(), versions.end(), '\n', ',');
  if (versions.empty() || versions.size() > kLongest ||
      versions.find_first_not_of("0123456789,") != versions.npos) {
    throw EngineError(server.address().name +
                      ": does not answer as a ClickHouse server does: check the address");
  }
  throw EngineError(server.address().name + ": has tables of version " + versions +
                    ", and this program knows version " + std::string(kVersion) +
                    ": use the program that made them, or load the logs into a new database");
}

// Empty when the tables were never made, or not completely.
std::string versionsIn(Server& server, const std::string& database) {
  try {
    return server.ask("SELECT DISTINCT version FROM " + database +
                      ".tavrel_schema ORDER BY version");
  } catch (const ServerError& error) {
    if (error.code == ServerError::kUnknownTable || error.code == ServerError::kUnknownDatabase)
      return {};
    throw;
  }
}

// The version is written last, so tables that have one are complete.
void makeTables(Server& server, const std::string& database) {
  server.ask("CREATE DATABASE IF NOT EXISTS " + database);
  for (const TableForm& table : kTables) {
    server.ask("CREATE TABLE IF NOT EXISTS " + database + "." + table.name + " (" + table.columns +
               ") ENGINE = MergeTree() ORDER BY (" + table.order + ")");
  }
  makeViews(server, database);
  server.ask("INSERT INTO " + database + ".tavrel_schema SELECT toUInt32(" + std::string(kVersion) +
             ")");
}

// One table that unites those of all servers, with the same name in another database.
void makeDistributedTables(Server& server, const std::string& database,
                           const std::string& distributed) {
  server.ask("CREATE DATABASE IF NOT EXISTS " + distributed);
  for (const TableForm& table : kTables) {
    server.ask("CREATE TABLE IF NOT EXISTS " + distributed + "." + table.name + " (" +
               table.columns + ") ENGINE = Distributed(" + server.address().cluster + ", " +
               database + ", " + table.name + ", " + table.shard + ")");
  }
  makeViews(server, distributed);
}

}  // namespace

void openTables(Server& server, OpenMode mode) {
  const bool writes = mode == OpenMode::Write;
  const ServerAddress& address = server.address();
  std::string versions = versionsIn(server, address.database);
  if (versions.empty() && writes) {
    makeTables(server, address.database);
    versions = versionsIn(server, address.database);
  } else if (versions.empty()) {
    throw EngineError(address.name + ": there are no tables: load logs into it first");
  }
  checkVersion(server, versions);
  server.use(address.database);
  if (address.cluster.empty()) return;

  const std::string distributed = address.database + "_" + address.cluster;
  if (writes) makeDistributedTables(server, address.database, distributed);
  versions = versionsIn(server, distributed);
  if (versions.empty()) {
    throw EngineError(address.name + ": not all servers of cluster " + address.cluster +
                      " have the tables: load into each one once, without \"cluster\" in the "
                      "address");
  }
  checkVersion(server, versions);
  server.use(distributed);
}

}  // namespace tavrel::fleet
