#include "storage/parse/snapshot_descriptor.h"

#include <iterator>
#include <optional>

#include "base/format.h"
#include "base/text.h"

namespace tavrel {
namespace {

constexpr std::uint64_t kVersion = 4;
constexpr std::uint64_t kStride = 8;
constexpr std::uint64_t kRecordCount = 12;
constexpr std::uint64_t kTableOffset = 24;
constexpr std::uint64_t kKeyText = 32;

constexpr std::uint32_t kFirstVersionWithKey = 6;

constexpr std::uint64_t kTableHeaderBytes = 8;
constexpr std::uint64_t kEntryBytes = 28;
constexpr std::uint64_t kEntryKind = 0;
constexpr std::uint64_t kEntryOffset = 4;
constexpr std::uint64_t kEntrySize = 8;
constexpr std::uint64_t kEntryFormat = 12;

constexpr SnapshotFieldKind kKinds[] = {SnapshotFieldKind::Number, SnapshotFieldKind::Number,
                                        SnapshotFieldKind::Microseconds,
                                        SnapshotFieldKind::Latencies};

// The text before the first zero byte, or nothing when there is none.
std::optional<std::string_view> terminatedText(ByteSpan bytes) {
  const std::string_view text = asText(bytes);
  const std::size_t end = text.find('\0');
  if (end == std::string_view::npos) return std::nullopt;
  return text.substr(0, end);
}

// Fails when some of the bytes at an offset in the last record are outside the buffer.
Status checkRead(const SnapshotDescriptor& layout, std::size_t recordBytes, std::size_t field,
                 std::uint64_t offset, std::uint64_t bytes) {
  if (layout.count == 0 || bytes == 0) return Done{};
  const std::uint64_t start = std::uint64_t{layout.stride} * (layout.count - 1);
  const std::uint64_t end = start + offset + bytes;
  if (end <= recordBytes) return Done{};
  return Error{format("field %zu of the last of %zu records ends at byte %llu of a buffer of %zu",
                      field, layout.count, end, recordBytes)};
}

// Adds the field of one entry of the table if it prints anything.
Status addField(SnapshotDescriptor& out, ByteSpan entry, std::size_t index,
                std::size_t recordBytes) {
  const std::size_t kind = *loadLittle16(entry, kEntryKind);
  if (kind >= std::size(kKinds)) return Done{};
  const auto text = terminatedText(entry.subspan(kEntryFormat));
  if (!text) return Error{format("the format of field %zu has no zero byte", index)};
  const auto field = makeSnapshotField(kKinds[kind], *loadLittle32(entry, kEntryOffset),
                                       *loadLittle32(entry, kEntrySize), *text);
  if (!field) {
    return Error{format("the format %s of field %zu asks for what kind %zu does not give",
                        quotedText(*text), index, kind)};
  }
  if (text->empty() && field->triples == 0) return Done{};
  out.fields.push_back(*field);
  return checkRead(out, recordBytes, index, field->offset, field->bytesRead());
}

Status addFields(SnapshotDescriptor& out, ByteSpan descriptor, std::uint64_t tableOffset,
                 std::size_t recordBytes) {
  const auto count = loadLittle32(descriptor, tableOffset);
  const auto entries = count ? slice(descriptor, tableOffset + kTableHeaderBytes,
                                     std::uint64_t{*count} * kEntryBytes)
                             : std::nullopt;
  if (!entries) {
    return Error{format("the field table at byte %llu ends beyond the descriptor's %zu bytes",
                        tableOffset, descriptor.size())};
  }
  if (*count == 0) {
    if (out.count == 0) return Done{};
    return Error{"there are records but no fields"};
  }
  out.presenceOffset = *loadLittle32(*entries, kEntryOffset);
  if (Status present = checkRead(out, recordBytes, 0, out.presenceOffset, 4); !present) {
    return present;
  }
  out.fields.reserve(*count);
  for (std::size_t i = 0; i < *count; ++i) {
    const Status added =
        addField(out, entries->subspan(i * kEntryBytes, kEntryBytes), i, recordBytes);
    if (!added) return added;
  }
  return Done{};
}

}  // namespace

Expected<SnapshotDescriptor> readSnapshotDescriptor(ByteSpan descriptor, std::size_t recordBytes) {
  const auto tableOffset = loadLittle32(descriptor, kTableOffset);
  if (!tableOffset) {
    return Error{format("the descriptor ends within its header, at %zu bytes", descriptor.size())};
  }
  SnapshotDescriptor out{.key = std::nullopt,
                         .stride = *loadLittle32(descriptor, kStride),
                         .count = *loadLittle32(descriptor, kRecordCount),
                         .presenceOffset = 0,
                         .fields = {}};
  if (*loadLittle32(descriptor, kVersion) >= kFirstVersionWithKey) {
    if (descriptor.size() > kKeyText) out.key = terminatedText(descriptor.subspan(kKeyText));
    if (!out.key) return Error{"the key has no zero byte"};
  }
  const Status status = addFields(out, descriptor, *tableOffset, recordBytes);
  if (!status) return status.error();
  return out;
}

}  // namespace tavrel
