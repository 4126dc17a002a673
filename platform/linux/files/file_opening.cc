#include "platform/linux/files/file_opening.h"

#include <cerrno>
#include <sys/stat.h>

#include "platform/linux/files/system_error.h"

namespace tavrel {

std::string folderOf(const std::string& path) {
  const std::size_t slash = path.rfind('/');
  if (slash == std::string::npos) return ".";
  return slash == 0 ? "/" : path.substr(0, slash);
}

Error notRegular(const std::string& path, mode_t mode) {
  const char* kind = S_ISDIR(mode) ? "a folder" : "not a regular file";
  return Error{"cannot use " + path + ": it is " + kind + "; move it away"};
}

Error cannotOpen(std::string_view what, const std::string& path) {
  if (errno != ELOOP) return systemError(what, path);
  return Error{"cannot use " + path + ": it is a symbolic link; move it away"};
}

}  // namespace tavrel
