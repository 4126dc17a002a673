// The tables of a ClickHouse database.
#pragma once

#include "fleet/engine/clickhouse/server.h"

namespace tavrel::fleet {

/// Selects the database's tables, or those of its cluster, on the server and checks their version.
/// Makes missing tables when it may write. Throws EngineError.
void openTables(Server& server, OpenMode mode);

}  // namespace tavrel::fleet
