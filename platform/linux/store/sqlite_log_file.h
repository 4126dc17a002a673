// The file of SQLite's write-ahead log, "-wal".
//
// SQLite empties the log by cutting the file off. The next commits would then lengthen it again,
// and each would have the file system write its own tables: on ext4 some 20 KB for each commit. A
// log that is emptied here keeps its file up to `kKeptLogBytes`; only its head is overwritten with
// zeros. For SQLite, and for the programs that use it, such a log holds nothing.
#pragma once

#include <cstdint>
#include <sqlite3.h>
#include <string>

namespace tavrel {

inline constexpr std::int64_t kKeptLogBytes = 1 << 20;

/// Whether the store at `path` has a log that may hold something.
bool logHoldsPages(const std::string& path);

/// While it lives, the connection empties its log in this way.
class KeptLogFile {
 public:
  /// The connection must outlive it, and have read something.
  explicit KeptLogFile(sqlite3* connection);
  ~KeptLogFile();
  KeptLogFile(const KeptLogFile&) = delete;
  KeptLogFile& operator=(const KeptLogFile&) = delete;

 private:
  // SQLite calls this instead of the file's own methods. It is the first member: the address that
  // SQLite has leads back to the other members.
  struct Methods {
    sqlite3_io_methods replaced;
    const sqlite3_io_methods* own;
  };
  static int cutOff(sqlite3_file* file, sqlite3_int64 bytes);

  sqlite3_file* file_ = nullptr;
  Methods methods_{};
};

}  // namespace tavrel
