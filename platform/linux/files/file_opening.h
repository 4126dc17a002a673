// How files are opened, and why they cannot be used.
#pragma once

#include <fcntl.h>
#include <string>
#include <string_view>
#include <sys/types.h>

#include "base/expected.h"

namespace tavrel {

/// Opening must not wait for the other end of a FIFO, nor make a terminal the controlling one.
inline constexpr int kOpenSafely = O_NONBLOCK | O_NOCTTY;

/// The folder that holds `path`; "." for a name alone.
std::string folderOf(const std::string& path);

/// The error for something of the kind `mode` where a regular file is expected.
Error notRegular(const std::string& path, mode_t mode);

/// The error, from `errno`, for a file that was opened without following links.
Error cannotOpen(std::string_view what, const std::string& path);

}  // namespace tavrel
