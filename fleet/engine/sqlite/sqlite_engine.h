// An engine that keeps its tables in one SQLite file. docs/fleet-tables.md describes them.
#pragma once

#include <memory>
#include <string>

#include "fleet/engine/engine.h"

namespace tavrel::fleet {

/// Throws EngineError. With `writes`, an absent or empty file becomes a database; without, the file
/// is opened for reading only. A file that is no database of this program stays as it is.
std::unique_ptr<Engine> openSqliteEngine(const std::string& path, bool writes);

}  // namespace tavrel::fleet
