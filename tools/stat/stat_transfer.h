// Imports and exports statistics in the form of tools/stat/import_lines.h.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "tools/shared/tool_context.h"

namespace tavrel {

/// Imports a file, or standard input for "-", as one transaction: a bad line ends it, and nothing
/// of the file is kept. Values are appended to a distribution; scalars replace earlier ones.
void importStatistics(ToolContext& context, const std::string& file);

/// Writes the rows whose keys begin with `prefix`, of one day or of all. Names keys that the form
/// cannot hold, and then fails.
void exportStatistics(ToolContext& context, const std::string& prefix,
                      std::optional<std::int32_t> day);

}  // namespace tavrel
