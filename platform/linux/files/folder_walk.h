// The entries of a folder, one by one.
#pragma once

#include <dirent.h>
#include <functional>
#include <string>

#include "platform/linux/files/descriptor.h"

namespace tavrel {

/// Hands each entry but "." and ".." to `take`, in the folder's own order, until it answers false.
/// 0, or the error number of what ended the walk early: ENOENT for a missing folder. In place of
/// the iterators of std::filesystem, which end the program when a path gets no memory.
int walkFolder(const std::string& folder, const std::function<bool(const dirent&)>& take);
/// The same for an open folder, from its start.
int walkFolder(const Descriptor& folder, const std::function<bool(const dirent&)>& take);

}  // namespace tavrel
