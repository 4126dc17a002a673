// Statistics into the store and out of it, in the form of tools/stat/import_lines.h.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "tools/shared/tool_context.h"

namespace tavrel {

/// Imports a file, "-" being standard input, as one transaction: a bad line stops it, and nothing
/// of the file is kept. Values are appended to what a distribution already has; scalars replace.
void importStatistics(ToolContext& context, const std::string& file);

/// Writes what is held of the keys that begin with `prefix`, of one day or of all. Keys that the
/// form cannot hold are named and make the command fail.
void exportStatistics(ToolContext& context, const std::string& prefix,
                      std::optional<std::int32_t> day);

}  // namespace tavrel
