#include "fleet/engine/sqlite/connection.h"

#include <cmath>
#include <sqlite3.h>

#include "base/system_text.h"
#include "fleet/engine/sqlite/real.h"

namespace tavrel::fleet {
namespace {

constexpr int kBusyMilliseconds = 60'000;

// To read, SQLite needs two files beside the database, and makes those that are missing.
constexpr const char* kCopy =
    "copy it to a folder that you may write in, or load a log into it as its owner";

const char* adviceFor(int code, OpenMode mode) {
  const bool writes = mode == OpenMode::Write;
  switch (code & 0xFF) {
    case SQLITE_BUSY:
    case SQLITE_LOCKED:
      return "another program has been writing to it for a long time; try again when that has "
             "ended";
    case SQLITE_CORRUPT:
    case SQLITE_NOTADB:
      return "it is damaged; load the logs into a new file";
    case SQLITE_FULL:
      return "free some space in its file system";
    case SQLITE_READONLY:
      return writes ? "check who owns the file and the two beside it that end in -wal and -shm"
                    : kCopy;
    case SQLITE_CANTOPEN:
    case SQLITE_PERM:
    case SQLITE_AUTH:
      return writes ? "check owner and permissions of the file and its folder" : kCopy;
    case SQLITE_ERROR:
    case SQLITE_CONSTRAINT:
      return "its tables are not as this program made them; load the logs into a new file";
    case SQLITE_NOMEM:
      return "load or query less at once";
    default:
      return "check the file system that holds it";
  }
}

}  // namespace

void Connection::Close::operator()(sqlite3* handle) const {
  sqlite3_close(handle);
}

Connection::Connection(const std::string& path, OpenMode mode) : path_(path), mode_(mode) {
  const bool writes = mode == OpenMode::Write;
  // SQLite gives ":memory:" and "file:..." a meaning of their own.
  const std::string plain = path.starts_with('/') ? path : "./" + path;
  sqlite3* handle = nullptr;
  const int flags = (writes ? SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE : SQLITE_OPEN_READONLY) |
                    SQLITE_OPEN_NOMUTEX | SQLITE_OPEN_EXRESCODE;
  const int code = sqlite3_open_v2(plain.c_str(), &handle, flags, nullptr);
  handle_.reset(handle);
  if (code != SQLITE_OK) fail(code);
  sqlite3_busy_timeout(handle, kBusyMilliseconds);
  // The log and its index stay when the last loader ends. A reader would have to make them, which
  // needs a writable folder and keeps loaders of another user out.
  int persists = 1;
  if (writes) sqlite3_file_control(handle, nullptr, SQLITE_FCNTL_PERSIST_WAL, &persists);
}

void Connection::fail(int code) const {
  std::string text = path_ + ": " + (handle_ ? sqlite3_errmsg(handle()) : sqlite3_errstr(code));
  if (const int system = handle_ ? sqlite3_system_errno(handle()) : 0;
      system != 0 && ((code & 0xFF) == SQLITE_IOERR || (code & 0xFF) == SQLITE_CANTOPEN))
    text += " (" + systemText(system) + ")";
  throw EngineError(text + ": " + adviceFor(code, mode_));
}

void Connection::execute(const char* sql) {
  if (const int code = sqlite3_exec(handle(), sql, nullptr, nullptr, nullptr); code != SQLITE_OK)
    fail(code);
}

std::int64_t Connection::integer(const char* sql) {
  Statement statement(*this, sql);
  return statement.step() ? statement.integer(0) : 0;
}

int Connection::changes() const {
  return sqlite3_changes(handle());
}

void Statement::Finalize::operator()(sqlite3_stmt* handle) const {
  sqlite3_finalize(handle);
}

Statement::Statement(const Connection& connection, std::string_view sql) : connection_(connection) {
  sqlite3_stmt* handle = nullptr;
  check(sqlite3_prepare_v3(connection.handle(), sql.data(), static_cast<int>(sql.size()),
                           SQLITE_PREPARE_PERSISTENT, &handle, nullptr));
  handle_.reset(handle);
}

void Statement::check(int code) const {
  if (code != SQLITE_OK) connection_.fail(code);
}

void Statement::bind(int index, std::int64_t value) {
  check(sqlite3_bind_int64(handle_.get(), index, value));
}

void Statement::bind(int index, double value) {
  if (std::isnan(value) && !isUsualNan(value)) {
    check(sqlite3_bind_blob64(handle_.get(), index, &value, sizeof value, SQLITE_TRANSIENT));
  } else {
    check(sqlite3_bind_double(handle_.get(), index, value));
  }
}

void Statement::bind(int index, std::string_view text) {
  check(sqlite3_bind_text64(handle_.get(), index, text.empty() ? "" : text.data(), text.size(),
                            SQLITE_STATIC, SQLITE_UTF8));
}

void Statement::bindBlob(int index, std::string_view bytes) {
  check(sqlite3_bind_blob64(handle_.get(), index, bytes.data(), bytes.size(), SQLITE_STATIC));
}

bool Statement::step() {
  const int code = sqlite3_step(handle_.get());
  if (code == SQLITE_ROW) return true;
  if (code != SQLITE_DONE) connection_.fail(code);
  return false;
}

void Statement::reset() {
  sqlite3_reset(handle_.get());
}

void Statement::run() {
  while (step()) {
  }
  reset();
}

std::int64_t Statement::integer(int column) const {
  return sqlite3_column_int64(handle_.get(), column);
}

double Statement::real(int column) const {
  return realOf(sqlite3_column_value(handle_.get(), column));
}

std::string_view Statement::text(int column) const {
  const auto* const bytes = static_cast<const char*>(sqlite3_column_blob(handle_.get(), column));
  return {bytes == nullptr ? "" : bytes,
          static_cast<std::size_t>(sqlite3_column_bytes(handle_.get(), column))};
}

WriteTransaction::WriteTransaction(Connection& connection) : connection_(connection) {
  connection_.execute("BEGIN IMMEDIATE");
}

WriteTransaction::~WriteTransaction() {
  if (open_) sqlite3_exec(connection_.handle(), "ROLLBACK", nullptr, nullptr, nullptr);
}

void WriteTransaction::commit() {
  connection_.execute("COMMIT");
  open_ = false;
}

}  // namespace tavrel::fleet
