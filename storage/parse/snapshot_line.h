// Text that grows in a caller's buffer, piece by piece, and the lines of snapshot records.
#pragma once

#include <cstddef>
#include <span>
#include <string>
#include <string_view>

#include "base/bytes.h"
#include "base/format.h"
#include "storage/parse/snapshot_field.h"

namespace tavrel {

class SnapshotWriter {
 public:
  /// Borrows the buffer, whose last byte is reserved for a terminating zero byte.
  explicit SnapshotWriter(std::span<char> buffer) : rest_(buffer), capacity_(buffer.size()) {}

  /// Adds a piece. False when the piece and a zero byte do not fit; as much as fits has then been
  /// added.
  bool write(std::string_view piece);

  /// Adds the fields of one record and a line end. All fields must lie in the record.
  bool writeLine(std::span<const SnapshotField> fields, ByteSpan record);

  std::size_t length() const { return capacity_ - rest_.size(); }

 private:
  bool writeField(const SnapshotField& field, ByteSpan record);
  bool writeLatencies(const SnapshotField& field, ByteSpan record);
  bool print(const SnapshotField& field, std::span<const FormatArgument> given);

  std::span<char> rest_;
  std::size_t capacity_;
  std::string piece_;  // reused for each piece
};

}  // namespace tavrel
