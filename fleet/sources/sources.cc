#include "fleet/sources/sources.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <sys/stat.h>
#include <utility>
#include <vector>

#include "base/format.h"
#include "base/system_text.h"
#include "fleet/logs/limits.h"
#include "fleet/sources/archive_source.h"
#include "fleet/sources/file_name.h"
#include "fleet/sources/limits.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/files/folder_walk.h"

namespace tavrel::fleet {
namespace {

using Kind = SourceItem::Kind;

void give(const SourceSink& sink, Kind kind, std::string name, std::string reason) {
  SourceItem item;
  item.kind = kind;
  item.name = std::move(name);
  item.reason = std::move(reason);
  sink(std::move(item));
}

std::string cannot(std::string_view what, int code = errno) {
  return format("cannot be %s: %s", what, systemText(code));
}

enum class FileType : std::uint8_t { Regular, Folder, Link, Other };

FileType typeOf(mode_t mode) {
  return S_ISREG(mode)   ? FileType::Regular
         : S_ISDIR(mode) ? FileType::Folder
         : S_ISLNK(mode) ? FileType::Link
                         : FileType::Other;
}

bool isFolder(const std::string& path) {
  struct stat status {};
  return stat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
}

FileType typeOf(int folder, const dirent& entry) {
  switch (entry.d_type) {
    case DT_REG:
      return FileType::Regular;
    case DT_DIR:
      return FileType::Folder;
    case DT_LNK:
      return FileType::Link;
    case DT_UNKNOWN: {
      struct stat status {};
      if (fstatat(folder, entry.d_name, &status, AT_SYMLINK_NOFOLLOW) == 0) {
        return typeOf(status.st_mode);
      }
      return FileType::Other;
    }
    default:
      return FileType::Other;
  }
}

struct Entry {
  std::string name;
  FileType type;
};

class Visit {
 public:
  Visit(const UploadLines& lines, const SourceSink& sink, const std::optional<std::string>& leftOut)
      : lines_(lines), sink_(sink), leftOut_(leftOut) {}

  void folder(const std::string& path, const Descriptor& opened, std::size_t depth) {
    std::vector<Entry> entries;
    const int code = walkFolder(opened, [&](const dirent& entry) {
      if (entry.d_name[0] != '.') entries.push_back({entry.d_name, typeOf(opened.get(), entry)});
      return true;
    });
    // A log whose sidecar is not seen would be filed without its metadata.
    if (code != 0) return give(sink_, Kind::Refused, path, cannot("listed", code));
    std::ranges::sort(entries, {}, &Entry::name);
    for (const Entry& entry : entries) {
      const std::string inner = path.ends_with('/') ? path + entry.name : path + '/' + entry.name;
      if (entry.type == FileType::Folder) {
        // The file system's own, which only root may list.
        if (entry.name == "lost+found") continue;
        subfolder(opened.get(), entry.name, inner, depth);
      } else if (isArchiveName(entry.name)) {
        if (isRegular(entry, inner)) visitArchive(inner, lines_, sink_);
      } else if (isLogName(entry.name)) {
        if (!isRegular(entry, inner)) continue;
        const bool hasSidecar =
            std::ranges::binary_search(entries, sidecarOf(entry.name), {}, &Entry::name);
        log(inner, hasSidecar, false);
      } else if (entry.type == FileType::Link && isFolder(inner)) {
        isRegular(entry, inner);
      }
    }
  }

  void log(const std::string& path, bool hasSidecar, bool mayBeLink) {
    SourceItem item;
    item.mayBeLink = mayBeLink;
    item.name = item.path = path;
    item.hasSidecar = hasSidecar;
    const std::string_view name = withoutGzip(fileNameOf(path));
    const LogMetadata* const line = lineOf(path, name);
    if (line != nullptr && !hasSidecar) item.metadata = *line;
    // With a sidecar, the thread that reads it decides.
    if (!hasSidecar && isOtherLog(name, line)) {
      item.kind = Kind::Other;
    } else if (!hasSidecar && line == nullptr && mayLineFollow(path)) {
      item.kind = Kind::TooNew;
    }
    sink_(std::move(item));
  }

