// What the name of a file says of it.
#pragma once

#include <string>
#include <string_view>

namespace tavrel::fleet {

/// tar, as it is or compressed.
bool isArchiveName(std::string_view name);

/// Whether a file of this name in a folder or an archive is looked at: a log or a property list,
/// also in gzip's form, that is neither metadata nor hidden.
bool isLogName(std::string_view name);

bool isMetadataName(std::string_view name);

/// "NAME.metadata.plist" of a log's path "NAME.log" or "NAME.log.gz".
std::string sidecarOf(std::string_view logPath);

/// The file's name in its path, and the name of the folder that holds it; empty when there is none.
std::string_view fileNameOf(std::string_view path);
std::string_view folderNameOf(std::string_view path);

/// Without ".gz".
std::string_view withoutGzip(std::string_view name);

}  // namespace tavrel::fleet
