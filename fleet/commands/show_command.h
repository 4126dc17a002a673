// tavrel-fleet show
#pragma once

#include "fleet/commands/fleet_context.h"

namespace tavrel::fleet {

void addShowCommand(Command top, FleetContext& context);

}  // namespace tavrel::fleet
