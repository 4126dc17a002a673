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
  /// The buffer is borrowed; its last byte is for the zero byte after the text.
  explicit SnapshotWriter(std::span<char> buffer) : rest_(buffer), capacity_(buffer.size()) {}

  /// Adds a piece. False when there is no room for all of it and a zero byte; the buffer then ends
  /// with as much of it as fits.
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
  std::string piece_;  // reused from piece to piece
};

}  // namespace tavrel
