// Freezes the machine's live channels into a recording.
#pragma once

#include <cstdint>

#include "base/plist.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

/// All live services with their channels' elements: one sample now and one more each second for
/// `seconds` seconds, which a hub plays back in order. SIGINT, SIGTERM or a full document end it
/// early, with a note. Channels without a value in any sample are published but unknown to their
/// hub. Returns an empty handle after a message that says why.
plist::Dictionary recordLive(ToolContext& context, std::uint32_t seconds);

}  // namespace tavrel
