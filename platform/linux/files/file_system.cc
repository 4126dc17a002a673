#include "platform/linux/files/file_system.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <dirent.h>
#include <fcntl.h>
#include <unistd.h>

#include "base/limits.h"
#include "platform/linux/files/file_opening.h"
#include "platform/linux/files/folder_walk.h"
#include "platform/linux/files/random.h"
#include "platform/linux/files/system_error.h"

namespace tavrel {
namespace {

constexpr std::string_view kTemporaryPrefix = ".tavrel-";
constexpr std::string_view kTemporarySuffix = ".tmp";

bool isTemporary(std::string_view name) {
  return name.size() > kTemporaryPrefix.size() + kTemporarySuffix.size() &&
         name.starts_with(kTemporaryPrefix) && name.ends_with(kTemporarySuffix);
}

Error tooLarge(const std::string& path, std::size_t largest) {
  return Error{"cannot use " + path + ": it has more than " + std::to_string(largest) +
               " bytes; move it away"};
}

// Gives a new version of `path` the owner and the mode of the former one, without permissions of
// other users that `mode` does not grant.
Status takeOwnerAndMode(int descriptor, const struct stat& fresh, const std::string& path,
                        mode_t mode) {
  const auto former = FileSystem::status(path);
  if (!former || !S_ISREG(former->st_mode)) return Done{};
  // Owner first: a change of owner clears the set-user bits of the mode.
  if (former->st_uid != fresh.st_uid || former->st_gid != fresh.st_gid) {
    // Only root can do this; others own the new file.
    [[maybe_unused]] const int code = fchown(descriptor, former->st_uid, former->st_gid);
  }
  const mode_t withheld = S_IRWXO & ~mode;
  if (fchmod(descriptor, former->st_mode & 07777U & ~withheld) != 0) {
    return systemError("set the mode of", path);
  }
  return Done{};
}

}  // namespace

// -- New files ----------------------------------------------------------------------------------

NewFile::NewFile(FileSystem& fileSystem, std::string path, std::string temporary,
                 Descriptor descriptor)
    : fileSystem_(fileSystem),
      path_(std::move(path)),
      temporary_(std::move(temporary)),
      descriptor_(std::move(descriptor)) {}

NewFile::NewFile(NewFile&& other) noexcept
    : fileSystem_(other.fileSystem_),
      path_(std::move(other.path_)),
      temporary_(std::exchange(other.temporary_, {})),
      descriptor_(std::move(other.descriptor_)),
      flushed_(other.flushed_) {}

NewFile::~NewFile() {
  if (!temporary_.empty()) fileSystem_.removeFile(temporary_.c_str());
}

Status NewFile::write(ByteSpan bytes) {
  flushed_ = false;
  return fileSystem_.writeAll(descriptor_.get(), bytes, path_);
}

Status NewFile::flush() {
  if (flushed_) return Done{};
  if (fileSystem_.syncFile(descriptor_.get()) != 0) return systemError("flush", path_);
  flushed_ = true;
  return Done{};
}

Status NewFile::commit() {
  if (Status flushed = flush(); !flushed) return flushed;
  if (fileSystem_.renameFile(temporary_.c_str(), path_.c_str()) != 0) {
    return systemError("put in place", path_);
  }
  temporary_.clear();
  descriptor_.reset();
  return fileSystem_.syncFolderOf(path_);
}

// -- Reading ------------------------------------------------------------------------------------

Expected<std::optional<std::string>> FileSystem::readIfPresent(const std::string& path,
                                                               std::size_t largest) {
  Descriptor descriptor(openFile(path.c_str(), O_RDONLY | kOpenSafely, 0));
  if (!descriptor) {
    if (errno == ENOENT || errno == ENOTDIR) return std::optional<std::string>();
    return systemError("read", path);
  }
  struct stat status {};
  if (fstat(descriptor.get(), &status) != 0) return systemError("read", path);
  if (!S_ISREG(status.st_mode)) return notRegular(path, status.st_mode);
  const auto size = static_cast<std::uint64_t>(std::max<off_t>(status.st_size, 0));
  if (size > largest) return tooLarge(path, largest);

  // One byte more than the file's size, so that the first read usually reaches the end. The
  // kernel's own files show no size in advance.
  std::string content;
  std::size_t filled = 0;
  std::size_t room = std::max<std::size_t>(static_cast<std::size_t>(size), 511) + 1;
  while (true) {
    content.resize(room);
    const ssize_t got = ::read(descriptor.get(), content.data() + filled, room - filled);
    if (got < 0) {
      if (errno == EINTR) continue;
      return systemError("read", path);
    }
    if (got == 0) break;
    filled += static_cast<std::size_t>(got);
    if (filled > largest) return tooLarge(path, largest);
    if (filled == room) room *= 2;
  }
  content.resize(filled);
  return std::optional(std::move(content));
}

Expected<std::string> FileSystem::read(const std::string& path, std::size_t largest) {
  auto content = readIfPresent(path, largest);
  if (!content) return content.error();
  if (!*content) return systemError("read", path, ENOENT);
  return *std::move(*content);
}

Expected<std::vector<std::string>> FileSystem::list(const std::string& folder) {
  std::vector<std::string> names;
  const int code = walkFolder(folder, [&names](const dirent& entry) {
    if (entry.d_name[0] != '.') names.emplace_back(entry.d_name);
    return true;
  });
  if (code != 0 && code != ENOENT) return systemError("list", folder, code);
  std::sort(names.begin(), names.end());
  return names;
}

std::optional<struct stat> FileSystem::status(const std::string& path) {
  struct stat status {};
  if (::stat(path.c_str(), &status) != 0) return std::nullopt;
  return status;
}

bool FileSystem::isClosed(const std::string& path) {
  return access(path.c_str(), R_OK) != 0 && errno == EACCES;
}

// -- Writing ------------------------------------------------------------------------------------

Expected<NewFile> FileSystem::create(const std::string& path, mode_t mode) {
  const std::string folder = folderOf(path);
  std::string temporary;
  Descriptor descriptor;
  bool foldersMade = false;
  while (!descriptor) {
    temporary = folder + "/";
    temporary += kTemporaryPrefix;
    temporary += randomName();
    temporary += kTemporarySuffix;
    descriptor =
        Descriptor(openFile(temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | kOpenSafely, mode));
    if (descriptor || errno == EEXIST) continue;
    if (errno != ENOENT || foldersMade) return systemError("write", path);
    if (Status made = makeFolders(folder); !made) return made.error();
    foldersMade = true;
  }
  NewFile file(*this, path, std::move(temporary), std::move(descriptor));

  struct stat fresh {};
  if (fstat(file.descriptor_.get(), &fresh) == 0 && tidiedFolders_.insert(folder).second) {
    removeStaleTemporaries(folder, fresh);
  }
  const Status taken = takeOwnerAndMode(file.descriptor_.get(), fresh, path, mode);
  if (!taken) return taken.error();
  return file;
}

Status FileSystem::replace(const std::string& path, ByteSpan bytes, mode_t mode) {
  Expected<NewFile> file = create(path, mode);
  if (!file) return file.error();
  if (Status written = file->write(bytes); !written) return written;
  return file->commit();
}

Expected<Descriptor> FileSystem::openOrMake(const std::string& path, int flags, mode_t mode) {
  flags |= O_CREAT | O_NOFOLLOW | kOpenSafely;
  Descriptor descriptor(openFile(path.c_str(), flags, mode));
  if (!descriptor && errno == ENOENT) {
    if (Status made = makeFolders(folderOf(path)); !made) return made.error();
    descriptor = Descriptor(openFile(path.c_str(), flags, mode));
  }
  if (!descriptor) return cannotOpen("write", path);
  return descriptor;
}

Expected<AppendedFile> FileSystem::openToAppend(const std::string& path, mode_t mode) {
  Expected<Descriptor> descriptor = openOrMake(path, O_RDWR | O_APPEND, mode);
  if (!descriptor) return descriptor.error();
  struct stat status {};
  if (fstat(descriptor->get(), &status) != 0) return systemError("write", path);
  if (!S_ISREG(status.st_mode)) return notRegular(path, status.st_mode);
  AppendedFile file(*this, path, *std::move(descriptor));
  if (Status cut = file.cutTornEnd(status.st_size); !cut) return cut.error();
  return file;
}

Status FileSystem::rename(const std::string& from, const std::string& to) {
  if (renameFile(from.c_str(), to.c_str()) != 0) {
    const int code = errno;
    return systemError("move " + from + " to", to, code);
  }
  if (Status synced = syncFolderOf(to); !synced) return synced;
  if (folderOf(from) == folderOf(to)) return Done{};
  return syncFolderOf(from);
}

Status FileSystem::link(const std::string& path, const std::string& name) {
  if (linkFile(path.c_str(), name.c_str()) != 0) {
    const int code = errno;
    const auto file = status(path);
    const auto named = status(name);
    const bool isLinked =
        file && named && file->st_dev == named->st_dev && file->st_ino == named->st_ino;
    if (!isLinked) return systemError("link " + path + " to", name, code);
  }
  return syncFolderOf(name);
}

Status FileSystem::remove(const std::string& path) {
  if (removeFile(path.c_str()) == 0 || errno == ENOENT) return Done{};
  if (errno == EISDIR) return notRegular(path, S_IFDIR);
  return systemError("remove", path);
}

Status FileSystem::makeFolders(const std::string& path) {
  if (makeFolder(path.c_str(), 0755) == 0) return syncFolderOf(path);
  if (errno == EEXIST) return Done{};
  const std::string parent = folderOf(path);
  if (errno != ENOENT || parent == path) return systemError("make the folder", path);
  if (Status made = makeFolders(parent); !made) return made;
  if (makeFolder(path.c_str(), 0755) != 0 && errno != EEXIST) {
    return systemError("make the folder", path);
  }
  return syncFolderOf(path);
}

Status FileSystem::makePrivateFolder(const std::string& path) {
  constexpr mode_t kPrivate = 0700;
  if (Status made = makeFolders(folderOf(path)); !made) return made;
  if (makeFolder(path.c_str(), kPrivate) == 0) return syncFolderOf(path);
  if (errno != EEXIST) return systemError("make the folder", path);
  const Descriptor folder(openFile(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW, 0));
  struct stat found {};
  if (!folder || fstat(folder.get(), &found) != 0) return systemError("use the folder", path);
  if ((found.st_mode & (S_IRWXG | S_IRWXO)) != 0 && fchmod(folder.get(), kPrivate) != 0) {
    return systemError("set the mode of", path);
  }
  return Done{};
}

Status FileSystem::writeAll(int descriptor, ByteSpan bytes, const std::string& path) {
  while (!bytes.empty()) {
    const ssize_t written = writeFile(descriptor, bytes.data(), bytes.size());
    if (written < 0) {
      if (errno == EINTR) continue;
      return systemError("write", path);
    }
    bytes = bytes.subspan(static_cast<std::size_t>(written));
  }
  return Done{};
}

Status FileSystem::syncFolderOf(const std::string& path) {
  return flushFolder(folderOf(path));
}

Status FileSystem::flushFolder(const std::string& folder) {
  const Descriptor descriptor(openFile(folder.c_str(), O_RDONLY | O_DIRECTORY, 0));
  if (!descriptor && errno == ENOENT) return Done{};
  if (!descriptor) return systemError("flush the folder", folder);
  // Some file systems cannot flush folders, and say so with EINVAL.
  if (syncFile(descriptor.get()) != 0 && errno != EINVAL) {
    return systemError("flush the folder", folder);
  }
  return Done{};
}

template <class IsUnwanted>
void FileSystem::removeTemporaries(const std::string& folder, IsUnwanted isUnwanted) {
  walkFolder(folder, [&](const dirent& entry) {
    if (!isTemporary(entry.d_name)) return true;
    const std::string path = folder + "/" + entry.d_name;
    struct stat found {};
    if (lstat(path.c_str(), &found) == 0 && S_ISREG(found.st_mode) && isUnwanted(found)) {
      removeFile(path.c_str());
    }
    return true;
  });
}

// The age is measured by the file system's own clock, from the stamp of a file made just now. The
// process's clock may be wrong, and another process may still be writing a young temporary file.
void FileSystem::removeStaleTemporaries(const std::string& folder, const struct stat& fresh) {
  removeTemporaries(folder, [&fresh](const struct stat& found) {
    const std::int64_t age = std::int64_t{fresh.st_mtim.tv_sec} - found.st_mtim.tv_sec;
    return age > limits::kTemporaryFileSeconds || age < -limits::kTemporaryFileSeconds;
  });
}

void FileSystem::discardTemporaries(const std::string& folder) {
  removeTemporaries(folder, [](const struct stat&) { return true; });
}

// -- System calls -------------------------------------------------------------------------------

int FileSystem::openFile(const char* path, int flags, mode_t mode) {
  int descriptor = -1;
  do {
    descriptor = ::open(path, flags | O_CLOEXEC, mode);
  } while (descriptor < 0 && errno == EINTR);
  return descriptor;
}
ssize_t FileSystem::writeFile(int descriptor, const std::byte* bytes, std::size_t size) {
  return ::write(descriptor, bytes, size);
}
int FileSystem::syncFile(int descriptor) {
  return ::fsync(descriptor);
}
int FileSystem::truncateFile(int descriptor, off_t size) {
  return ::ftruncate(descriptor, size);
}
int FileSystem::renameFile(const char* from, const char* to) {
  return ::rename(from, to);
}
int FileSystem::linkFile(const char* path, const char* name) {
  return ::link(path, name);
}
int FileSystem::removeFile(const char* path) {
  return ::unlink(path);
}
int FileSystem::makeFolder(const char* path, mode_t mode) {
  return ::mkdir(path, mode);
}

}  // namespace tavrel
