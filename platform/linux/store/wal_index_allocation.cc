#include "platform/linux/store/wal_index_allocation.h"

#include <cerrno>
#include <cstddef>
#include <cstdint>
#include <sys/mman.h>
#include <unistd.h>

#include "platform/linux/store/sqlite_library.h"

namespace tavrel {

WalIndexAllocation::WalIndexAllocation(sqlite3* connection) {
  sqlite3_file* file = nullptr;
  const int code = sqlite().file_control(connection, "main", SQLITE_FCNTL_FILE_POINTER,
                                         static_cast<void*>(&file));
  if (code != SQLITE_OK || !file || !file->pMethods || file->pMethods->iVersion < 2) return;
  methods_ = {*file->pMethods, file->pMethods};
  methods_.replaced.xShmMap = mapIndex;
  file->pMethods = &methods_.replaced;
}

int WalIndexAllocation::mapIndex(sqlite3_file* file, int region, int bytes, int extends,
                                 void volatile** at) {
  const auto* const methods = reinterpret_cast<const Methods*>(file->pMethods);
  const int code = methods->own->xShmMap(file, region, bytes, extends, at);
  if (code != SQLITE_OK || !*at) return code;
  // Allocates as a write would, and fails with EFAULT where a write would raise SIGBUS. Another
  // error means that the index is mapped read-only, so nobody writes into it.
  const auto page = static_cast<std::uintptr_t>(sysconf(_SC_PAGESIZE));
  auto* const begin = static_cast<std::byte*>(const_cast<void*>(*at));
  const std::uintptr_t before = reinterpret_cast<std::uintptr_t>(begin) % page;
  const std::size_t length = before + static_cast<std::size_t>(bytes);
  if (madvise(begin - before, length, MADV_POPULATE_WRITE) == 0 || errno != EFAULT)
    return SQLITE_OK;
  *at = nullptr;
  return SQLITE_FULL;
}

}  // namespace tavrel
