// Imports and exports statistics in the format of tools/stat/import_lines.h.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "tools/shared/tool_context.h"

namespace tavrel {

/// Imports a file, or standard input for "-", in one transaction: a malformed line ends it and
/// undoes the whole file. Values are appended to a distribution; scalars replace earlier ones.
void importStatistics(ToolContext& context, const std::string& file);

/// Writes the rows whose keys begin with `prefix`, for one day or all days. When the format cannot
/// represent some keys, names them and fails.
void exportStatistics(ToolContext& context, const std::string& prefix,
                      std::optional<std::int32_t> day);

}  // namespace tavrel
