// Freezes what the machine shows live into a recording.
#pragma once

#include <cstdint>

#include "base/plist.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

/// All live services with the elements of their channels: one sample now and one after each of so
/// many seconds, which a hub plays back in their order. Channels without a value in any of them are
/// published, but not known to its hub. An empty handle after a message that says why.
plist::Dictionary recordLive(ToolContext& context, std::uint32_t seconds);

}  // namespace tavrel
