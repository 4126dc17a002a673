// The tables of a ClickHouse database.
#pragma once

#include "fleet/engine/clickhouse/server.h"

namespace tavrel::fleet {

/// Makes the server use the database's tables, or those of its cluster, and checks their version.
/// With `writes`, missing ones are made. Throws EngineError.
void openTables(Server& server, bool writes);

}  // namespace tavrel::fleet
