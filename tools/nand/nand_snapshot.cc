#include "tools/nand/nand_snapshot.h"

#include <algorithm>

#include "base/format.h"
#include "storage/parse/snapshot_descriptor.h"
#include "storage/parse/snapshot_record.h"
#include "storage/parse/snapshot_text.h"

namespace tavrel {
namespace {

// A record of the fixed layout never needs more than four characters per byte.
constexpr std::size_t kCharactersPerByte = 4;
constexpr std::size_t kCharactersOfKey = 4096;

// A device's formats may widen each field to a page, and its records may overlap. The whole text of
// the largest buffer in the fixed layout fits.
constexpr std::size_t kLongestText = 320U << 20;

class Taken final : public StackSnapshot {
 public:
  explicit Taken(ByteSpan bytes) : bytes_(bytes) {}
  bool setFlags(std::uint32_t) override { return true; }
  bool capture() override { return true; }
  std::optional<ByteSpan> buffer() override { return bytes_; }

 private:
  ByteSpan bytes_;
};

Error tooLong() {
  return Error{format("the text is longer than %zu bytes: render fewer records", kLongestText)};
}

Expected<std::string> render(ByteSpan records, std::optional<ByteSpan> descriptor) {
  std::string text;
  std::size_t capacity = 0;
  while (capacity < kLongestText) {
    capacity =
        std::min(kLongestText,
                 std::max(kCharactersOfKey + kCharactersPerByte * records.size(), 2 * capacity));
    text.resize(capacity);
    std::size_t length = capacity;
    const int rendered =
        descriptor ? ASPParseSnapshotBufferWithInplaceParser(records, text, length, descriptor)
                   : ASPParseSnapshotBuffer(records, text, length);
    if (rendered != 0) {
      text.resize(length);
      return text;
    }
  }
  return tooLong();
}

// Without a stride all records are the same one, and no buffer bounds their number.
Expected<std::string> renderRepeated(ByteSpan record, std::string_view descriptor,
                                     const SnapshotDescriptor& layout) {
  constexpr std::size_t kCountOffset = 12;
  constexpr std::string_view kOne("\1\0\0\0", 4);
  const std::string single = std::string(descriptor).replace(kCountOffset, kOne.size(), kOne);
  auto text = render(record, asBytes(single));
  if (!text) return text;
  const std::string_view key = layout.key.value_or(kSnapshotColumnKey);
  const std::string line = text->substr(key.size());
  const std::uint64_t length = key.size() + std::uint64_t{layout.count} * line.size();
  if (length >= kLongestText) return tooLong();
  text->reserve(length);
  for (std::size_t more = 1; !line.empty() && more < layout.count; ++more)
    *text += line;
  return text;
}

}  // namespace

Expected<std::string> renderSnapshots(ByteSpan records, std::optional<ByteSpan> descriptor) {
  if (!descriptor) return render(records, descriptor);
  // The renderer does not distinguish a refused descriptor from a text that does not fit.
  const auto checked = readSnapshotDescriptor(*descriptor, records.size());
  if (!checked) return checked.error();
  if (checked->stride == 0 && checked->count > 1)
    return renderRepeated(records, asText(*descriptor), *checked);
  return render(records, descriptor);
}

std::unique_ptr<StackSnapshot> TakenSnapshot::create() {
  return std::make_unique<Taken>(bytes_);
}

}  // namespace tavrel
