// tavrelctl send, notify: a client of the service, and the notifications.
#pragma once

#include "base/expected.h"
#include "base/plist.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

void addSendCommands(Command app, ToolContext& context);
void addNotifyCommands(Command app, ToolContext& context);

/// Checks `applications`, as written in a file, and returns them as the "app_data" of a delivery.
/// The error names the element and the entry that is wrong.
Expected<plist::Array> appDataOf(const plist::Value& applications);

}  // namespace tavrel
