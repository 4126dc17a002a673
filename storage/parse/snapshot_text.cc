#include "storage/parse/snapshot_text.h"

#include <algorithm>

#include "storage/parse/snapshot_descriptor.h"
#include "storage/parse/snapshot_line.h"
#include "storage/parse/snapshot_record.h"

namespace tavrel {
namespace {

std::span<char> withinCapacity(std::span<char> text, std::size_t capacity) {
  return text.first(std::min(text.size(), capacity));
}

}  // namespace

int ASPParseSnapshotBuffer(ByteSpan records, std::span<char> text, std::size_t& textLength) {
  SnapshotWriter out(withinCapacity(text, textLength));
  if (!out.write(kSnapshotColumnKey)) return 0;
  for (; records.size() >= kSnapshotRecordBytes; records = records.subspan(kSnapshotRecordBytes)) {
    if (!out.writeLine(kSnapshotRecordFields, records)) return 0;
  }
  if (!out.write("\n")) return 0;
  textLength = out.length();
  return 1;
}

int ASPParseSnapshotBufferWithInplaceParser(ByteSpan records, std::span<char> text,
                                            std::size_t& textLength,
                                            std::optional<ByteSpan> descriptor) {
  if (!descriptor) return 0;
  const auto layout = readSnapshotDescriptor(*descriptor, records.size());
  if (!layout) return 0;

  SnapshotWriter out(withinCapacity(text, textLength));
  if (!out.write(layout->key.value_or(kSnapshotColumnKey))) return 0;
  for (std::size_t i = 0; i < layout->count; ++i) {
    const ByteSpan record = records.subspan(i * layout->stride);
    if (loadLittle32(record, layout->presenceOffset) == 0U) {
      if (layout->stride == 0) break;  // all records are this one
      continue;
    }
    if (!out.writeLine(layout->fields, record)) return 0;
  }
  textLength = out.length();
  return 1;
}

}  // namespace tavrel
