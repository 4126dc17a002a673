// tavrel-fleet load
#pragma once

#include "fleet/commands/fleet_context.h"

namespace tavrel::fleet {

void addLoadCommand(Command top, FleetContext& context);

}  // namespace tavrel::fleet
