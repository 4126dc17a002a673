#include "tools/shared/output_file.h"

#include <cerrno>
#include <cstring>
#include <filesystem>
#include <ostream>

#include "base/format.h"
#include "platform/linux/files/file_system.h"

namespace tavrel {

Status writeOutput(ToolOutput& output, const std::string& file, std::string_view bytes) {
  if (file == "-") {
    output.out() << bytes;
    return Done{};
  }
  if (file.empty()) return Error{"--output is empty: name a file, or - for standard output"};
  // Replacing a device or a pipe by a file is never intended.
  const auto status = FileSystem::status(file);
  if (status && !S_ISREG(status->st_mode)) {
    return Error{format("cannot write %s: it is not a regular file: use -o - and redirect", file)};
  }
  const auto path = std::filesystem::absolute(file);
  // Missing folders are a typing error here; do not make them.
  const auto folder = path.parent_path().string();
  if (!FileSystem::status(folder)) {
    const char* const reason = std::strerror(errno);
    return Error{format("cannot write %s: %s: %s", file, folder, reason)};
  }
  return FileSystem().replace(path.string(), asBytes(bytes), 0644);
}

}  // namespace tavrel
