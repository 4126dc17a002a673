#include "fleet/engine/open/open_engine.h"

#include <string>

#include "fleet/engine/sqlite/sqlite_engine.h"

namespace tavrel::fleet {

std::unique_ptr<Engine> openEngine(std::string_view where, OpenMode mode) {
  return openSqliteEngine(std::string(where), mode == OpenMode::kWrite);
}

}  // namespace tavrel::fleet
