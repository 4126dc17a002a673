// Room for the index of SQLite's write-ahead log.
//
// SQLite maps the index, the "-shm" file, and stores into it. It makes the file longer by one byte
// a page of 4 KiB, which on a file system with smaller blocks leaves holes: on a full disk a store
// into one raises SIGBUS. An `IndexRoom` has every page of the index allocated before SQLite sees
// it. Too little room is then SQLITE_FULL, for writers and for readers alike.
#pragma once

#include <sqlite3.h>

namespace tavrel {

class IndexRoom {
 public:
  /// Stands between the connection, which has run no statement yet, and its file. Must outlive it.
  explicit IndexRoom(sqlite3* connection);
  IndexRoom(const IndexRoom&) = delete;
  IndexRoom& operator=(const IndexRoom&) = delete;

 private:
  // What SQLite calls instead of the file's own methods. It comes first: the address that SQLite
  // has of it leads back to the rest.
  struct Methods {
    sqlite3_io_methods replaced;
    const sqlite3_io_methods* own;
  };
  static int mapIndex(sqlite3_file* file, int region, int bytes, int extends, void volatile** at);

  Methods methods_{};
};

}  // namespace tavrel
