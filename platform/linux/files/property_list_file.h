// Small property lists below the device root that people edit.
#pragma once

#include <string>
#include <string_view>
#include <sys/stat.h>

#include "base/plist.h"
#include "platform/linux/files/file_system.h"
#include "platform/property_list_coding.h"
#include "platform/system_log.h"

namespace tavrel {

/// The dictionary in a file. An empty handle when the file is missing or, with a line in the system
/// log, when it cannot be read or is not a dictionary.
plist::Dictionary readDictionaryFile(FileSystem& files, PropertyListCoding& propertyLists,
                                     SystemLog& log, const std::string& path);

/// The dictionary in the bytes of the file `path`. An empty handle, with a line in the system log,
/// when they are no dictionary.
plist::Dictionary dictionaryIn(std::string_view bytes, PropertyListCoding& propertyLists,
                               SystemLog& log, const std::string& path);

/// Why a file of settings that is not found may exist all the same: it or its folder is a link that
/// leads nowhere, as to a file system that is not mounted. Empty when it is surely absent.
std::string reasonToMiss(const std::string& path);

/// Why a file of settings that decide about other users' data cannot be trusted: users other than
/// root and this process's may write it, or its owner is unknown. Empty when it can be trusted.
std::string reasonToDistrust(const std::string& path);
std::string reasonToDistrust(const struct stat& status);

}  // namespace tavrel
