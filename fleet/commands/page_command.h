// tavrel-fleet page
#pragma once

#include "fleet/commands/fleet_context.h"

namespace tavrel::fleet {

void addPageCommand(Command top, FleetContext& context);

}  // namespace tavrel::fleet
