// Rows that wait to be inserted, and a virtual table that hands them to SQLite.
//
// One INSERT … SELECT from a virtual table takes about half the time of binding and running
// a statement for each row.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "fleet/engine/sqlite/connection.h"
#include "fleet/engine/sqlite/row_id.h"
#include "fleet/model/log_record.h"

struct sqlite3_context;

namespace tavrel::fleet {

/// Rows in the order of their identifiers. Only one statement at a time may walk them.
class RowSource {
 public:
  virtual ~RowSource() = default;

  virtual void rewind() = 0;
  virtual bool atEnd() const = 0;
  virtual void next() = 0;
  virtual std::int64_t id() const = 0;
  /// Sets the result to the value of a column, counted from 1.
  virtual void value(sqlite3_context* result, int column) const = 0;
};

/// Makes a table `name` with the columns id, a, b, c, d and e, whose rows are those of the source.
/// The source must outlive every statement that reads the table. Adding another source under the
/// same name replaces this one.
void addRowTable(const Connection& connection, const char* name, RowSource& source);

void setResult(sqlite3_context* result, std::int64_t value, int column);
void setResult(sqlite3_context* result, const FiveNumbers* numbers, int column);

/// Rows for one block of one table, grouped by the number of their name.
template <class Payload>
class PendingRows : public RowSource {
 public:
  struct Row {
    std::int64_t place;
    Payload payload;
  };

  /// The places of a name must ascend.
  void add(std::int64_t name, std::int64_t place, Payload payload) {
    const auto index = static_cast<std::size_t>(name);
    if (index >= names_.size()) names_.resize(index + index / 2 + 1);
    names_[index].push_back({place, payload});
    ++count_;
  }

  /// The row that was added last for the name; null when there is none.
  Row* last(std::int64_t name) {
    const auto index = static_cast<std::size_t>(name);
    return index < names_.size() && !names_[index].empty() ? &names_[index].back() : nullptr;
  }

  bool empty() const { return count_ == 0; }
  void setBlock(std::int64_t block) { block_ = block; }
  void clear() {
    for (std::vector<Row>& rows : names_)
      rows.clear();
    count_ = 0;
  }

  void rewind() override {
    name_ = row_ = 0;
    skipEmpty();
  }
  bool atEnd() const override { return name_ == names_.size(); }
  void next() override {
    if (++row_ < names_[name_].size()) return;
    row_ = 0;
    ++name_;
    skipEmpty();
  }
  std::int64_t id() const override {
    return firstRowId(block_, static_cast<std::int64_t>(name_)) + names_[name_][row_].place;
  }
  void value(sqlite3_context* result, int column) const override {
    setResult(result, names_[name_][row_].payload, column);
  }

 private:
  void skipEmpty() {
    while (!atEnd() && names_[name_].empty())
      ++name_;
  }

  std::vector<std::vector<Row>> names_;
  std::size_t count_ = 0;
  std::int64_t block_ = 0;
  std::size_t name_ = 0;
  std::size_t row_ = 0;
};

}  // namespace tavrel::fleet
