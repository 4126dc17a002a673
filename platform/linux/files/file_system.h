// Durable files. The platform writes everything through this layer, so that a reader never sees
// half a file and a power cut leaves either the old content or the new.
//
// To replace a file, it writes and flushes a temporary file in the same folder, renames it over the
// file and flushes the folder:
//
//   const Status done = files.replace(path, bytes, 0644);
//   if (!done) log.write(LogLevel::Error, done.error().message);
//
// It can also be written piece by piece; a file that is not committed vanishes with its handle:
//
//   Expected<NewFile> file = files.create(path, 0640);
//   file->write(bytes);
//   file->commit();
//
// All errors name the path; those of a system call include the system's error text. The system
// calls are virtual: tests derive a file system that loses unflushed data and one whose n-th call
// fails.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <sys/stat.h>
#include <sys/types.h>
#include <utility>
#include <vector>

#include "base/bytes.h"
#include "base/expected.h"
#include "base/limits.h"
#include "platform/linux/files/descriptor.h"

namespace tavrel {

class FileSystem;

/// A new file under a temporary name. Without `commit` it is removed with the handle.
class NewFile {
 public:
  NewFile(NewFile&& other) noexcept;
  NewFile& operator=(NewFile&&) = delete;
  ~NewFile();

  /// Appends all of `bytes`.
  Status write(ByteSpan bytes);
  /// Flushes the content to storage; the file keeps its temporary name.
  Status flush();
  /// Flushes the file, renames it over an earlier one, and makes that durable. When only the last
  /// step fails, the file is in place but may not survive a power cut.
  Status commit();

 private:
  friend class FileSystem;
  NewFile(FileSystem& fileSystem, std::string path, std::string temporary, Descriptor descriptor);

  FileSystem& fileSystem_;
  std::string path_;
  std::string temporary_;  // empty once no temporary file is left to remove
  Descriptor descriptor_;
  bool flushed_ = false;
};

/// How long to wait for a process that holds a lock, and the advice in the error when that was in
/// vain.
struct LockPatience {
  int milliseconds = limits::kFileLockMilliseconds;
  std::string_view advice = "end that process";
};

/// A file that grows by whole lines.
class AppendedFile {
 public:
  /// Appends lines in one write, which survives the end of the process but not a power cut. Lines
  /// that do not fit leave nothing behind. The file never grows beyond `largest` bytes.
  Status append(ByteSpan lines, std::size_t largest);
  /// Makes the appended lines, and the file's name, durable.
  Status flush();

 private:
  friend class FileSystem;
  AppendedFile(FileSystem& fileSystem, std::string path, Descriptor descriptor)
      : fileSystem_(&fileSystem), path_(std::move(path)), descriptor_(std::move(descriptor)) {}
  Status cutTornEnd(std::int64_t size);
  /// Cuts off everything after the last whole line.
  Status mend();

  FileSystem* fileSystem_;
  std::string path_;
  Descriptor descriptor_;
  std::uint64_t size_ = 0;  // of the whole lines
  bool isTorn_ = false;     // there is more after them
  bool isFlushed_ = false;
  bool isNameFlushed_ = false;
};

class FileSystem {
 public:
  FileSystem() = default;
  virtual ~FileSystem() = default;
  FileSystem(const FileSystem&) = delete;
  FileSystem& operator=(const FileSystem&) = delete;

  /// The whole content of a regular file. Anything else is refused unread; more than `largest`
  /// bytes are an error.
  Expected<std::string> read(const std::string& path, std::size_t largest);
  /// The same; nothing when there is no such file.
  Expected<std::optional<std::string>> readIfPresent(const std::string& path, std::size_t largest);

  /// Starts a new version of `path`. Missing folders are made. Temporary files that a killed
  /// process left in the folder are removed once they are older than
  /// `limits::kTemporaryFileSeconds`.
  Expected<NewFile> create(const std::string& path, mode_t mode);
  /// An existing file keeps its owner and its mode, minus permissions of other users that `mode`
  /// does not grant. The group's permissions stay.
  Status replace(const std::string& path, ByteSpan bytes, mode_t mode);

