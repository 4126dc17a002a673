// The file of SQLite's write-ahead log, "-wal".
//
// SQLite empties the log by truncating the file. The next commits then extend it again, and each
// makes the file system write its metadata: on ext4 some 20 KB per commit. A log emptied here keeps
// up to `kKeptLogBytes` of its file, and only its header is overwritten with zeros. To SQLite, and
// to the programs that use it, such a log is empty.
#pragma once

#include <cstdint>
#include <sqlite3.h>
#include <string>

namespace tavrel {

inline constexpr std::int64_t kKeptLogBytes = 1 << 20;

/// Whether the store at `path` has a log that may hold something.
bool logHoldsPages(const std::string& path);

/// During its lifetime, the connection empties its log in this way.
class KeptLogFile {
 public:
  /// The connection must outlive it, and have read something.
  explicit KeptLogFile(sqlite3* connection);
  ~KeptLogFile();
  KeptLogFile(const KeptLogFile&) = delete;
  KeptLogFile& operator=(const KeptLogFile&) = delete;

 private:
  // SQLite calls this instead of the file's own methods. It must be the first member: SQLite's
  // pointer to it also leads to the other members.
  struct Methods {
    sqlite3_io_methods replaced;
    const sqlite3_io_methods* own;
  };
  static int cutOff(sqlite3_file* file, sqlite3_int64 bytes);

  sqlite3_file* file_ = nullptr;
  Methods methods_{};
};

}  // namespace tavrel
