// Small property lists that somebody keeps by hand below the device root.
#pragma once

#include <string>

#include "base/plist.h"
#include "platform/linux/files/file_system.h"
#include "platform/property_list_coding.h"
#include "platform/system_log.h"

namespace tavrel {

/// The dictionary in a file. An empty handle when the file is missing, and, after a line in the
/// system log, when it cannot be read or is no dictionary.
plist::Dictionary readDictionaryFile(FileSystem& files, PropertyListCoding& propertyLists,
                                     SystemLog& log, const std::string& path);

}  // namespace tavrel
