// Reserves storage for the index of SQLite's write-ahead log.
//
// SQLite maps the index, the "-shm" file, and writes into the mapping. It extends the file by
// writing one byte per page of 4 KiB, which leaves holes on a file system with smaller blocks. On a
// full disk, a write into a hole raises SIGBUS. A `WalIndexAllocation` allocates every page of the
// index before SQLite sees it. On a full disk, writers and readers then get SQLITE_FULL.
#pragma once

#include <sqlite3.h>

namespace tavrel {

class WalIndexAllocation {
 public:
  /// Intercepts the connection's calls on its file. The connection must not have run a statement
  /// yet. Must outlive the connection.
  explicit WalIndexAllocation(sqlite3* connection);
  WalIndexAllocation(const WalIndexAllocation&) = delete;
  WalIndexAllocation& operator=(const WalIndexAllocation&) = delete;

 private:
  // SQLite calls this instead of the file's own methods. It must be the first member: SQLite's
  // pointer to it also leads to the other members.
  struct Methods {
    sqlite3_io_methods replaced;
    const sqlite3_io_methods* own;
  };
  static int mapIndex(sqlite3_file* file, int region, int bytes, int extends, void volatile** at);

  Methods methods_{};
};

}  // namespace tavrel
