#include "tools/console/output_file.h"

#include <cerrno>
#include <filesystem>
#include <ostream>

#include "base/format.h"
#include "base/system_text.h"
#include "platform/linux/files/file_system.h"

namespace tavrel {

Status checkFolder(const std::string& file) {
  const auto folder = std::filesystem::absolute(file).parent_path().string();
  if (FileSystem::status(folder)) return Done{};
  const std::string reason = systemText(errno);
  return Error{format("cannot write %s: %s: %s: create this folder", file, folder, reason)};
}

Status checkOutput(const std::string& file) {
  if (file == "-") return Done{};
  // Nobody intends to replace a device or a pipe with a file.
  const auto status = FileSystem::status(file);
  if (status && !S_ISREG(status->st_mode)) {
    return Error{
        format("cannot write %s: it is not a regular file: write to - and redirect", file)};
  }
  // Replacing a link would leave its target as it was. Following it could replace a file that
  // somebody else chose.
  std::error_code ignored;
  if (std::filesystem::is_symlink(file, ignored)) {
    return Error{format("cannot write %s: it is a symbolic link: name its target", file)};
  }
  return checkFolder(file);
}

Status writeOutput(ToolOutput& output, const std::string& file, std::string_view bytes) {
  if (Status usable = checkOutput(file); !usable) return usable;
  if (file == "-") {
    output.out() << bytes;
    return Done{};
  }
  return FileSystem().replace(std::filesystem::absolute(file).string(), asBytes(bytes), 0644);
}

}  // namespace tavrel
