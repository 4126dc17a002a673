// An engine that keeps its tables on a ClickHouse server. docs/fleet-tables.md describes them.
#pragma once

#include <memory>
#include <string_view>

#include "fleet/engine/engine.h"

namespace tavrel::fleet {

/// address.h has the form of the address. Throws EngineError.
std::unique_ptr<Engine> openClickhouseEngine(std::string_view address, OpenMode mode);

}  // namespace tavrel::fleet
