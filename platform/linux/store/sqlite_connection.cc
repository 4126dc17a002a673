#include "platform/linux/store/sqlite_connection.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <optional>
#include <sqlite3.h>
#include <thread>
#include <unistd.h>
#include <utility>

#include "base/ascii.h"
#include "base/system_text.h"
#include "platform/linux/store/sqlite_library.h"
#include "platform/linux/store/sqlite_log_file.h"
#include "platform/linux/store/wal_index_allocation.h"

namespace tavrel {
namespace {

constexpr const char* kFreeSpace = "free some space in its file system";

struct Explanation {
  StoreFault fault;
  const char* advice;
};

Explanation explain(int code) {
  switch (code & 0xFF) {
    case SQLITE_CORRUPT:
    case SQLITE_NOTADB:
      return {StoreFault::Damaged, "the file has to be set aside"};
    case SQLITE_BUSY:
    case SQLITE_LOCKED:
    case SQLITE_PROTOCOL:
      return {StoreFault::Busy, "try again when the process that holds it has finished"};
    case SQLITE_CANTOPEN:
    case SQLITE_READONLY:
    case SQLITE_PERM:
    case SQLITE_AUTH:
      return {StoreFault::Refused, "check owner and permissions of the file and its folder"};
    case SQLITE_ERROR:
      return {StoreFault::Foreign, "the tables are not this program's; move the file away"};
    case SQLITE_FULL:
      return {StoreFault::Device, kFreeSpace};
    case SQLITE_IOERR:
      return {StoreFault::Device, "check the file system that holds it"};
    case SQLITE_NOMEM:
      return {StoreFault::Other, "free some memory"};
    default:
      return {StoreFault::Other, "check the file system that holds it"};
  }
}

// The `errno` with which the system forbids writing the database; 0 when it does not, or when there
// is no database.
int obstacleToWriting(sqlite3* connection) {
  const char* const name = sqlite().db_filename(connection, "main");
  const std::string path = name ? name : "";
  if (path.empty()) return 0;
  const std::string folder = path.substr(0, path.rfind('/') + 1);
  for (const std::string& place : {path, folder}) {
    if (!place.empty() && faccessat(AT_FDCWD, place.c_str(), W_OK, AT_EACCESS) != 0) return errno;
  }
  return 0;
}

// The `errno` of a failure, 0 when there is none. When SQLite cannot open a file for writing, it
// tries to open it for reading and reports the code of that attempt; this finds the code of the
// first attempt.
int systemCodeOf(sqlite3* connection, int code) {
  switch (code & 0xFF) {
    case SQLITE_IOERR:
      return sqlite().system_errno(connection);
    case SQLITE_CANTOPEN:
      if (const int obstacle = obstacleToWriting(connection)) return obstacle;
      return sqlite().system_errno(connection);
    case SQLITE_READONLY:
      return obstacleToWriting(connection);
    default:
      return 0;
  }
}

[[noreturn]] void throwFailure(sqlite3* connection, int code) {
  auto [fault, advice] = explain(code);
  std::string message = connection ? sqlite().errmsg(connection) : sqlite().errstr(code);
  if (const int systemCode = connection ? systemCodeOf(connection, code) : 0) {
    message += " (";
    message += systemText(systemCode);
    message += ')';
    advice = adviceFor(systemCode, advice);
    if (advice == kFreeSpace) fault = StoreFault::Device;
  }
  throw StoreFailure{fault, message + ": " + advice};
}

int waitForLock(void* busy, int) {
  return static_cast<BusyBudget*>(busy)->wait();
}

// SQLite's URI form is the only way to ask for an immutable file; "%", "?" and "#" are special in
// it.
std::string immutableUri(const std::string& path) {
  std::string uri = "file:";
  for (const char character : path) {
    if (character == '%' || character == '?' || character == '#') {
      uri += '%';
      appendHexByte(uri, character);
    } else {
      uri += character;
    }
  }
  return uri + "?immutable=1";
}

}  // namespace

const char* adviceFor(int systemCode, const char* otherwise) {
  switch (systemCode) {
    case ENOSPC:
    case EDQUOT:
      return kFreeSpace;
    case EROFS:
      return "mount its file system for writing";
    default:
      return otherwise;
  }
}

bool BusyBudget::wait() {
  using Clock = std::chrono::steady_clock;
  constexpr Clock::duration kMoment = std::chrono::milliseconds(5);
  if (left_ <= Clock::duration::zero()) return false;
  const auto begin = Clock::now();
  std::this_thread::sleep_for(std::min(kMoment, left_));
  left_ -= Clock::now() - begin;
  return true;
}

SqliteConnection::SqliteConnection(const std::string& path, Access access,
                                   std::shared_ptr<BusyBudget> busy)
    : busy_(std::move(busy)) {
  int flags = SQLITE_OPEN_NOMUTEX | SQLITE_OPEN_EXRESCODE;
  std::string name = path;
  switch (access) {
    case Access::Create:
      flags |= SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE;
      break;
    case Access::WriteAlone:
    case Access::Read:
    case Access::ReadAlone:
      // Ask for writing too: only a user who may write can use a log that has no index. SQLite
      // falls back to reading for a write-protected file.
      flags |= SQLITE_OPEN_READWRITE;
      break;
    case Access::Immutable:
      flags |= SQLITE_OPEN_READONLY | SQLITE_OPEN_URI;
      name = immutableUri(path);
      break;
  }
  const int code = sqlite().open_v2(name.c_str(), &handle_, flags, nullptr);
  try {
    if (code != SQLITE_OK) throwFailure(handle_, code);
    walIndexAllocation_ = std::make_unique<WalIndexAllocation>(handle_);
    sqlite().busy_handler(handle_, waitForLock, busy_.get());
    // The file may come from anywhere, so nothing in its schema may run.
    sqlite().db_config(handle_, SQLITE_DBCONFIG_DEFENSIVE, 1, nullptr);
    sqlite().db_config(handle_, SQLITE_DBCONFIG_TRUSTED_SCHEMA, 0, nullptr);
    sqlite().db_config(handle_, SQLITE_DBCONFIG_ENABLE_TRIGGER, 0, nullptr);
    sqlite().db_config(handle_, SQLITE_DBCONFIG_ENABLE_VIEW, 0, nullptr);
    if (access == Access::ReadAlone || access == Access::WriteAlone) {
      execute("PRAGMA locking_mode = EXCLUSIVE");
    }
    // Closing keeps the log: moving it into the database each time would write every page twice per
    // commit.
    sqlite().db_config(handle_, SQLITE_DBCONFIG_NO_CKPT_ON_CLOSE, 1, nullptr);
    execute("PRAGMA cell_size_check = ON; PRAGMA cache_size = -512; PRAGMA secure_delete = FAST");
  } catch (...) {
    sqlite().close_v2(handle_);
    throw;
  }
}

SqliteConnection::~SqliteConnection() {
  if (handle_) sqlite().close_v2(handle_);
}

SqliteConnection::SqliteConnection(SqliteConnection&& other) noexcept
    : handle_(std::exchange(other.handle_, nullptr)),
      busy_(std::move(other.busy_)),
      walIndexAllocation_(std::move(other.walIndexAllocation_)) {}

SqliteConnection& SqliteConnection::operator=(SqliteConnection&& other) noexcept {
  std::swap(handle_, other.handle_);
  std::swap(busy_, other.busy_);
  std::swap(walIndexAllocation_, other.walIndexAllocation_);
  return *this;
}

void SqliteConnection::execute(const char* sql) {
  const int code = sqlite().exec(handle_, sql, nullptr, nullptr, nullptr);
  if (code != SQLITE_OK) throwFailure(handle_, code);
}

std::int64_t SqliteConnection::integer(std::string_view sql) {
  SqliteStatement statement(*this, sql);
  return statement.step() ? statement.integer(0) : 0;
}

bool SqliteConnection::checkpoint(bool waits, LogFile file) {
  std::optional<KeptLogFile> kept;
  if (file == LogFile::Kept) kept.emplace(handle_);
  if (!waits) sqlite().busy_handler(handle_, nullptr, nullptr);
  const int code =
      sqlite().wal_checkpoint_v2(handle_, nullptr, SQLITE_CHECKPOINT_TRUNCATE, nullptr, nullptr);
  if (!waits) sqlite().busy_handler(handle_, waitForLock, busy_.get());
  if (code == SQLITE_OK) return true;
  if ((code & 0xFF) == SQLITE_BUSY || (code & 0xFF) == SQLITE_LOCKED) return false;
  throwFailure(handle_, code);
}

SqliteStatement::SqliteStatement(const SqliteConnection& connection, std::string_view sql) {
  const int code = sqlite().prepare_v2(connection.handle(), sql.data(),
                                       static_cast<int>(sql.size()), &handle_, nullptr);
  if (code != SQLITE_OK) throwFailure(connection.handle(), code);
}

SqliteStatement::~SqliteStatement() {
  sqlite().finalize(handle_);
}

void SqliteStatement::check(int code) const {
  if (code != SQLITE_OK) throwFailure(sqlite().db_handle(handle_), code);
}

void SqliteStatement::bind(int index, std::int64_t value) {
  check(sqlite().bind_int64(handle_, index, value));
}

void SqliteStatement::bind(int index, std::string_view bytes) {
  // A null pointer would bind NULL instead of an empty blob.
  const char* const data = bytes.data() ? bytes.data() : "";
  check(sqlite().bind_blob64(handle_, index, data, bytes.size(), SQLITE_STATIC));
}

void SqliteStatement::bindNull(int index) {
  check(sqlite().bind_null(handle_, index));
}

bool SqliteStatement::step() {
  const int code = sqlite().step(handle_);
  if (code == SQLITE_ROW) return true;
  if (code == SQLITE_DONE) return false;
  throwFailure(sqlite().db_handle(handle_), code);
}

void SqliteStatement::reset() {
  // A reset returns the failure of the previous step again, which has been thrown already.
  sqlite().reset(handle_);
}

void SqliteStatement::run() {
  while (step()) {
  }
  reset();
}

void SqliteStatement::runOnFound() {
  run();
  if (sqlite().changes(sqlite().db_handle(handle_)) > 0) return;
  throw StoreFailure{StoreFault::Damaged,
                     "its rows are not in the order of their keys: restore the file from a copy or "
                     "move it away"};
}

bool SqliteStatement::isNull(int column) const {
  return sqlite().column_type(handle_, column) == SQLITE_NULL;
}

std::int64_t SqliteStatement::integer(int column) const {
  return sqlite().column_int64(handle_, column);
}

std::string_view SqliteStatement::bytes(int column) const {
  const void* const data = sqlite().column_blob(handle_, column);
  const int size = sqlite().column_bytes(handle_, column);
  return data ? std::string_view(static_cast<const char*>(data), static_cast<std::size_t>(size))
              : std::string_view();
}

}  // namespace tavrel
