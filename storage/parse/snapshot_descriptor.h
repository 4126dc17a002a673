// The descriptor that a storage controller supplies with snapshot records of any size: the number
// of records, and the location, kind and format of each field.
//
// Little-endian, offsets in bytes from its start:
//
//    4  version                                 field table, at its offset:
//    8  stride: bytes from record to record       0  count of fields
//   12  count of records                          8  28 bytes a field:
//   24  offset of the field table                      0  kind (16 bits)
//   32  key, to its zero byte (version 6 on)           4  offset of the value in a record
//                                                      8  bytes of latencies (kind 3)
//                                                     12  format, 16 bytes, to its zero byte
//
// Kinds 0 and 1 are numbers, 2 microseconds, 3 latencies. Fields of other kinds print nothing and
// are ignored, except for the offset of a first field: future firmware may put anything there.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>
#include <vector>

#include "base/bytes.h"
#include "base/expected.h"
#include "storage/parse/snapshot_field.h"

namespace tavrel {

/// A checked descriptor. Texts are borrowed from its bytes.
struct SnapshotDescriptor {
  std::optional<std::string_view> key;  // printed instead of the usual key of the columns
  std::size_t stride;                   // bytes from one record to the next
  std::size_t count;                    // of records
  std::uint32_t presenceOffset;         // of the word that is 0 in an unused record
  std::vector<SnapshotField> fields;    // only those that print something
};

/// Checks a descriptor for consistency and against the size of the records' buffer: all reads of
/// all records must lie in the buffer. Records may overlap, and the last may end after its last
/// read. Refuses, with the reason, a descriptor with an offset outside the buffer or itself, a text
/// without its zero byte, a table without fields when there are records (the first field says which
/// are used), and a format that needs other arguments than its kind provides: numbers for kinds 0
/// to 2, a text for kind 3, no widths. A format may take fewer arguments than provided.
Expected<SnapshotDescriptor> readSnapshotDescriptor(ByteSpan descriptor, std::size_t recordBytes);

}  // namespace tavrel