 private:
  /// A device's logs are in a folder of its name. The path may leave that out, as "./a.log" does,
  /// or lead there through a link.
  const LogMetadata* lineOf(const std::string& path, std::string_view log) {
    const LogMetadata* const line = lines_.find(folderNameOf(path), log);
    if (line != nullptr || lines_.empty()) return line;
    return lines_.find(realFolderNameOf(path), log);
  }

  const std::string& realFolderNameOf(const std::string& path) {
    const auto folder = std::filesystem::path(path).parent_path();
    if (folder != resolved_) {
      std::error_code unknown;
      const auto absolute = std::filesystem::absolute(path, unknown).parent_path();
      realName_ = std::filesystem::canonical(absolute, unknown).filename().native();
      resolved_ = folder;
    }
    return realName_;
  }

  bool mayLineFollow(const std::string& path) const {
    struct stat status {};
    return stat(path.c_str(), &status) == 0 && lines_.mayFollow(status.st_mtime);
  }

  bool isRegular(const Entry& entry, const std::string& path) {
    if (entry.type == FileType::Regular) return true;
    give(sink_, Kind::Skipped, path,
         entry.type == FileType::Link ? "is a symbolic link" : "is not a regular file");
    return false;
  }

  void subfolder(int parent, const std::string& name, const std::string& path, std::size_t depth) {
    if (depth == limits::kFolderDepth) {
      return give(sink_, Kind::Refused, path,
                  format("is nested in more than %zu folders", limits::kFolderDepth));
    }
    Descriptor opened(
        openat(parent, name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (!opened) return give(sink_, Kind::Refused, path, cannot("opened"));
    if (!isLeftOut(opened)) folder(path, opened, depth + 1);
  }

  bool isLeftOut(const Descriptor& opened) const {
    struct stat found {};
    struct stat leftOut {};
    return leftOut_ && stat(leftOut_->c_str(), &leftOut) == 0 && fstat(opened.get(), &found) == 0 &&
           found.st_dev == leftOut.st_dev && found.st_ino == leftOut.st_ino;
  }

  const UploadLines& lines_;
  const SourceSink& sink_;
  const std::optional<std::string>& leftOut_;
  std::optional<std::filesystem::path> resolved_;  // the folder whose name `realName_` is
  std::string realName_;
};

}  // namespace

void visitSources(const std::string& path, const UploadLines& lines, const SourceSink& sink,
                  const std::optional<std::string>& leftOut) {
  struct stat status {};
  if (stat(path.c_str(), &status) != 0) return give(sink, Kind::Refused, path, cannot("found"));
  Visit visit(lines, sink, leftOut);
  if (S_ISDIR(status.st_mode)) {
    Descriptor opened(open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (!opened) return give(sink, Kind::Refused, path, cannot("opened"));
    visit.folder(path, opened, 0);
  } else if (!S_ISREG(status.st_mode)) {
    give(sink, Kind::Refused, path, "is not a regular file");
  } else if (isArchiveName(path)) {
    visitArchive(path, lines, sink);
  } else {
    visit.log(path, access(sidecarOf(path).c_str(), F_OK) == 0, true);
  }
}

Expected<std::string> readSourceFile(const std::string& path, std::size_t limit, bool mayBeLink) {
  const Descriptor file(open(
      path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY | (mayBeLink ? 0 : O_NOFOLLOW)));
  if (!file) return Error{cannot("read")};
  struct stat status {};
  if (fstat(file.get(), &status) != 0) return Error{cannot("read")};
  if (!S_ISREG(status.st_mode)) return Error{"is not a regular file"};
  if (static_cast<std::uint64_t>(status.st_size) > limit) {
    return Error{format("has more than %zu bytes", limit)};
  }
  // Reading one byte more than its size shows whether the file has grown.
  std::string bytes(static_cast<std::size_t>(status.st_size) + 1, '\0');
  std::size_t size = 0;
  while (size < bytes.size()) {
    const ssize_t got = read(file.get(), bytes.data() + size, bytes.size() - size);
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) return Error{cannot("read")};
    if (got == 0) break;
    size += static_cast<std::size_t>(got);
  }
  if (size == bytes.size()) return Error{"grows while it is read"};
  bytes.resize(size);
  return bytes;
}

}  // namespace tavrel::fleet
