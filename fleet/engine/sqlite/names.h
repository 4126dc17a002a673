// The numbers that keys, buckets of histograms and applications have in an SQLite file.
#pragma once

#include <array>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "base/keyed_hash.h"
#include "fleet/engine/engine.h"
#include "fleet/engine/sqlite/connection.h"
#include "fleet/model/log_record.h"
#include "fleet/model/text_arena.h"

namespace tavrel::fleet {

/// Maps texts to numbers, in memory. Logs mostly have the same texts in the same order, so each
/// entry remembers which one was looked up after it.
class NumbersOfTexts {
 public:
  std::optional<std::int64_t> find(std::string_view text);
  void add(std::string_view text, std::int64_t number);

 private:
  struct Entry {
    std::string_view text;
    std::int64_t number = 0;
    std::size_t follower = 0;
  };

  std::vector<Entry> entries_;
  std::unordered_map<std::string_view, std::size_t, KeyedHash> places_;
  TextArena texts_;
  std::size_t last_ = 0;
};

/// Use it only inside a write transaction and after `refresh`. After a rollback, use a new object:
/// this one remembers numbers that were never committed.
class Names {
 public:
  explicit Names(const Connection& connection);

  /// Reads what other loaders have added.
  void refresh();

  std::int64_t key(KeyKind kind, std::string_view name);
  std::int64_t bucket(const CellRow& cell);
  std::int64_t application(const ApplicationRow& application);

 private:
  // One table of names.
  struct Table {
    Table(const Connection& connection, const char* readNew, const char* insert)
        : news(connection, readNew), addition(connection, insert) {}

    /// The number for the next name of the table.
    std::int64_t next(const Connection& connection);

    Statement news;  // the rows above ?1: the id, then the texts of the name
    Statement addition;
    std::int64_t highest = 0;
  };

  const Connection& connection_;
  Table keys_;
  std::array<NumbersOfTexts, 3> keyNumbers_;  // by kind
  Table buckets_;
  NumbersOfTexts bucketNumbers_;
  Table applications_;
  NumbersOfTexts applicationNumbers_;
  std::string text_;
};

}  // namespace tavrel::fleet
