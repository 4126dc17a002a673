#include "memory_files.h"

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <utility>

#include "require.h"

namespace tavrel::fuzz {
namespace {

constexpr int kFirstDescriptor = 1 << 24;
constexpr std::size_t kLargestFile = 64U << 20;
constexpr time_t kTime = 1'700'000'000;

int fail(int code) {
  errno = code;
  return -1;
}

// The next name of a path; empty at its end.
std::string_view takeName(std::string_view& path) {
  while (path.starts_with('/'))
    path.remove_prefix(1);
  const std::string_view name = path.substr(0, path.find('/'));
  path.remove_prefix(name.size());
  return name;
}

}  // namespace

struct stat MemoryNode::status() const {
  struct stat status {};
  status.st_mode = mode;
  status.st_ino = number;
  status.st_nlink = 1;
  status.st_size = static_cast<off_t>(content.size());
  status.st_blocks = (status.st_size + 511) / 512;
  status.st_blksize = 4096;
  status.st_mtim = {kTime, changes};
  status.st_ctim = status.st_mtim;
  return status;
}

MemoryFiles& MemoryFiles::all() {
  static MemoryFiles files;
  return files;
}

bool MemoryFiles::isDescriptor(int descriptor) {
  return descriptor >= kFirstDescriptor;
}

bool MemoryFiles::isPath(std::string_view path) {
  return path.starts_with(kMemoryRoot) &&
         (path.size() == kMemoryRoot.size() || path[kMemoryRoot.size()] == '/');
}

std::shared_ptr<MemoryNode> MemoryFiles::make(mode_t mode) {
  auto node = std::make_shared<MemoryNode>();
  node->mode = mode;
  node->number = ++numbers_;
  return node;
}

// The paths that readers use contain no "." or "..".
MemoryFiles::Place MemoryFiles::placeOf(std::string_view path) {
  path.remove_prefix(kMemoryRoot.size());
  MemoryNode* folder = root_.get();
  std::string_view name = takeName(path);
  for (std::string_view next = takeName(path); !next.empty(); next = takeName(path)) {
    const auto found = folder->entries.find(name);
    if (found == folder->entries.end()) return {};
    if (!found->second->isFolder()) {
      errno = ENOTDIR;
      return {};
    }
    folder = found->second.get();
    name = next;
  }
  return {folder, name};
}

std::shared_ptr<MemoryNode> MemoryFiles::find(std::string_view path) {
  errno = ENOENT;
  const Place place = placeOf(path);
  if (!place.folder) return nullptr;
  if (place.name.empty()) return root_;
  const auto found = place.folder->entries.find(place.name);
  if (found == place.folder->entries.end()) return nullptr;
  if (path.ends_with('/') && !found->second->isFolder()) {
    errno = ENOTDIR;
    return nullptr;
  }
  return found->second;
}

std::string MemoryFiles::makeRoot() {
  const std::lock_guard lock(mutex);
  char name = 'a';
  while (root_->entries.contains(std::string_view(&name, 1)))
    ++name;
  root_->entries[std::string(1, name)] = make(S_IFDIR | 0755);
  return std::string(kMemoryRoot) + '/' + name;
}

void MemoryFiles::put(std::string_view path, std::string_view content) {
  const std::lock_guard lock(mutex);
  std::string_view rest = path.substr(kMemoryRoot.size());
  std::shared_ptr<MemoryNode> folder = root_;
  std::string_view name = takeName(rest);
  for (std::string_view next = takeName(rest); !next.empty(); next = takeName(rest)) {
    auto& entry = folder->entries[std::string(name)];
    if (!entry) entry = make(S_IFDIR | 0755);
    require(entry->isFolder());
    folder = entry;
    name = next;
  }
  auto& file = folder->entries[std::string(name)];
  if (!file) file = make(S_IFREG | 0644);
  file->content = content;
  ++file->changes;
}

void MemoryFiles::removeAll(std::string_view path) {
  const std::lock_guard lock(mutex);
  const Place place = placeOf(path);
  if (place.folder) place.folder->entries.erase(std::string(place.name));
  // Nothing of one input may be visible to the next.
  if (root_->entries.empty()) numbers_ = 1;
}

int MemoryFiles::open(std::string_view path, int flags, mode_t mode) {
  std::shared_ptr<MemoryNode> node = find(path);
  if (!node) {
    if (errno != ENOENT || (flags & O_CREAT) == 0) return -1;
    const Place place = placeOf(path);
    if (!place.folder) return fail(ENOENT);
    node = make(S_IFREG | (mode & 07777));
    place.folder->entries[std::string(place.name)] = node;
  } else if ((flags & O_CREAT) != 0 && (flags & O_EXCL) != 0) {
    return fail(EEXIST);
  }
  const bool isWriting = (flags & O_ACCMODE) != O_RDONLY;
  if (isWriting && node->isFolder()) return fail(EISDIR);
  if ((flags & O_DIRECTORY) != 0 && !node->isFolder()) return fail(ENOTDIR);
  if (isWriting && (flags & O_TRUNC) != 0) {
    node->content.clear();
    ++node->changes;
  }
  auto free = std::ranges::find_if(handles_, [](const auto& handle) { return !handle; });
  if (free == handles_.end()) free = handles_.emplace(handles_.end());
  *free = MemoryHandle{std::move(node), std::string(path), 0, (flags & O_APPEND) != 0};
  return kFirstDescriptor + static_cast<int>(free - handles_.begin());
}

MemoryHandle* MemoryFiles::handle(int descriptor) {
  const auto index = static_cast<std::size_t>(descriptor - kFirstDescriptor);
  if (index >= handles_.size() || !handles_[index]) {
    errno = EBADF;
    return nullptr;
  }
  return &*handles_[index];
}

int MemoryFiles::close(int descriptor) {
  if (!handle(descriptor)) return -1;
  handles_[static_cast<std::size_t>(descriptor - kFirstDescriptor)].reset();
  return 0;
}

ssize_t MemoryFiles::read(MemoryHandle& handle, void* room, std::size_t size, std::size_t at) {
  if (handle.node->isFolder()) return fail(EISDIR);
  const std::string& content = handle.node->content;
  if (at >= content.size()) return 0;
  const std::size_t count = std::min(size, content.size() - at);
  std::memcpy(room, content.data() + at, count);
  return static_cast<ssize_t>(count);
}

ssize_t MemoryFiles::write(MemoryHandle& handle, const void* bytes, std::size_t size,
                           std::size_t at) {
  std::string& content = handle.node->content;
  if (at > kLargestFile || size > kLargestFile - at) return fail(ENOSPC);
  if (at + size > content.size()) content.resize(at + size);
  std::memcpy(content.data() + at, bytes, size);
  ++handle.node->changes;
  return static_cast<ssize_t>(size);
}

int MemoryFiles::truncate(MemoryHandle& handle, std::size_t size) {
  if (size > kLargestFile) return fail(EFBIG);
  handle.node->content.resize(size);
  ++handle.node->changes;
  return 0;
}

void* MemoryFiles::map(MemoryHandle& handle, std::size_t at, std::size_t size) {
  std::shared_ptr<void>& part = handle.node->mapped[at];
  if (!part) {
    constexpr std::size_t kPage = 4096;
    void* const memory = std::aligned_alloc(kPage, (size + kPage - 1) / kPage * kPage);
    std::memset(memory, 0, size);
    mapped_.insert(memory);
    part.reset(memory, [this](void* unused) {
      mapped_.erase(unused);
      std::free(unused);
    });
  }
  return part.get();
}

int MemoryFiles::makeFolder(std::string_view path, mode_t mode) {
  if (find(path)) return fail(EEXIST);
  if (errno != ENOENT) return -1;
  while (path.ends_with('/'))
    path.remove_suffix(1);
  const Place place = placeOf(path);
  if (!place.folder) return fail(ENOENT);
  place.folder->entries[std::string(place.name)] = make(S_IFDIR | (mode & 07777));
  return 0;
}

int MemoryFiles::remove(std::string_view path, bool isFolder) {
  const auto node = find(path);
  if (!node) return -1;
  if (node->isFolder() != isFolder) return fail(isFolder ? ENOTDIR : EISDIR);
  if (!node->entries.empty()) return fail(ENOTEMPTY);
  const Place place = placeOf(path);
  place.folder->entries.erase(std::string(place.name));
  return 0;
}

int MemoryFiles::rename(std::string_view from, std::string_view to) {
  const auto node = find(from);
  if (!node) return -1;
  const auto replaced = find(to);
  if (replaced == node) return 0;
  if (replaced && replaced->isFolder() != node->isFolder())
    return fail(node->isFolder() ? ENOTDIR : EISDIR);
  if (replaced && !replaced->entries.empty()) return fail(ENOTEMPTY);
  const Place target = placeOf(to);
  if (!target.folder) return fail(ENOENT);
  target.folder->entries[std::string(target.name)] = node;
  const Place source = placeOf(from);
  source.folder->entries.erase(std::string(source.name));
  return 0;
}

}  // namespace tavrel::fuzz
