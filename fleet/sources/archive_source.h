// The logs in a tar archive.
#pragma once

#include <string>

#include "fleet/sources/source_item.h"
#include "fleet/sources/upload_lines.h"

namespace tavrel::fleet {

/// Hands out the members that are logs, in the order of the archive. Reads the archive twice,
/// because the metadata of a log comes after it.
void visitArchive(const std::string& path, const UploadLines& lines, const SourceSink& sink);

}  // namespace tavrel::fleet
