// tavrel-fleet completion: for shells.
#pragma once

#include "fleet/commands/fleet_context.h"

namespace tavrel::fleet {

void addCompletionCommand(Command top, FleetContext& context);

}  // namespace tavrel::fleet
