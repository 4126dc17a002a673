// The non-empty parts of a segment, filled with the input: the first bytes of the header, the table
// of keys, the names, the cells and two chunks. The file is read twice: the second read, from where
// the first ended, must yield nothing, and everything yielded must have a valid name.
#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <span>
#include <sys/mman.h>
#include <unistd.h>
#include <vector>

#include "base/utf8.h"
#include "client/segment_format.h"
#include "platform/linux/segments/segment_reader.h"

using namespace tavrel;

namespace {

// Where the input goes, in order, and how many bytes.
constexpr struct {
  std::uint64_t offset;
  std::size_t bytes;
} kParts[] = {{0, 264}, {kBHKeyTable, 32}, {kBHNames, 64}, {kBHCells, 256}, {kBHChunks, 8192}};

struct Checked : SegmentSink {
  void check(std::string_view key, bool isInDay) {
    ++values;
    if (key.empty() || key.size() > kBHLongestName || !isValidUtf8(key) || !isInDay) std::abort();
  }
  void takeScalar(const SegmentScalar& scalar) override { check(scalar.key, true); }
  void takeRecord(const SegmentRecord& record) override {
    check(*record.key, record.secondsInDay < kBHSecondsPerDay);
  }
  std::size_t values = 0;
};

void limit(std::vector<std::uint8_t>& bytes, std::size_t at, std::uint32_t most) {
  std::uint32_t word = 0;
  if (at + sizeof word > bytes.size()) return;
  std::memcpy(&word, bytes.data() + at, sizeof word);
  word %= most + 1;
  std::memcpy(bytes.data() + at, &word, sizeof word);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size == 0) return 0;
  static const int file = memfd_create("segment", MFD_CLOEXEC);
  if (ftruncate(file, 0) != 0 || ftruncate(file, kBHSegmentBytes) != 0) std::abort();
  const std::uint8_t options = *data++;
  --size;
  std::vector<std::uint8_t> bytes(data, data + size);
  // A header that claims to use all cells and chunks takes a thousand times as long to read as one
  // that uses only those below, so the claim is kept only when the options ask for it.
  if ((options & 4) == 0) {
    limit(bytes, kBHHeaderCellsUsed, 5);
    limit(bytes, kBHHeaderChunksUsed, 2);
  }
  std::span<const std::uint8_t> rest(bytes);
  for (const auto& part : kParts) {
    const std::size_t count = std::min(part.bytes, rest.size());
    if (pwrite(file, rest.data(), count, static_cast<off_t>(part.offset)) < 0) std::abort();
    rest = rest.subspan(count);
  }
  const BootInstant boot = (options & 1) != 0 ? BootInstant(1'700'000'000) : std::nullopt;
  const bool writerIsGone = (options & 2) != 0;

  SegmentReader reader(file);
  if (const auto state = reader.state(); !state && state.error().message.empty()) std::abort();
  SegmentPosition position;
  Checked first;
  const SegmentProgress progress = reader.read(position, boot, writerIsGone, first);
  const auto again = SegmentPosition::decode(position.encode());
  if (!again || *again != position) std::abort();
  Checked second;
  if (reader.read(position, boot, writerIsGone, second).dropped != 0 || second.values != 0) {
    std::abort();
  }
  if (!acknowledge(file, progress)) std::abort();
  return 0;
}
