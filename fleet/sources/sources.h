// Finds logs: in files, folders, archives.
#pragma once

#include <optional>
#include <string>

#include "base/expected.h"
#include "fleet/sources/source_item.h"
#include "fleet/sources/upload_lines.h"

namespace tavrel::fleet {

/// Hands out what is at `path`, ordered by name: a folder with everything below it, an archive, or
/// a file, which is taken for a log whatever its name. Does not follow links in folders, and leaves
/// the folder `leftOut` out where it is below `path`, even when it is made during the visit.
void visitSources(const std::string& path, const UploadLines& lines, const SourceSink& sink,
                  const std::optional<std::string>& leftOut = std::nullopt);

/// The bytes of a regular file of at most `limit` bytes. The error is the
/// reason, without the file's name.
Expected<std::string> readSourceFile(const std::string& path, std::size_t limit, bool mayBeLink);

}  // namespace tavrel::fleet
