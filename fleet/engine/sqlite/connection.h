// Owns an SQLite connection and its statements. Failures are thrown as EngineError.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "fleet/engine/engine.h"

struct sqlite3;
struct sqlite3_stmt;

namespace tavrel::fleet {

class Connection {
 public:
  /// `path` names a file, whatever it begins with.
  Connection(const std::string& path, OpenMode mode);

  void execute(const char* sql);
  /// The first column of the first row.
  std::int64_t integer(const char* sql);
  /// How many rows the last statement changed.
  int changes() const;

  sqlite3* handle() const { return handle_.get(); }
  const std::string& path() const { return path_; }

  [[noreturn]] void fail(int code) const;

 private:
  struct Close {
    void operator()(sqlite3* handle) const;
  };

  std::string path_;
  OpenMode mode_;
  std::unique_ptr<sqlite3, Close> handle_;
};

/// Must not outlive its connection. Bound values must stay valid until the next reset.
class Statement {
 public:
  Statement(const Connection& connection, std::string_view sql);

  void bind(int index, std::int64_t value);
  void bind(int index, double value);
  void bind(int index, std::string_view text);
  void bindBlob(int index, std::string_view bytes);

  /// True when there is a row, false at the end.
  bool step();
  /// Keeps the bindings.
  void reset();
  /// Runs to the end and resets.
  void run();

  std::int64_t integer(int column) const;
  double real(int column) const;
  /// Valid until the next step or reset.
  std::string_view text(int column) const;

 private:
  struct Finalize {
    void operator()(sqlite3_stmt* handle) const;
  };

  void check(int code) const;

  const Connection& connection_;
  std::unique_ptr<sqlite3_stmt, Finalize> handle_;
};

/// A transaction that writes; rolled back unless it is committed.
class WriteTransaction {
 public:
  explicit WriteTransaction(Connection& connection);
  ~WriteTransaction();
  WriteTransaction(const WriteTransaction&) = delete;
  WriteTransaction& operator=(const WriteTransaction&) = delete;

  void commit();

 private:
  Connection& connection_;
  bool open_ = true;
};

}  // namespace tavrel::fleet
