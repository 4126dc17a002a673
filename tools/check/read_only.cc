#include "tools/check/read_only.h"

#include <fcntl.h>
#include <fstream>
#include <iterator>
#include <sys/stat.h>

#include "base/ascii.h"

namespace tavrel {

// "ID PARENT MAJOR:MINOR ROOT POINT OPTIONS TAGS - TYPE SOURCE OPTIONS"; the last options are those
// of the file system. After an error ext4 stays "rw" and adds "emergency_ro".
bool isReadOnlyIn(std::string_view mountinfo, std::uint64_t mount) {
  const std::string id = std::to_string(mount) + ' ';
  while (!mountinfo.empty()) {
    const std::string_view line = takeLine(mountinfo);
    if (!line.starts_with(id)) continue;
    const std::string options = ',' + std::string(line.substr(line.rfind(' ') + 1)) + ',';
    return options.find(",ro,") != std::string::npos ||
           options.find(",emergency_ro,") != std::string::npos;
  }
  return false;
}

bool isOnReadOnlyFileSystem(const std::string& path) {
  struct statx status {};
  if (statx(AT_FDCWD, path.c_str(), 0, STATX_MNT_ID, &status) != 0 ||
      (status.stx_mask & STATX_MNT_ID) == 0) {
    return false;
  }
  std::ifstream file("/proc/self/mountinfo");
  const std::string mountinfo{std::istreambuf_iterator<char>(file), {}};
  return isReadOnlyIn(mountinfo, status.stx_mnt_id);
}

}  // namespace tavrel
