#include "tools/check/read_only.h"

#include <fcntl.h>
#include <fstream>
#include <iterator>
#include <sys/stat.h>
#include <sys/statvfs.h>

#include "base/ascii.h"

namespace tavrel {

// "ID PARENT MAJOR:MINOR ROOT POINT OPTIONS TAGS - TYPE SOURCE OPTIONS"; the last options are those
// of the file system.
bool isReadOnlyIn(std::string_view mountinfo, std::uint64_t mount) {
  const std::string id = std::to_string(mount) + ' ';
  while (!mountinfo.empty()) {
    const std::string_view line = takeLine(mountinfo);
    if (!line.starts_with(id)) continue;
    const std::string_view options = line.substr(line.rfind(' ') + 1);
    return options == "ro" || options.starts_with("ro,");
  }
  return false;
}

bool isOnReadOnlyFileSystem(const std::string& path) {
  struct statvfs space {};
  if (statvfs(path.c_str(), &space) != 0 || (space.f_flag & ST_RDONLY) == 0) return false;
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
