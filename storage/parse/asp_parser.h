// The parser of the storage controller's statistics buffer.
//
// The buffer is a sequence of records, each of whole units of 8 bytes, little-endian: the number of
// a statistic (32 bits), a count (32 bits), and that many values of 64 bits. Nothing is printed.
#pragma once

#include <cstdint>
#include <string_view>

#include "base/bytes.h"
#include "storage/parse/asp_context.h"

namespace tavrel {

/// Adds the content of the buffer to the context. Returns 1 when all records were consumed,
/// otherwise 0: the buffer is shorter than a unit, a record is bad (the export version is then 0),
/// or memory runs out. Records before the failure are kept. Bytes after the last whole unit are
/// skipped.
int ASPParseBufferToCxt(ASPContext& context, ByteSpan buffer);

/// Frees the entries and zeroes the whole context.
void ASPReleaseContext(ASPContext& context);

/// Steps of the parser. They return false when an entry cannot be allocated.

/// Stores and lists the values of one record, which the caller has limited to the statistic's cap.
bool ASPRecordValues(ASPContext& context, std::uint32_t key, std::string_view name,
                     ByteSpan values);

/// Lists a value under the name `prefix` + `suffix`, truncated to 98 characters.
bool ASPAppendEntry(ASPContext& context, std::string_view prefix, std::string_view suffix,
                    std::uint64_t value);

}  // namespace tavrel
