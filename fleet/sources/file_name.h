// What the name of a file says about it.
#pragma once

#include <string>
#include <string_view>

namespace tavrel::fleet {

/// A tar archive, plain or compressed.
bool isArchiveName(std::string_view name);

/// Whether a file of this name in a folder or an archive is considered: a log or a property list,
/// possibly compressed with gzip, that is neither metadata nor hidden.
bool isLogName(std::string_view name);

bool isMetadataName(std::string_view name);

/// "NAME.metadata.plist" for a log at "NAME.log" or "NAME.log.gz".
std::string sidecarOf(std::string_view logPath);

/// The last component of a path, and the name of the folder that holds the file; empty without one.
std::string_view fileNameOf(std::string_view path);
std::string_view folderNameOf(std::string_view path);

/// The name without ".gz".
std::string_view withoutGzip(std::string_view name);

}  // namespace tavrel::fleet
