// Interposes the C library's functions for files: calls that concern memory_files.h go there, all
// others to the kernel or the library. Readers, libstdc++, libarchive and zlib all use these.
#include <bit>
#include <cerrno>
#include <cstdarg>
#include <cstdlib>
#include <cstring>
#include <dirent.h>
#include <dlfcn.h>
#include <fcntl.h>
#include <set>
#include <sys/file.h>
#include <sys/mman.h>
#include <sys/statfs.h>
#include <sys/statvfs.h>
#include <sys/syscall.h>
#include <unistd.h>

#include "memory_files.h"

using tavrel::fuzz::MemoryFiles;
using tavrel::fuzz::MemoryHandle;
using tavrel::fuzz::MemoryNode;

namespace {

constexpr long kTmpfsMagic = 0x01021994;

/// A folder being listed: its names at the time when it was opened.
struct Listing {
  int descriptor;
  std::vector<std::pair<std::string, unsigned char>> entries;
  std::size_t next = 0;
  dirent entry = {};
};

std::set<void*>& listings() {
  static std::set<void*> open;
  return open;
}

Listing* listingOf(DIR* folder) {
  const std::lock_guard lock(MemoryFiles::all().mutex);
  return listings().contains(folder) ? reinterpret_cast<Listing*>(folder) : nullptr;
}

template <class Function>
Function libraryFunction(Function, const char* name) {
  return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

bool isOurs(const char* path) {
  return path && path[0] == '/' && MemoryFiles::isPath(path);
}

// Resolves `path` relative to a folder; nothing when it is not in memory.
std::optional<std::string> pathAt(int folder, const char* path) {
  if (isOurs(path)) return path;
  if (!path || path[0] == '/' || !MemoryFiles::isDescriptor(folder)) return std::nullopt;
  const MemoryHandle* const handle = MemoryFiles::all().handle(folder);
  if (!handle) return std::nullopt;
  return path[0] == '\0' ? handle->path : handle->path + '/' + path;
}

int take(const std::shared_ptr<MemoryNode>& node, struct stat* status) {
  if (!node) return -1;
  *status = node->status();
  return 0;
}

int statusAt(int folder, const char* path, struct stat* status, int flags) {
  const std::lock_guard lock(MemoryFiles::all().mutex);
  if (const auto ours = pathAt(folder, path)) return take(MemoryFiles::all().find(*ours), status);
  return static_cast<int>(syscall(SYS_newfstatat, folder, path, status, flags));
}

int openAt(int folder, const char* path, int flags, mode_t mode) {
  const std::lock_guard lock(MemoryFiles::all().mutex);
  if (const auto ours = pathAt(folder, path)) return MemoryFiles::all().open(*ours, flags, mode);
  return static_cast<int>(syscall(SYS_openat, folder, path, flags, mode));
}

// Answers a call on a descriptor in memory; passes others on to the kernel.
template <class Ours>
auto onDescriptor(int descriptor, Ours ours, auto kernels) -> decltype(kernels()) {
  if (!MemoryFiles::isDescriptor(descriptor)) return kernels();
  const std::lock_guard lock(MemoryFiles::all().mutex);
  MemoryHandle* const handle = MemoryFiles::all().handle(descriptor);
  if (!handle) return -1;
  return static_cast<decltype(kernels())>(ours(*handle));
}

int onPath(const char* path, auto ours, auto kernels) {
  if (!isOurs(path)) return static_cast<int>(kernels());
  const std::lock_guard lock(MemoryFiles::all().mutex);
  return ours();
}

int succeed(const MemoryHandle&) {
  return 0;
}

DIR* list(int descriptor) {
  const std::lock_guard lock(MemoryFiles::all().mutex);
  const MemoryHandle* const handle = MemoryFiles::all().handle(descriptor);
  if (!handle) return nullptr;
  if (!handle->node->isFolder()) {
    errno = ENOTDIR;
    return nullptr;
  }
  auto* const listing = new Listing{descriptor, {{".", DT_DIR}, {"..", DT_DIR}}};
  for (const auto& [name, node] : handle->node->entries)
    listing->entries.emplace_back(name, node->isFolder() ? DT_DIR : DT_REG);
  listings().insert(listing);
  return reinterpret_cast<DIR*>(listing);
}

}  // namespace

extern "C" {

int open(const char* path, int flags, ...) {
  va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = (flags & O_CREAT) != 0 ? va_arg(arguments, mode_t) : 0;
  va_end(arguments);
  return openAt(AT_FDCWD, path, flags, mode);
}
int openat(int folder, const char* path, int flags, ...) {
  va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = (flags & O_CREAT) != 0 ? va_arg(arguments, mode_t) : 0;
  va_end(arguments);
  return openAt(folder, path, flags, mode);
}
int close(int descriptor) {
  return onDescriptor(
      descriptor, [&](MemoryHandle&) { return MemoryFiles::all().close(descriptor); },
      [&] { return static_cast<int>(syscall(SYS_close, descriptor)); });
}

ssize_t read(int descriptor, void* room, std::size_t size) {
  return onDescriptor(
      descriptor,
      [&](MemoryHandle& handle) {
        const ssize_t count = MemoryFiles::all().read(handle, room, size, handle.at);
        if (count > 0) handle.at += static_cast<std::size_t>(count);
        return count;
      },
      [&] { return syscall(SYS_read, descriptor, room, size); });
}
ssize_t pread(int descriptor, void* room, std::size_t size, off_t at) {
  return onDescriptor(
      descriptor,
      [&](MemoryHandle& handle) {
        return MemoryFiles::all().read(handle, room, size, static_cast<std::size_t>(at));
      },
      [&] { return syscall(SYS_pread64, descriptor, room, size, at); });
}
ssize_t write(int descriptor, const void* bytes, std::size_t size) {
  return onDescriptor(
      descriptor,
      [&](MemoryHandle& handle) {
        if (handle.isAppending) handle.at = handle.node->content.size();
        const ssize_t count = MemoryFiles::all().write(handle, bytes, size, handle.at);
        if (count > 0) handle.at += static_cast<std::size_t>(count);
        return count;
      },
      [&] { return syscall(SYS_write, descriptor, bytes, size); });
}
ssize_t pwrite(int descriptor, const void* bytes, std::size_t size, off_t at) {
  return onDescriptor(
      descriptor,
      [&](MemoryHandle& handle) {
        return MemoryFiles::all().write(handle, bytes, size, static_cast<std::size_t>(at));
      },
      [&] { return syscall(SYS_pwrite64, descriptor, bytes, size, at); });
}
off_t lseek(int descriptor, off_t offset, int whence) noexcept {
  return onDescriptor(
      descriptor,
      [&](MemoryHandle& handle) -> off_t {
        off_t from = 0;
        if (whence == SEEK_CUR) from = static_cast<off_t>(handle.at);
        if (whence == SEEK_END) from = static_cast<off_t>(handle.node->content.size());
        if (from + offset < 0) {
          errno = EINVAL;
          return -1;
        }
        handle.at = static_cast<std::size_t>(from + offset);
        return from + offset;
      },
      [&] { return off_t{syscall(SYS_lseek, descriptor, offset, whence)}; });
}
int ftruncate(int descriptor, off_t size) noexcept {
  return onDescriptor(
      descriptor,
      [&](MemoryHandle& handle) {
        return MemoryFiles::all().truncate(handle, static_cast<std::size_t>(size));
      },
      [&] { return static_cast<int>(syscall(SYS_ftruncate, descriptor, size)); });
}
int fsync(int descriptor) {
  return onDescriptor(descriptor, succeed,
                      [&] { return static_cast<int>(syscall(SYS_fsync, descriptor)); });
}
int fdatasync(int descriptor) {
  return fsync(descriptor);
}
int flock(int descriptor, int operation) noexcept {
  return onDescriptor(descriptor, succeed,
                      [&] { return static_cast<int>(syscall(SYS_flock, descriptor, operation)); });
}
int fcntl(int descriptor, int command, ...) {
  va_list arguments;
  va_start(arguments, command);
  void* const argument = va_arg(arguments, void*);
  va_end(arguments);
  return onDescriptor(
      descriptor,
      [&](MemoryHandle&) {
        if (command == F_GETLK) static_cast<struct flock*>(argument)->l_type = F_UNLCK;
        return 0;
      },
      [&] { return static_cast<int>(syscall(SYS_fcntl, descriptor, command, argument)); });
}
int fchmod(int descriptor, mode_t mode) noexcept {
  return onDescriptor(
      descriptor,
      [&](MemoryHandle& handle) {
        handle.node->setMode(mode);
        return 0;
      },
      [&] { return static_cast<int>(syscall(SYS_fchmod, descriptor, mode)); });
}
int fchown(int descriptor, uid_t user, gid_t group) noexcept {
  return onDescriptor(descriptor, succeed, [&] {
    return static_cast<int>(syscall(SYS_fchown, descriptor, user, group));
  });
}
int fstat(int descriptor, struct stat* status) noexcept {
  return onDescriptor(
      descriptor, [&](MemoryHandle& handle) { return take(handle.node, status); },
      [&] { return static_cast<int>(syscall(SYS_fstat, descriptor, status)); });
}

// SQLite maps only the index of its log, which nobody reads as a file.
void* mmap(void* wanted, std::size_t size, int protection, int flags, int descriptor,
           off_t at) noexcept {
  if (!MemoryFiles::isDescriptor(descriptor)) {
    // The call's result as a pointer: the library's function cannot be asked in its own place.
    const long place = syscall(SYS_mmap, wanted, size, protection, flags, descriptor, at);
    return std::bit_cast<void*>(place);
  }
  const std::lock_guard lock(MemoryFiles::all().mutex);
  MemoryHandle* const handle = MemoryFiles::all().handle(descriptor);
  if (!handle) return MAP_FAILED;
  return MemoryFiles::all().map(*handle, static_cast<std::size_t>(at), size);
}
int munmap(void* address, std::size_t size) noexcept {
  const std::lock_guard lock(MemoryFiles::all().mutex);
  if (MemoryFiles::all().isMapped(address)) return 0;
  return static_cast<int>(syscall(SYS_munmap, address, size));
}

int stat(const char* path, struct stat* status) noexcept {
  return statusAt(AT_FDCWD, path, status, 0);
}
int lstat(const char* path, struct stat* status) noexcept {
  return statusAt(AT_FDCWD, path, status, AT_SYMLINK_NOFOLLOW);
}
int fstatat(int folder, const char* path, struct stat* status, int flags) noexcept {
  return statusAt(folder, path, status, flags);
}
int access(const char* path, int mode) noexcept {
  return onPath(
      path, [&] { return MemoryFiles::all().find(path) ? 0 : -1; },
      [&] { return syscall(SYS_access, path, mode); });
}
int faccessat(int folder, const char* path, int mode, int flags) noexcept {
  if (!isOurs(path)) return libraryFunction(&faccessat, "faccessat")(folder, path, mode, flags);
  return access(path, mode);
}
int chmod(const char* path, mode_t mode) noexcept {
  return onPath(
      path,
      [&] {
        const auto node = MemoryFiles::all().find(path);
        if (node) node->setMode(mode);
        return node ? 0 : -1;
      },
      [&] { return syscall(SYS_chmod, path, mode); });
}
ssize_t readlink(const char* path, char* room, std::size_t size) noexcept {
  return onPath(
      path,
      [&] {
        if (MemoryFiles::all().find(path)) errno = EINVAL;
        return -1;
      },
      [&] { return syscall(SYS_readlink, path, room, size); });
}
char* realpath(const char* path, char* room) noexcept {
  if (!isOurs(path)) return libraryFunction(&realpath, "realpath")(path, room);
  const std::lock_guard lock(MemoryFiles::all().mutex);
  if (!MemoryFiles::all().find(path)) return nullptr;
  if (!room) return strdup(path);
  std::memcpy(room, path, std::strlen(path) + 1);  // PATH_MAX bytes, as of the call
  return room;
}
int mkdir(const char* path, mode_t mode) noexcept {
  return onPath(
      path, [&] { return MemoryFiles::all().makeFolder(path, mode); },
      [&] { return syscall(SYS_mkdir, path, mode); });
}
int unlink(const char* path) noexcept {
  return onPath(
      path, [&] { return MemoryFiles::all().remove(path, false); },
      [&] { return syscall(SYS_unlink, path); });
}
int rmdir(const char* path) noexcept {
  return onPath(
      path, [&] { return MemoryFiles::all().remove(path, true); },
      [&] { return syscall(SYS_rmdir, path); });
}
int rename(const char* from, const char* to) noexcept {
  return onPath(
      from, [&] { return MemoryFiles::all().rename(from, to); },
      [&] { return syscall(SYS_rename, from, to); });
}
int statvfs(const char* path, struct statvfs* status) noexcept {
  if (!isOurs(path)) return libraryFunction(&statvfs, "statvfs")(path, status);
  const std::lock_guard lock(MemoryFiles::all().mutex);
  if (!MemoryFiles::all().find(path)) return -1;
  *status = {};
  status->f_bsize = status->f_frsize = 4096;
  status->f_blocks = 1000;
  status->f_bfree = status->f_bavail = 250;
  return 0;
}
int statfs(const char* path, struct statfs* status) noexcept {
  return onPath(
      path,
      [&] {
        if (!MemoryFiles::all().find(path)) return -1;
        *status = {};
        status->f_type = kTmpfsMagic;
        return 0;
      },
      [&] { return syscall(SYS_statfs, path, status); });
}

DIR* opendir(const char* path) {
  if (!isOurs(path)) return libraryFunction(&opendir, "opendir")(path);
  const int descriptor = openAt(AT_FDCWD, path, O_RDONLY | O_DIRECTORY, 0);
  return descriptor < 0 ? nullptr : list(descriptor);
}
DIR* fdopendir(int descriptor) {
  if (!MemoryFiles::isDescriptor(descriptor))
    return libraryFunction(&fdopendir, "fdopendir")(descriptor);
  return list(descriptor);
}
dirent* readdir(DIR* folder) {
  Listing* const listing = listingOf(folder);
  if (!listing) return libraryFunction(&readdir, "readdir")(folder);
  if (listing->next == listing->entries.size()) return nullptr;
  const auto& [name, type] = listing->entries[listing->next++];
  dirent& entry = listing->entry;
  entry.d_ino = 1;
  entry.d_type = type;
  const std::size_t length = std::min(name.size(), sizeof entry.d_name - 1);
  std::memcpy(entry.d_name, name.data(), length);
  entry.d_name[length] = '\0';
  return &entry;
}
int dirfd(DIR* folder) noexcept {
  const Listing* const listing = listingOf(folder);
  return listing ? listing->descriptor : libraryFunction(&dirfd, "dirfd")(folder);
}
int closedir(DIR* folder) {
  Listing* const listing = listingOf(folder);
  if (!listing) return libraryFunction(&closedir, "closedir")(folder);
  const std::lock_guard lock(MemoryFiles::all().mutex);
  listings().erase(listing);
  const int outcome = MemoryFiles::all().close(listing->descriptor);
  delete listing;
  return outcome;
}

// The same functions under their names for large files.
int open64(const char* path, int flags, ...) __attribute__((alias("open")));
int openat64(int folder, const char* path, int flags, ...) __attribute__((alias("openat")));
ssize_t pread64(int, void*, std::size_t, off_t) __attribute__((alias("pread")));
ssize_t pwrite64(int, const void*, std::size_t, off_t) __attribute__((alias("pwrite")));
off_t lseek64(int, off_t, int) noexcept __attribute__((alias("lseek")));
void* mmap64(void*, std::size_t, int, int, int, off_t) noexcept __attribute__((alias("mmap")));
int fcntl64(int, int, ...) __attribute__((alias("fcntl")));
int ftruncate64(int, off_t) noexcept __attribute__((alias("ftruncate")));
int fstat64(int, struct stat64*) noexcept __attribute__((alias("fstat")));
int stat64(const char*, struct stat64*) noexcept __attribute__((alias("stat")));
int lstat64(const char*, struct stat64*) noexcept __attribute__((alias("lstat")));
int fstatat64(int, const char*, struct stat64*, int) noexcept __attribute__((alias("fstatat")));
dirent64* readdir64(DIR*) __attribute__((alias("readdir")));
}
