// The storage controller's timeline as a table of text.
//
// A snapshot buffer holds one record per time interval. Both renderers print one line a record,
// under a key of the columns, into a buffer of the caller's:
//
//   std::vector<char> text(1 << 20);
//   std::size_t length = text.size();
//   if (ASPParseSnapshotBuffer(records, text, length) == 1) print({text.data(), length});
//
// `textLength` holds the capacity on entry, of which no more than `text` has is used; on success
// it is replaced by the length of what was written, without the zero byte behind it. The text fits
// when its length is below the capacity. One that does not fit is cut to capacity - 1 bytes, with
// its zero byte; the answer is then 0 and `textLength` is left as it was. Nothing is allocated for
// the text beyond its longest piece, and bytes behind it are not touched.
#pragma once

#include <cstddef>
#include <optional>
#include <span>

#include "base/bytes.h"

namespace tavrel {

/// Renders records of the fixed layout (storage/parse/snapshot_record.h), 252 bytes each; what is
/// left behind the last whole one is ignored. Answers 1, or 0 when the text does not fit.
int ASPParseSnapshotBuffer(ByteSpan records, std::span<char> text, std::size_t& textLength);

/// Renders records as their descriptor says (storage/parse/snapshot_descriptor.h). A record whose
/// first field holds 0 is left out. Answers 1, or 0 when the text does not fit. Without a
/// descriptor, and with one that `readSnapshotDescriptor` refuses, it answers 0 and `text` is left
/// as it was.
int ASPParseSnapshotBufferWithInplaceParser(ByteSpan records, std::span<char> text,
                                            std::size_t& textLength,
                                            std::optional<ByteSpan> descriptor);

}  // namespace tavrel
