// Files records in the tables of an SQLite file.
#pragma once

#include <cstdint>
#include <span>

#include "fleet/engine/engine.h"
#include "fleet/engine/sqlite/connection.h"
#include "fleet/engine/sqlite/names.h"
#include "fleet/engine/sqlite/pending_rows.h"

namespace tavrel::fleet {

/// After an operation has thrown, use a new object.
class Appending {
 public:
  explicit Appending(Connection& connection);

  Engine::Appended append(std::span<const LogRecord> records);

 private:
  void continueLastBlock();
  void beginBlockWhenFull();
  void insertRows();
  bool insertLog(const LogRecord& record);
  void addRows(const LogRecord& record);

  Connection& connection_;
  Names names_;

  PendingRows<std::int64_t> scalars_;
  PendingRows<const FiveNumbers*> distributions_;
  PendingRows<std::int64_t> cells_;
  PendingRows<std::int64_t> activations_;

  Statement insertLog_;
  Statement insertBlock_;
  Statement lastBlock_;

  std::int64_t block_ = 0;
  std::int64_t firstLog_ = 0;  // of the block
  std::int64_t log_ = 0;       // the next one
  std::int64_t blockEnd_ = 0;  // the first log of the next block
};

}  // namespace tavrel::fleet
