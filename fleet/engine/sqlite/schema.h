// The tables of an SQLite file, and opening a file that has them.
#pragma once

#include <string>

#include "fleet/engine/sqlite/connection.h"

namespace tavrel::fleet {

/// Throws EngineError for a file that is not this program's, or of another version, before anything
/// touches it. With `writes`, an absent or empty file gets the tables.
Connection openFile(const std::string& path, bool writes);

}  // namespace tavrel::fleet
