// A file system whose n-th system call fails, and the state that a power cut then leaves.
#pragma once

#include <cerrno>
#include <fcntl.h>
#include <map>
#include <set>
#include <sys/stat.h>

#include "platform/linux/files/file_system.h"
#include "tests/devices/temporary_root.h"

namespace tavrel {

namespace fs = std::filesystem;

class FaultyFileSystem final : public FileSystem {
 public:
  enum class Fault {
    Failure,           // the call fails as on a full disk; the calls after it work
    FailureBeforeCut,  // the same, and power fails at the end
    Kill,              // the process dies there; what was written stays
    Cut,               // power fails; names and contents not yet flushed are lost
    CutKeepingNames,   // the same, but the file system had already written the names
  };
  static constexpr Fault kFaults[] = {Fault::Failure, Fault::FailureBeforeCut, Fault::Kill,
                                      Fault::Cut, Fault::CutKeepingNames};

  /// Everything below `folder` counts as flushed. Calls are counted from 1.
  FaultyFileSystem(const std::string& folder, Fault fault, int failingCall)
      : folder_(fs::canonical(folder)), fault_(fault), failingCall_(failingCall) {
    flushNames();
    for (const auto& entry : fs::recursive_directory_iterator(folder_)) {
      if (entry.is_regular_file())
        flushedContents_[inodeOf(entry.path())] = contentOf(entry.path());
    }
  }

  /// False when the sequence ended before the failing call.
  bool hasStruck() const { return calls_ >= failingCall_; }
  /// Whether calls after the failing one work.
  bool goesOn() const { return fault_ <= Fault::FailureBeforeCut; }
  /// Puts the folder into the state in which it would be found after the fault.
  void settle() {
    if (fault_ == Fault::Failure || fault_ == Fault::Kill) return;
    if (fault_ == Fault::CutKeepingNames) flushNames();
    std::map<Inode, fs::path> folders;
    for (const auto& [path, names] : flushedNames_)
      folders[inodeOf(path)] = path;
    std::map<fs::path, std::string> files;
    std::set<fs::path> keptFolders;
    // Goes from the top down: parents before their contents.
    for (const auto& [path, names] : flushedNames_) {
      if (path != folder_ && !keptFolders.contains(path)) continue;
      for (const auto& [name, inode] : names) {
        const fs::path full = fs::path(path) / name;
        if (folders.contains(inode)) keptFolders.insert(full);
        if (!folders.contains(inode)) files[full] = flushedContents_[inode];
      }
    }
    for (const auto& entry : fs::directory_iterator(folder_))
      fs::remove_all(entry.path());
    for (const auto& path : keptFolders)
      fs::create_directories(path);
    for (const auto& [path, content] : files)
      std::ofstream(path, std::ios::binary) << content;
  }

 protected:
  int openFile(const char* path, int flags, mode_t mode) override {
    if (strikes()) return -1;
    const bool isNew = (flags & O_CREAT) != 0 && inodeOf(path) == 0;
    const int descriptor = FileSystem::openFile(path, flags, mode);
    // A new file may reuse the number of a removed one.
    if (isNew && descriptor >= 0) flushedContents_.erase(inodeOf(path));
    return descriptor;
  }
  ssize_t writeFile(int descriptor, const std::byte* bytes, std::size_t size) override {
    if (!strikes()) return FileSystem::writeFile(descriptor, bytes, size);
    FileSystem::writeFile(descriptor, bytes, size / 2);
    errno = ENOSPC;
    return -1;
  }
  int syncFile(int descriptor) override {
    if (strikes()) return -1;
    const fs::path path = pathOf(descriptor);
    if (fs::is_directory(path)) {
      flushedNames_[path] = namesIn(path);
    } else {
      flushedContents_[inodeOf(path)] = contentOf(path);
    }
    return 0;
  }
  int truncateFile(int descriptor, off_t size) override {
    return strikes() ? -1 : FileSystem::truncateFile(descriptor, size);
  }
  int renameFile(const char* from, const char* to) override {
    return strikes() ? -1 : FileSystem::renameFile(from, to);
  }
  int linkFile(const char* path, const char* name) override {
    return strikes() ? -1 : FileSystem::linkFile(path, name);
  }
  int removeFile(const char* path) override {
    return strikes() ? -1 : FileSystem::removeFile(path);
  }
  int makeFolder(const char* path, mode_t mode) override {
    if (strikes() || FileSystem::makeFolder(path, mode) != 0) return -1;
    flushedNames_[fs::canonical(path)] = {};
    return 0;
  }

 private:
  using Inode = std::uint64_t;

  static std::uint64_t inodeOf(const fs::path& path) {
    struct stat status {};
    return lstat(path.c_str(), &status) == 0 ? status.st_ino : 0;
  }

  static std::map<std::string, std::uint64_t> namesIn(const fs::path& folder) {
    std::map<std::string, std::uint64_t> names;
    for (const auto& entry : fs::directory_iterator(folder))
      names[entry.path().filename()] = inodeOf(entry.path());
    return names;
  }

  static fs::path pathOf(int descriptor) {
    return fs::read_symlink("/proc/self/fd/" + std::to_string(descriptor));
  }

  void flushNames() {
    flushedNames_[folder_] = namesIn(folder_);
    for (const auto& entry : fs::recursive_directory_iterator(folder_)) {
      if (entry.is_directory()) flushedNames_[entry.path()] = namesIn(entry.path());
    }
  }
  bool strikes() {
    ++calls_;
    const bool isOver = goesOn() ? calls_ == failingCall_ : calls_ >= failingCall_;
    if (isOver) errno = ENOSPC;
    return isOver;
  }

  std::string folder_;
  Fault fault_;
  int failingCall_;
  int calls_ = 0;
  std::map<Inode, std::string> flushedContents_;
  std::map<std::string, std::map<std::string, Inode>> flushedNames_;  // by folder
};

/// Lets each fault strike each system call of `work` on a device of its own, as `prepare` left it.
inline void strikeEachCall(
    const std::function<void(const TemporaryRoot&)>& prepare,
    const std::function<void(const TemporaryRoot&, FaultyFileSystem&)>& work) {
  for (const auto fault : FaultyFileSystem::kFaults) {
    bool hasStruck = true;
    int call = 1;
    for (; hasStruck && !testing::Test::HasFatalFailure(); ++call) {
      SCOPED_TRACE(testing::Message() << "fault " << static_cast<int>(fault) << " at " << call);
      ASSERT_LT(call, 200);
      const TemporaryRoot device;
      prepare(device);
      FaultyFileSystem faulty(device.root.path("/"), fault, call);
      work(device, faulty);
      hasStruck = faulty.hasStruck();
    }
    EXPECT_GT(call, 2) << "no call was struck";
  }
}

}  // namespace tavrel
