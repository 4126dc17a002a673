// tavrelctl send, notify: a client of the service, and the notifications.
#pragma once

#include <string_view>

#include "base/expected.h"
#include "base/plist.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

void addSendCommands(Command app, ToolContext& context);

/// The "app_data" of a delivery: `applications` from a file, checked, with each "uuid" as 16 bytes.
/// The error names the wrong element and entry.
Expected<plist::Array> appDataOf(const plist::Value& applications);

}  // namespace tavrel
