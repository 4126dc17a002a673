#include "faulty_file_system.h"

#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <set>
#include <sys/stat.h>
#include <unistd.h>

#include "temporary_root.h"

namespace tavrel {
namespace {

namespace fs = std::filesystem;

std::uint64_t inodeOf(const fs::path& path) {
  struct stat status {};
  return lstat(path.c_str(), &status) == 0 ? status.st_ino : 0;
}

std::map<std::string, std::uint64_t> namesIn(const fs::path& folder) {
  std::map<std::string, std::uint64_t> names;
  for (const auto& entry : fs::directory_iterator(folder))
    names[entry.path().filename()] = inodeOf(entry.path());
  return names;
}

fs::path pathOf(int descriptor) {
  return fs::read_symlink("/proc/self/fd/" + std::to_string(descriptor));
}

}  // namespace

FaultyFileSystem::FaultyFileSystem(std::string folder, Fault fault, int failingCall)
    : folder_(fs::canonical(folder)), fault_(fault), failingCall_(failingCall) {
  flushNames();
  for (const auto& entry : fs::recursive_directory_iterator(folder_)) {
    if (entry.is_regular_file()) {
      flushedContents_[inodeOf(entry.path())] = contentOf(entry.path());
    }
  }
}

void FaultyFileSystem::flushNames() {
  flushedNames_[folder_] = namesIn(folder_);
  for (const auto& entry : fs::recursive_directory_iterator(folder_)) {
    if (entry.is_directory()) flushedNames_[entry.path()] = namesIn(entry.path());
  }
}

bool FaultyFileSystem::strikes() {
  ++calls_;
  const bool isOver = goesOn() ? calls_ == failingCall_ : calls_ >= failingCall_;
  if (isOver) errno = ENOSPC;
  return isOver;
}

int FaultyFileSystem::openFile(const char* path, int flags, mode_t mode) {
  if (strikes()) return -1;
  const bool isNew = (flags & O_CREAT) != 0 && inodeOf(path) == 0;
  const int descriptor = FileSystem::openFile(path, flags, mode);
  // A new file may have the number of one that was removed.
  if (isNew && descriptor >= 0) flushedContents_.erase(inodeOf(path));
  return descriptor;
}

ssize_t FaultyFileSystem::writeFile(int descriptor, const std::byte* bytes, std::size_t size) {
  if (strikes()) {
    FileSystem::writeFile(descriptor, bytes, size / 2);
    errno = ENOSPC;
    return -1;
  }
  return FileSystem::writeFile(descriptor, bytes, size);
}

int FaultyFileSystem::syncFile(int descriptor) {
  if (strikes()) return -1;
  const fs::path path = pathOf(descriptor);
  if (fs::is_directory(path)) {
    flushedNames_[path] = namesIn(path);
  } else {
    flushedContents_[inodeOf(path)] = contentOf(path);
  }
  return 0;
}

int FaultyFileSystem::truncateFile(int descriptor, off_t size) {
  return strikes() ? -1 : FileSystem::truncateFile(descriptor, size);
}
int FaultyFileSystem::renameFile(const char* from, const char* to) {
  return strikes() ? -1 : FileSystem::renameFile(from, to);
}
int FaultyFileSystem::removeFile(const char* path) {
  return strikes() ? -1 : FileSystem::removeFile(path);
}
int FaultyFileSystem::makeFolder(const char* path, mode_t mode) {
  if (strikes() || FileSystem::makeFolder(path, mode) != 0) return -1;
  flushedNames_[fs::canonical(path)] = {};
  return 0;
}

void FaultyFileSystem::settle() {
  if (fault_ == Fault::Failure || fault_ == Fault::Kill) return;
  if (fault_ == Fault::CutKeepingNames) flushNames();
  std::map<Inode, fs::path> folders;
  for (const auto& [path, names] : flushedNames_)
    folders[inodeOf(path)] = path;
  std::map<fs::path, std::string> files;
  std::set<fs::path> keptFolders;
  // Folders are walked from the top, parents before what they hold.
  for (const auto& [path, names] : flushedNames_) {
    if (path != folder_ && !keptFolders.contains(path)) continue;
    for (const auto& [name, inode] : names) {
      const fs::path full = fs::path(path) / name;
      if (folders.contains(inode)) {
        keptFolders.insert(full);
      } else {
        files[full] = flushedContents_[inode];
      }
    }
  }
  for (const auto& entry : fs::directory_iterator(folder_))
    fs::remove_all(entry.path());
  for (const auto& path : keptFolders)
    fs::create_directories(path);
  for (const auto& [path, content] : files)
    std::ofstream(path, std::ios::binary) << content;
}

}  // namespace tavrel
