// Input files named on the command line.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

#include "base/expected.h"
#include "base/plist.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

/// Completes the error of a device without a whitelist.
inline constexpr const char* kWriteWhitelist = ": write a whitelist, as tavrel(8) describes it";

/// The content, at most `largest` bytes, of a file of this machine, or of standard input for "-".
Expected<std::string> readInput(ToolContext& context, const std::string& file, std::size_t largest);

/// Decodes a property list in either encoding, or JSON (tools/console/json_value.h); recognises the
/// format from the content. The error begins with `name`.
Expected<plist::Value> decodeDocument(std::string_view bytes, std::string_view name);

/// Reads and decodes a file.
Expected<plist::Value> readDocument(ToolContext& context, const std::string& file);

}  // namespace tavrel
