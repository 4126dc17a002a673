// What tavrel does before or instead of SQLite's own calls on the file of a connection.
//
// Room for the index of the write-ahead log: SQLite maps the index, the "-shm" file, and writes
// into the mapping. It extends the file by writing one byte per page of 4 KiB, which leaves holes
// on a file system with smaller blocks. On a full disk, a write into a hole raises SIGBUS. Here
// every page of the index is allocated before SQLite sees it. Without enough room, writers and
// readers then get SQLITE_FULL.
//
// Reading ahead: the pages of a day's values follow each other. A reader fetches them in blocks of
// 64 KiB, not with a call of the system for each. A block is forgotten when the connection locks
// something. Until then no other process changes a page of the file that this connection may read:
// if it is in the log, it is read from there.
#pragma once

#include <cstdint>
#include <memory>
#include <sqlite3.h>

namespace tavrel {

class FileMethods {
 public:
  /// Intercepts the calls of the connection, which must not have run a statement yet, on its file.
  /// Must outlive the connection. Reading ahead is for connections that do not write.
  FileMethods(sqlite3* connection, bool readsAhead);
  FileMethods(const FileMethods&) = delete;
  FileMethods& operator=(const FileMethods&) = delete;

 private:
  // SQLite calls this instead of the file's own methods. It is the first member: the address that
  // SQLite has leads back to the other members.
  struct State {
    sqlite3_io_methods replaced;
    const sqlite3_io_methods* own;
    std::unique_ptr<char[]> block;
    std::int64_t blockAt;   // where the block begins in the file; negative when it holds nothing
    std::int64_t lastRead;  // the number of the block that was last asked for
  };
  static State& stateOf(sqlite3_file* file);
  static int mapIndex(sqlite3_file* file, int region, int bytes, int extends, void volatile** at);
  static int read(sqlite3_file* file, void* to, int bytes, sqlite3_int64 offset);
  static int lock(sqlite3_file* file, int level);
  static int lockIndex(sqlite3_file* file, int offset, int count, int flags);

  State state_{};
};

}  // namespace tavrel
