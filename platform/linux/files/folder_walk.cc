#include "platform/linux/files/folder_walk.h"

#include <cerrno>
#include <fcntl.h>
#include <memory>
#include <string_view>

namespace tavrel {
namespace {

int walk(DIR* opened, const std::function<bool(const dirent&)>& take) {
  using Folder = std::unique_ptr<DIR, decltype([](DIR* open) { closedir(open); })>;
  const Folder folder(opened);
  if (!folder) return errno;
  for (;;) {
    errno = 0;
    const dirent* const entry = readdir(folder.get());
    if (entry == nullptr) return errno;
    const std::string_view name = entry->d_name;
    if (name != "." && name != ".." && !take(*entry)) return 0;
  }
}

}  // namespace

int walkFolder(const std::string& folder, const std::function<bool(const dirent&)>& take) {
  return walk(opendir(folder.c_str()), take);
}

int walkFolder(const Descriptor& folder, const std::function<bool(const dirent&)>& take) {
  Descriptor again(openat(folder.get(), ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  DIR* const opened = again ? fdopendir(again.get()) : nullptr;
  if (opened != nullptr) again.release();
  return walk(opened, take);
}

}  // namespace tavrel
