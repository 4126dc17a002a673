#include "platform/linux/files/folder_walk.h"

#include <cerrno>
#include <memory>
#include <string_view>

namespace tavrel {

int walkFolder(const std::string& folder, const std::function<bool(const dirent&)>& take) {
  using Folder = std::unique_ptr<DIR, decltype([](DIR* open) { closedir(open); })>;
  const Folder open(opendir(folder.c_str()));
  if (!open) return errno;
  for (;;) {
    errno = 0;
    const dirent* const entry = readdir(open.get());
    if (entry == nullptr) return errno;
    const std::string_view name = entry->d_name;
    if (name != "." && name != ".." && !take(*entry)) return 0;
  }
}

}  // namespace tavrel
