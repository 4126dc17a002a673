// tavrel-fleet compare
#pragma once

#include "fleet/commands/fleet_context.h"

namespace tavrel::fleet {

void addCompareCommand(Command top, FleetContext& context);

}  // namespace tavrel::fleet
