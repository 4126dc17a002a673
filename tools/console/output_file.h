// Output files named on the command line.
#pragma once

#include <string>
#include <string_view>

#include "base/expected.h"
#include "tools/console/tool_output.h"

namespace tavrel {

/// Whether a file's folder exists. A missing one is probably a typing error, so do not make it.
Status checkFolder(const std::string& file);

/// Whether `writeOutput` takes the file, for commands that work long before they write.
Status checkOutput(const std::string& file);

/// Atomically replaces the content of a file of this machine with `bytes`; "-" is standard output.
/// The folder must exist. Refuses to replace anything but a regular file.
Status writeOutput(ToolOutput& output, const std::string& file, std::string_view bytes);

}  // namespace tavrel
