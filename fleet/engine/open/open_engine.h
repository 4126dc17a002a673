// Opens the database that a text of the command line names.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "fleet/engine/engine.h"

namespace tavrel::fleet {

enum class OpenMode : std::uint8_t {
  kRead,   ///< the database must be there
  kWrite,  ///< makes it, or its tables, where they are missing
};

/// What is wrong with the text that names a database, in words; empty when nothing is. Looks at the
/// text only.
std::string databaseFault(const std::string& where);

/// `where` is the path of an SQLite file, or the address of a database on a ClickHouse server:
/// clickhouse://[USER[:PASSWORD]@]HOST[:PORT]/DATABASE[?OPTION=VALUE[&…]], clickhouses:// over TLS.
/// docs/fleet-tables.md has the options. Throws EngineError.
std::unique_ptr<Engine> openEngine(std::string_view where, OpenMode mode);

}  // namespace tavrel::fleet
