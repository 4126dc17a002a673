#include "tools/nand/nand_snapshot.h"

#include <algorithm>

#include "base/format.h"
#include "storage/parse/snapshot_descriptor.h"
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

}  // namespace

Expected<std::string> renderSnapshots(ByteSpan records, std::optional<ByteSpan> descriptor) {
  // The renderer does not distinguish a refused descriptor from a text that does not fit.
  if (descriptor) {
    const auto checked = readSnapshotDescriptor(*descriptor, records.size());
    if (!checked) return checked.error();
  }
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
  return Error{format("the text is longer than %zu bytes: render fewer records", kLongestText)};
}

std::unique_ptr<StackSnapshot> TakenSnapshot::create() {
  return std::make_unique<Taken>(bytes_);
}

}  // namespace tavrel
