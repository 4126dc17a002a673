// The storage controller's timeline as a table of text.
//
// A snapshot buffer holds one record per time interval. Both renderers write a key of the columns
// and one line per record into the caller's buffer:
//
//   std::vector<char> text(1 << 20);
//   std::size_t length = text.size();
//   if (ASPParseSnapshotBuffer(records, text, length) == 1) print({text.data(), length});
//
// On entry `textLength` is the capacity, limited to the size of `text`; on success it becomes the
// length of the text, without its terminating zero byte. The text fits when its length is below the
// capacity. A text that does not fit is cut to capacity - 1 bytes and a zero byte; the result is
// then 0 and `textLength` stays unchanged. The renderers allocate memory only for the longest piece
// of the text, and do not touch bytes after it.
#pragma once

#include <cstddef>
#include <optional>
#include <span>

#include "base/bytes.h"

namespace tavrel {

/// Renders records of the fixed layout (storage/parse/snapshot_record.h), 252 bytes each; an
/// incomplete last record is ignored. Returns 1, or 0 when the text does not fit.
int ASPParseSnapshotBuffer(ByteSpan records, std::span<char> text, std::size_t& textLength);

/// Renders records according to their descriptor (storage/parse/snapshot_descriptor.h), without
/// those whose first field is 0. Returns 1, or 0 when the text does not fit. Without a descriptor,
/// or with one that `readSnapshotDescriptor` refuses, returns 0 and leaves `text` unchanged.
int ASPParseSnapshotBufferWithInplaceParser(ByteSpan records, std::span<char> text,
                                            std::size_t& textLength,
                                            std::optional<ByteSpan> descriptor);

}  // namespace tavrel
