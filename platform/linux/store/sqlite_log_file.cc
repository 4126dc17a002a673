#include "platform/linux/store/sqlite_log_file.h"

#include <algorithm>
#include <array>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/linux/files/descriptor.h"
#include "platform/linux/store/sqlite_library.h"

namespace tavrel {
namespace {

// The log's header. When it is all zeros, SQLite takes the log as empty.
constexpr std::size_t kHeadBytes = 32;

}  // namespace

bool logHoldsPages(const std::string& path) {
  const Descriptor file(open((path + "-wal").c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  std::array<char, kHeadBytes> head{};
  const ssize_t size = file ? pread(file.get(), head.data(), head.size(), 0) : -1;
  if (size >= 0) return std::ranges::any_of(head, [](char byte) { return byte != 0; });
  // A log that this user may not read may hold anything.
  struct stat status {};
  return stat((path + "-wal").c_str(), &status) == 0 && status.st_size != 0;
}

KeptLogFile::KeptLogFile(sqlite3* connection) {
  sqlite3_file* file = nullptr;
  const int code = sqlite().file_control(connection, "main", SQLITE_FCNTL_JOURNAL_POINTER,
                                         static_cast<void*>(&file));
  if (code != SQLITE_OK || !file || !file->pMethods) return;
  file_ = file;
  methods_ = {*file->pMethods, file->pMethods};
  methods_.replaced.xTruncate = cutOff;
  file->pMethods = &methods_.replaced;
}

KeptLogFile::~KeptLogFile() {
  if (file_) file_->pMethods = methods_.own;
}

// The zeros need no flush. Until they, or the header of a new log, reach the medium, the old log is
// intact, and its content has already been moved to the database and flushed.
int KeptLogFile::cutOff(sqlite3_file* file, sqlite3_int64 bytes) {
  const sqlite3_io_methods& own = *reinterpret_cast<const Methods*>(file->pMethods)->own;
  if (bytes != 0) return own.xTruncate(file, bytes);
  sqlite3_int64 size = 0;
  int code = own.xFileSize(file, &size);
  if (code == SQLITE_OK && size > kKeptLogBytes) code = own.xTruncate(file, kKeptLogBytes);
  if (code != SQLITE_OK || size == 0) return code;
  constexpr std::array<char, kHeadBytes> kZeros{};
  return own.xWrite(file, kZeros.data(), static_cast<int>(kZeros.size()), 0);
}

}  // namespace tavrel
