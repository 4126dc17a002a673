// Counts the days on which the device fails to read the store's file.
#pragma once

#include <cstdint>
#include <string>

#include "platform/linux/store/sqlite_site.h"

namespace tavrel {

/// Notes in the file `note` that `store` could not be read on `day`. Returns on how many days that
/// was noted, up to now. A clock that is set ahead adds none: within one boot, half a day must pass
/// in between.
std::int64_t countUnreadableDay(const std::string& note, const FileIdentity& store,
                                std::int64_t day);

}  // namespace tavrel
