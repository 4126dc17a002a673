// Collects the scalar changes of several segments for one transaction.
//
// Of several sets of a row, the latest by its program's clock counts; adds are added to it.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <utility>

#include "base/expected.h"
#include "platform/linux/store/sqlite_batch.h"

namespace tavrel {

/// The name of a row in the store: its day and its key.
using RowName = std::pair<std::int32_t, std::string>;

/// In the order in which the store's rows are read.
struct LessRowName {
  using is_transparent = void;
  template <class A, class B>
  bool operator()(const A& a, const B& b) const {
    if (a.first != b.first) return a.first < b.first;
    return std::string_view(a.second) < std::string_view(b.second);
  }
};
template <class Row>
using RowMap = std::map<RowName, Row, LessRowName>;

class ScalarChanges {
 public:
  struct Change {
    bool isSet = false;
    std::int64_t value = 0;  // of the set
    std::int64_t added = 0;
  };

  /// `added`: the total added to the row so far, including earlier transactions.
  void set(std::int32_t day, std::string_view key, std::int64_t value, std::int64_t added);
  void add(std::int32_t day, std::string_view key, std::int64_t amount);

  const RowMap<Change>& rows() const { return changes_; }
  /// Memory of the keys.
  std::size_t bytes() const { return bytes_; }
  /// The number of changes left out because the value would overflow 64 bits.
  std::uint64_t overflows() const { return overflows_; }

  Status giveTo(SqliteBatch& batch);

 private:
  Change& changeOf(std::int32_t day, std::string_view key);

  RowMap<Change> changes_;
  std::size_t bytes_ = 0;
  std::uint64_t overflows_ = 0;
};

}  // namespace tavrel
