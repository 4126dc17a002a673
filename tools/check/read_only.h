// Whether a file system has become read-only, as one does after errors.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace tavrel {

/// Whether the file system of `path` is read-only for everybody. False for one that only a mount of
/// this process shows as read-only, as services are confined, and when it cannot be told.
bool isOnReadOnlyFileSystem(const std::string& path);

/// The same for a mount, by its ID, from the text of /proc/self/mountinfo.
bool isReadOnlyIn(std::string_view mountinfo, std::uint64_t mount);

}  // namespace tavrel
