// An engine that keeps its tables in one SQLite file. docs/fleet-tables.md describes them.
#pragma once

#include <memory>
#include <string>

#include "fleet/engine/engine.h"

namespace tavrel::fleet {

/// Throws EngineError. To write, an absent or empty file becomes a database; to read, the file
/// is opened read-only. A file that is not a database of this program is left unchanged.
std::unique_ptr<Engine> openSqliteEngine(const std::string& path, OpenMode mode);

}  // namespace tavrel::fleet
