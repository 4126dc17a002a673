// ClickHouse's column format: blocks of rows that hold the values column by column, numbers
// little-endian. Servers write it in two thirds of the time that the row format takes.
#pragma once

#include <concepts>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <span>
#include <string_view>
#include <vector>

#include "base/copy_little.h"

namespace tavrel::fleet {

/// The server's name for the type of a column.
template <class Value>
constexpr std::string_view columnTypeOf() {
  if constexpr (std::same_as<Value, std::uint8_t>) {
    return "UInt8";
  } else if constexpr (std::same_as<Value, std::int32_t>) {
    return "Int32";
  } else if constexpr (std::same_as<Value, std::int64_t>) {
    return "Int64";
  } else if constexpr (std::same_as<Value, std::uint64_t>) {
    return "UInt64";
  } else if constexpr (std::same_as<Value, double>) {
    return "Float64";
  } else {
    static_assert(std::same_as<Value, std::string_view>);
    return "String";
  }
}

/// Finds one block at the start of bytes that arrive in pieces.
class NativeBlock {
 public:
  enum class Found : std::uint8_t {
    Block,
    Part,   // some of its bytes have not arrived yet
    Other,  // columns of other types, or not a block
  };

  /// Looks for a block with columns of these types. The bytes must stay where they are.
  Found find(std::string_view bytes, std::span<const std::string_view> types);

  // About the block that was found:
  std::size_t size() const { return size_; }
  std::size_t rows() const { return rows_; }
  /// Fills a field of each row with the next values of a column.
  template <class Row, class Field>
  void fill(std::size_t column, std::span<Row> rows, const Field& field) {
    const char* next = columns_[column];
    for (Row& row : rows)
      take(next, std::invoke(field, row));
    columns_[column] = next;
  }

 private:
  template <class Value>
  static void take(const char*& next, Value& value) {
    copyLittle(&value, next, sizeof value);
    next += sizeof value;
  }
  static void take(const char*& next, std::string_view& text);

  std::size_t rows_ = 0;
  std::size_t size_ = 0;
  std::vector<const char*> columns_;  // the next value of each
};

}  // namespace tavrel::fleet
