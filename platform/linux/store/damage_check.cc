#include "platform/linux/store/damage_check.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <fcntl.h>
#include <sqlite3.h>
#include <unistd.h>

#include "base/system_text.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/store/sqlite_library.h"
#include "platform/linux/store/sqlite_schema.h"

namespace tavrel {
namespace {

constexpr std::size_t kBlock = 64 << 10;

StoreFailure unreadable(const char* what, int code) {
  return {StoreFault::Device, std::string(what) + " cannot be read (" + systemText(code) +
                                  "): check the file system that holds it"};
}

// Reads the database file through SQLite: closing a descriptor of our own would release this
// process's locks on the file.
void readDatabase(const std::string& path) {
  struct Close {
    void operator()(sqlite3* connection) const { sqlite().close_v2(connection); }
  };
  sqlite3* handle = nullptr;
  const int opened = sqlite().open_v2(path.c_str(), &handle, SQLITE_OPEN_READONLY, nullptr);
  const std::unique_ptr<sqlite3, Close> connection(handle);
  sqlite3_file* file = nullptr;
  if (opened != SQLITE_OK ||
      sqlite().file_control(handle, "main", SQLITE_FCNTL_FILE_POINTER, static_cast<void*>(&file)) !=
          SQLITE_OK ||
      file->pMethods == nullptr) {
    throw unreadable("the file", handle ? sqlite().system_errno(handle) : ENOMEM);
  }
  sqlite3_int64 size = 0;
  int code = file->pMethods->xFileSize(file, &size);
  std::array<std::byte, kBlock> block;
  for (sqlite3_int64 at = 0; code == SQLITE_OK && at < size;) {
    const auto length = std::min<sqlite3_int64>(size - at, kBlock);
    code = file->pMethods->xRead(file, block.data(), static_cast<int>(length), at);
    at += length;
  }
  // Another process may have shortened the file.
  if (code != SQLITE_OK && code != SQLITE_IOERR_SHORT_READ) throw unreadable("the file", EIO);
}

void readLog(const std::string& path) {
  const Descriptor file(open((path + "-wal").c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  if (!file && errno == ENOENT) return;
  std::array<std::byte, kBlock> block;
  ssize_t got = file ? 1 : -1;
  while (got > 0)
    got = read(file.get(), block.data(), block.size());
  if (got < 0) throw unreadable("its write-ahead log", errno);
}

}  // namespace

bool isSound(SqliteConnection& connection) {
  SqliteStatement check(connection, "PRAGMA integrity_check(1)");
  return check.step() && check.bytes(0) == "ok";
}

std::optional<StoreFailure> confirmDamage(const std::string& path,
                                          const std::shared_ptr<BusyBudget>& busy,
                                          bool leavesNoTrace) {
  try {
    try {
      auto store = openStoreForReading(path, busy, leavesNoTrace);
      if (!store || isSound(store->connection)) {
        return StoreFailure{StoreFault::Device,
                            "looked damaged, but a second look found it sound: check the file "
                            "system that holds it, and the memory that is free"};
      }
    } catch (const StoreFailure& failure) {
      if (failure.fault != StoreFault::Damaged) throw;
    }
    readDatabase(path);
    readLog(path);
  } catch (const StoreFailure& failure) {
    return failure;
  }
  return std::nullopt;
}

}  // namespace tavrel
