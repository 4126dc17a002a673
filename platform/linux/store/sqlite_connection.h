// A thin ownership layer over SQLite for the statistics store.
//
// `SqliteConnection` owns a connection, `SqliteStatement` a compiled statement of it; a statement
// must not outlive its connection. Inside the store every failure is thrown as a `StoreFailure`,
// which the store's public operations catch, so it never leaves this folder.
//
//   SqliteStatement statement(connection, "SELECT value FROM scalars WHERE day = ?1");
//   statement.bind(1, day);
//   while (statement.step()) use(statement.integer(0));
#pragma once

#include <chrono>
#include <cstdint>
#include <exception>
#include <memory>
#include <string>
#include <string_view>
#include <utility>

struct sqlite3;
struct sqlite3_stmt;

namespace tavrel {

class WalIndexAllocation;

enum class StoreFault : std::uint8_t {
  Damaged,  // SQLite reports the file as corrupt, or as no database
  Busy,     // another process held its lock for too long
  Refused,  // the system denies access to the file
  Device,   // reading or writing fails, because of a fault or lack of space
  Foreign,  // no file that this program made or knows; left alone
  Other,
};

/// What failed, why, and what can be done about it; without the store's path.
struct StoreFailure : std::exception {
  StoreFailure(StoreFault kind, std::string text) : fault(kind), message(std::move(text)) {}
  const char* what() const noexcept override { return message.c_str(); }

  StoreFault fault;
  std::string message;
};

/// Advice about a failed system call by its error code; `otherwise` for other codes.
const char* adviceFor(int systemCode, const char* otherwise);

/// How long to wait for locks of other processes: one amount of time that all waits use up and that
/// is never refilled. Not thread-safe.
class BusyBudget {
 public:
  explicit BusyBudget(int milliseconds) : left_(std::chrono::milliseconds(milliseconds)) {}

  /// Waits a moment before the next attempt to lock; false when the time is used up.
  bool wait();

 private:
  std::chrono::steady_clock::duration left_;
};

class SqliteConnection {
 public:
  enum class Access : std::uint8_t {
    Create,      // read and write; an absent file is created
    WriteAlone,  // read and write; keeps all others out, and needs no file for the log's index
    Read,        // read; uses the write-ahead log as far as permissions allow
    ReadAlone,   // read; keeps all others out, and needs no file for the log's index
    Immutable,   // read a file that no process writes, without locks or a log
  };

  SqliteConnection(const std::string& path, Access access, std::shared_ptr<BusyBudget> busy);
  ~SqliteConnection();
  SqliteConnection(SqliteConnection&& other) noexcept;
  SqliteConnection& operator=(SqliteConnection&& other) noexcept;

  /// Runs statements and ignores their rows.
  void execute(const char* sql);

  /// The first column of the first row.
  std::int64_t integer(std::string_view sql);

  enum class LogFile : std::uint8_t {
    Kept,    // keeps its blocks for the next commits; see sqlite_log_file.h
    CutOff,  // nothing of its content is left
  };

  /// Moves the write-ahead log into the database and empties it. False when other processes
  /// prevented part of that for the whole wait; as much as possible has then been moved.
  bool checkpoint(bool waits = true, LogFile file = LogFile::Kept);

  sqlite3* handle() const { return handle_; }

 private:
  sqlite3* handle_ = nullptr;
  std::shared_ptr<BusyBudget> busy_;
  std::unique_ptr<WalIndexAllocation> walIndexAllocation_;
};

class SqliteStatement {
 public:
  SqliteStatement(const SqliteConnection& connection, std::string_view sql);
  ~SqliteStatement();
  SqliteStatement(const SqliteStatement&) = delete;
  SqliteStatement& operator=(const SqliteStatement&) = delete;

  void bind(int index, std::int64_t value);
  /// Binds bytes as a blob; they are borrowed until the statement is reset.
  void bind(int index, std::string_view bytes);
  void bindNull(int index);

  /// True with a row, false at the end.
  bool step();
  /// Makes the statement ready to run again; bindings stay.
  void reset();
  /// Runs to the end and makes the statement ready to run again.
  void run();
  /// As `run`, for a change of rows that the same transaction has found: a change that affects none
  /// means that the store is damaged.
  void runOnFound();

  bool isNull(int column) const;
  std::int64_t integer(int column) const;
  /// Valid until the next step or reset.
  std::string_view bytes(int column) const;

 private:
  void check(int code) const;

  sqlite3_stmt* handle_ = nullptr;
};

}  // namespace tavrel