  /// Opens a file, but no symbolic link, to append to it; creates it and its folder when missing.
  /// Cuts off what a kill or a power cut left after the last whole line: a line without an end,
  /// lines of zero bytes. The caller keeps other writers out.
  Expected<AppendedFile> openToAppend(const std::string& path, mode_t mode);

  /// Moves a file, over an existing one, and makes that durable.
  Status rename(const std::string& from, const std::string& to);
  /// Gives a file a second name on the same file system, which needs no free space, and makes that
  /// durable. An error when another file has the name.
  Status link(const std::string& path, const std::string& name);
  /// Removes a file; a missing one is fine. Durable with the folder's next flush.
  Status remove(const std::string& path);
  /// The same, ignoring failures: the next clean-up tries again.
  void discard(const std::string& path) { removeFile(path.c_str()); }
  /// Makes a folder and those above it.
  Status makeFolders(const std::string& path);
  /// The same; the folder itself becomes accessible to its owner only, even when it already exists.
  Status makePrivateFolder(const std::string& path);
  /// Makes additions, removals and renames in a folder durable; does nothing for a missing one.
  Status flushFolder(const std::string& folder);
  /// Removes all temporary files of a folder, even those still being written: their writers can no
  /// longer commit them.
  void discardTemporaries(const std::string& folder);

  /// Locks the file `path`, made when missing, until the handle is released. Only its owner and
  /// root can open it, so nobody else can lock it; in a folder that everybody may write to, the
  /// file must belong to a trusted user.
  Expected<Descriptor> lockFile(const std::string& path, const LockPatience& patience = {});
  /// The same without waiting; nothing when another process has it locked.
  Expected<std::optional<Descriptor>> lockFileIfFree(const std::string& path);
  /// As `lockFile`, with the file `.lock` of a folder, which must exist.
  Expected<Descriptor> lockFolder(const std::string& folder, const LockPatience& patience = {});
  /// Opens the folder's `.lock` without locking it.
  Expected<Descriptor> openFolderLock(const std::string& folder);

  /// Names in a folder, sorted, without those that begin with a dot; none for a missing folder.
  Expected<std::vector<std::string>> list(const std::string& folder);

  /// Status of a file, links followed; nothing when it cannot be taken.
  static std::optional<struct stat> status(const std::string& path);
  /// Whether the permissions keep this user from reading it.
  static bool isClosed(const std::string& path);

 protected:
  /// System calls: -1 with `errno` on failure. `openFile` sets close-on-exec.
  virtual int openFile(const char* path, int flags, mode_t mode);
  virtual ssize_t writeFile(int descriptor, const std::byte* bytes, std::size_t size);
  virtual int syncFile(int descriptor);
  virtual int truncateFile(int descriptor, off_t size);
  virtual int renameFile(const char* from, const char* to);
  virtual int linkFile(const char* path, const char* name);
  virtual int removeFile(const char* path);
  virtual int makeFolder(const char* path, mode_t mode);

 private:
  friend class AppendedFile;
  friend class NewFile;
  Expected<Descriptor> openOrMake(const std::string& path, int flags, mode_t mode);
  Expected<Descriptor> openLock(const std::string& path);
  Expected<Descriptor> keepFromOthers(Descriptor lock, const std::string& path);
  /// Whether the lock was free.
  Expected<bool> tryLock(int descriptor, const std::string& path);
  Status lock(int descriptor, const std::string& path, const LockPatience& patience);
  Status writeAll(int descriptor, ByteSpan bytes, const std::string& path);
  Status syncFolderOf(const std::string& path);
  void removeStaleTemporaries(const std::string& folder, const struct stat& fresh);
  template <class IsUnwanted>
  void removeTemporaries(const std::string& folder, IsUnwanted isUnwanted);

  std::set<std::string> tidiedFolders_;
};

}  // namespace tavrel
