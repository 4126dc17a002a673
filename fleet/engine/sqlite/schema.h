// The tables of an SQLite file, and how a file that has them is opened.
#pragma once

#include <string>

#include "fleet/engine/sqlite/connection.h"

namespace tavrel::fleet {

/// Throws EngineError, before anything touches the file, when it belongs to another program or
/// version. To write, an absent or empty file gets the tables.
Connection openFile(const std::string& path, OpenMode mode);

}  // namespace tavrel::fleet
