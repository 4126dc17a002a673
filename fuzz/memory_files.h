// Files in memory, for device roots: making and removing them takes only microseconds, so
// no target needs the disk.
//
// memory_calls.cc redirects the C library's functions here for paths below kMemoryRoot and for
// descriptors of these files, so that readers run unmodified. There are folders and regular files
// but no links; access is never denied, and locks are always free.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <sys/stat.h>
#include <vector>

namespace tavrel::fuzz {

inline constexpr std::string_view kMemoryRoot = "/tavrel-memory";

struct MemoryNode {
  mode_t mode = 0;
  ino_t number = 0;
  long changes = 0;  // distinguishes states of a file, as its ctime does
  std::string content;
  std::map<std::string, std::shared_ptr<MemoryNode>, std::less<>> entries;
  std::map<std::size_t, std::shared_ptr<void>> mapped;  // by their offsets in the file

  void setMode(mode_t bits) { mode = (mode & S_IFMT) | (bits & 07777); }
  bool isFolder() const { return S_ISDIR(mode); }
  struct stat status() const;
};

/// An open file, or a folder that is being listed.
struct MemoryHandle {
  std::shared_ptr<MemoryNode> node;
  std::string path;
  std::size_t at = 0;
  bool isAppending = false;
};

/// The C library's functions for paths without the root; -1 and `errno` on failure.
class MemoryFiles {
 public:
  /// The instance of this process. SlowReads uses it in threads.
  static MemoryFiles& all();

  /// Makes an empty folder with a unique name.
  std::string makeRoot();
  /// Makes a file, and the folders above it.
  void put(std::string_view path, std::string_view content);
  void removeAll(std::string_view path);

  std::shared_ptr<MemoryNode> find(std::string_view path);
  int open(std::string_view path, int flags, mode_t mode);
  int close(int descriptor);
  MemoryHandle* handle(int descriptor);
  ssize_t read(MemoryHandle& handle, void* room, std::size_t size, std::size_t at);
  ssize_t write(MemoryHandle& handle, const void* bytes, std::size_t size, std::size_t at);
  int truncate(MemoryHandle& handle, std::size_t size);
  /// Memory shared by everybody who maps this part; it lasts as long as the file.
  void* map(MemoryHandle& handle, std::size_t at, std::size_t size);
  bool isMapped(void* address) const { return mapped_.contains(address); }
  int makeFolder(std::string_view path, mode_t mode);
  int remove(std::string_view path, bool isFolder);
  int rename(std::string_view from, std::string_view to);

  static bool isDescriptor(int descriptor);
  static bool isPath(std::string_view path);

  std::recursive_mutex mutex;

 private:
  struct Place {
    MemoryNode* folder = nullptr;  // null when it does not exist
    std::string_view name;
  };
  Place placeOf(std::string_view path);
  std::shared_ptr<MemoryNode> make(mode_t mode);

  ino_t numbers_ = 0;
  std::shared_ptr<MemoryNode> root_ = make(S_IFDIR | 0755);
  std::vector<std::optional<MemoryHandle>> handles_;
  std::set<void*> mapped_;
};

}  // namespace tavrel::fuzz
