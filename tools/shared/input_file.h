// Files that a command line names.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

#include "base/expected.h"
#include "base/plist.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

/// The content of a file of this machine, or of standard input for "-". At most `largest` bytes.
Expected<std::string> readInput(ToolContext& context, const std::string& file, std::size_t largest);

/// A property list of either encoding, or JSON (tools/shared/json_value.h), recognised by content.
/// The error begins with `name`.
Expected<plist::Value> decodeDocument(std::string_view bytes, std::string_view name);

/// Both.
Expected<plist::Value> readDocument(ToolContext& context, const std::string& file);

}  // namespace tavrel
