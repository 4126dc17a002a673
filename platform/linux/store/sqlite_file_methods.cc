#include "platform/linux/store/sqlite_file_methods.h"

#include <cerrno>
#include <cstddef>
#include <cstring>
#include <sys/mman.h>
#include <unistd.h>

#include "platform/linux/store/sqlite_library.h"

namespace tavrel {
namespace {

constexpr std::int64_t kBlockBytes = 64 << 10;
constexpr std::int64_t kNone = -2;  // the first block does not follow it

}  // namespace

FileMethods::FileMethods(sqlite3* connection, bool readsAhead) {
  sqlite3_file* file = nullptr;
  const int code = sqlite().file_control(connection, "main", SQLITE_FCNTL_FILE_POINTER,
                                         static_cast<void*>(&file));
  if (code != SQLITE_OK || !file || !file->pMethods || file->pMethods->iVersion < 2) return;
  state_ = {*file->pMethods, file->pMethods, nullptr, kNone, kNone};
  state_.replaced.xShmMap = mapIndex;
  if (readsAhead) {
    state_.block = std::make_unique_for_overwrite<char[]>(kBlockBytes);
    state_.replaced.xRead = read;
    state_.replaced.xLock = lock;
    state_.replaced.xShmLock = lockIndex;
  }
  file->pMethods = &state_.replaced;
}

FileMethods::State& FileMethods::stateOf(sqlite3_file* file) {
  return *reinterpret_cast<State*>(const_cast<sqlite3_io_methods*>(file->pMethods));
}

int FileMethods::mapIndex(sqlite3_file* file, int region, int bytes, int extends,
                          void volatile** at) {
  const int code = stateOf(file).own->xShmMap(file, region, bytes, extends, at);
  if (code != SQLITE_OK || !*at) return code;
  // Allocates as a write would, and fails where the write would raise SIGBUS. Another error means
  // that the index is mapped for reading only, and nobody writes into it.
  const auto page = static_cast<std::uintptr_t>(sysconf(_SC_PAGESIZE));
  auto* const begin = static_cast<std::byte*>(const_cast<void*>(*at));
  const std::uintptr_t before = reinterpret_cast<std::uintptr_t>(begin) % page;
  const std::size_t length = before + static_cast<std::size_t>(bytes);
  if (madvise(begin - before, length, MADV_POPULATE_WRITE) == 0 || errno != EFAULT)
    return SQLITE_OK;
  *at = nullptr;
  return SQLITE_FULL;
}

int FileMethods::read(sqlite3_file* file, void* to, int bytes, sqlite3_int64 offset) {
  State& state = stateOf(file);
  const std::int64_t number = offset / kBlockBytes;
  const std::int64_t place = offset % kBlockBytes;
  const bool goesOn = number == state.lastRead || number == state.lastRead + 1;
  state.lastRead = number;
  if (place + bytes > kBlockBytes) return state.own->xRead(file, to, bytes, offset);
  if (state.blockAt != offset - place) {
    if (!goesOn) return state.own->xRead(file, to, bytes, offset);
    state.blockAt = kNone;
    // The file's last block may be shorter.
    if (state.own->xRead(file, state.block.get(), kBlockBytes, offset - place) != SQLITE_OK) {
      return state.own->xRead(file, to, bytes, offset);
    }
    state.blockAt = offset - place;
  }
  std::memcpy(to, state.block.get() + place, static_cast<std::size_t>(bytes));
  return SQLITE_OK;
}

int FileMethods::lock(sqlite3_file* file, int level) {
  State& state = stateOf(file);
  state.blockAt = state.lastRead = kNone;
  return state.own->xLock(file, level);
}

int FileMethods::lockIndex(sqlite3_file* file, int offset, int count, int flags) {
  State& state = stateOf(file);
  state.blockAt = state.lastRead = kNone;
  return state.own->xShmLock(file, offset, count, flags);
}

}  // namespace tavrel
