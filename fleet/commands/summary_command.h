// tavrel-fleet summary
#pragma once

#include "fleet/commands/fleet_context.h"

namespace tavrel::fleet {

void addSummaryCommand(Command top, FleetContext& context);

}  // namespace tavrel::fleet
