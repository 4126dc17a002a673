// Opens the database that the command line names.
#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "fleet/engine/engine.h"

namespace tavrel::fleet {

/// A readable fault in the text that names a database; empty when there is none. Checks only
/// the text, not the database.
std::string databaseFault(const std::string& where);

/// The name of a database in messages: the address without its password and options, or the path.
std::string databaseName(const std::string& where);

/// `where` is the path of an SQLite file, or the address of a database on a ClickHouse server:
/// clickhouse://[USER[:PASSWORD]@]HOST[:PORT]/DATABASE[?OPTION=VALUE[&…]], or clickhouses:// over
/// TLS. docs/fleet-tables.md lists the options. Throws EngineError.
std::unique_ptr<Engine> openEngine(std::string_view where, OpenMode mode);

}  // namespace tavrel::fleet
