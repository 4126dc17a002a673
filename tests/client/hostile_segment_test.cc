// Segments that no well-behaved program would leave.

#include <random>
#include <thread>

#include "recording.h"

namespace tavrel {
namespace {

class HostileSegment : public Recording {
 protected:
  HostileSegment() {
    run([] {
      BHClientScalarSet(BHClientScalarForKey("gauge"), 3);
      for (int i = 0; i < 300; ++i)
        BHClientDistributionRecord(BHClientDistributionForKey("series"), i);
    });
    file_ = Descriptor(open(segments().at(0).c_str(), O_RDWR));
    original_.resize(0xd0000);
    EXPECT_EQ(pread(file_.get(), original_.data(), original_.size(), 0), 0xd0000);
  }

  template <class Word>
  void write(std::uint64_t offset, Word word) {
    EXPECT_EQ(pwrite(file_.get(), &word, sizeof word, static_cast<off_t>(offset)), sizeof word);
  }
  void restore() {
    EXPECT_EQ(ftruncate(file_.get(), kBHSegmentBytes), 0);
    EXPECT_EQ(pwrite(file_.get(), original_.data(), original_.size(), 0), 0xd0000);
  }

  /// Returns the error, or what was read: "SCALARS RECORDS REFUSED".
  std::string readAll(bool writerIsGone = true) {
    scalars.clear();
    records.clear();
    positionBytes = 0;
    SegmentReader reader(file_.get());
    const auto state = reader.state();
    if (!state) return state.error().message;
    if (*state == SegmentReader::State::Empty) return "empty";
    SegmentPosition position;
    const SegmentProgress progress = reader.read(position, boot, writerIsGone, *this);
    EXPECT_EQ(*SegmentPosition::decode(position.encode()), position);
    positionBytes = position.encode().size();
    EXPECT_LE(positionBytes, 68U);  // one cell and two chunks
    for (const auto& [name, value] : scalars)
      EXPECT_EQ(name.first, "gauge");
    for (const auto& [name, values] : records)
      EXPECT_EQ(name, "series");
    return std::to_string(scalars.size()) + " " + std::to_string(records["series"].size()) + " " +
           std::to_string(progress.refused);
  }

  std::size_t positionBytes = 0;
  Descriptor file_;
  std::string original_;
};

TEST_F(HostileSegment, IsRefusedOrSkipped) {
  const std::uint64_t secondChunk = kBHChunks + kBHChunkBytes;
  const std::uint64_t key = SegmentFile(file_.get()).word64(kBHKeyTable + 8);
  const std::uint64_t mark = SegmentFile(file_.get()).word64(kBHChunks + kBHChunkFirst + 8);
  const std::tuple<const char*, std::uint64_t, int, std::uint64_t, const char*> cases[] = {
      {"nothing", kBHHeaderFolds, 8, 0, "1 300 0"},
      {"magic absent", kBHHeaderMagic, 8, 0, "empty"},
      {"magic", kBHHeaderMagic, 8, 1, "not a segment"},
      {"version", kBHHeaderVersion, 4, 2, "a segment of version 2, not 1"},
      {"size", kBHHeaderBytes, 8, 4096, "a segment of a wrong size"},
      {"chunks beyond", kBHHeaderCellsUsed, 8, 0xffffffffffffffff, "1 300 0"},
      {"no chunks, no cells", kBHHeaderCellsUsed, 8, 0, "0 0 0"},
      {"cell: not midnight", kBHCells, 8, kToday * 86'400 + 1, "0 300 1"},
      {"cell: day beyond 32 bits", kBHCells, 8, 86'400ULL << 32, "0 300 1"},
      {"cell: unused", kBHCells + kBHCellKey, 4, 0, "0 300 0"},
      {"cell: another kind", kBHCells + kBHCellKey, 4, 2, "0 300 1"},
      {"cell: key beyond", kBHCells + kBHCellKey, 4, kBHKeys + 1, "0 300 1"},
      {"key: absent", kBHKeyTable + 8, 8, 0, "1 0 300"},
      {"key: name beyond", kBHKeyTable + 8, 8, key | (kBHNamesBytes - 3), "1 0 300"},
      {"key: too long", kBHKeyTable + 8, 8, key | 0x800'0000'0000, "1 0 300"},
      {"key: empty", kBHKeyTable + 8, 8, key & ~0xffff'0000'0000ULL, "1 0 300"},
      {"key: kind", kBHKeyTable + 8, 8, key ^ (1ULL << 48), "1 0 300"},
      {"name: line break", kBHNames + 5, 8, 0x0a0a0a0a0a0a0a0a, "1 0 300"},
      {"name: not UTF-8", kBHNames + 5, 8, 0xffffffffffffffff, "1 0 300"},
      {"chunk: unused", secondChunk + kBHChunkGeneration, 4, 0, "1 255 0"},
      {"chunk: being emptied", secondChunk + kBHChunkGeneration, 4, 3, "1 255 0"},
      {"record: hole", kBHChunks + kBHChunkFirst + 8, 8, 0, "1 299 0"},
      {"record: key", kBHChunks + kBHChunkFirst + 8, 8, mark | 0xffff, "1 299 1"},
      {"record: latest", kBHChunks + kBHChunkFirst + 8, 8, ~kBHUndated & ~0xfffdULL, "1 300 0"},
  };
  for (const auto& [what, offset, size, word, outcome] : cases) {
    if (const auto half = static_cast<std::uint32_t>(word); size == 4)
      write(offset, half);
    else
      write(offset, word);
    EXPECT_EQ(readAll(), outcome) << what;
    EXPECT_LE(positionBytes, 48 + 20 * scalars.size()) << what;
    restore();
  }
  write(kBHChunks + kBHChunkFirst + 8, std::uint64_t{0});
  EXPECT_EQ(readAll(false), "1 45 0");  // the record may still arrive
  EXPECT_EQ(positionBytes, 56U) << "a chunk of which nothing was taken";
  EXPECT_EQ(ftruncate(file_.get(), kBHChunks), 0);
  EXPECT_EQ(readAll(), "a segment of a wrong size");
  EXPECT_EQ(ftruncate(file_.get(), 0), 0);
  EXPECT_EQ(readAll(), "empty");
  EXPECT_FALSE(SegmentPosition::decode(std::string(40, '\xff')));
  EXPECT_FALSE(SegmentPosition::decode("short"));
}

TEST_F(HostileSegment, EveryFieldMayHoldAnything) {
  std::vector<std::uint64_t> fields;
  for (std::uint64_t field = 0; field < 512; field += 8)
    fields.push_back(field);
  for (std::uint64_t i = 0; i < 8; ++i)
    fields.insert(fields.end(), {kBHCells + 8 * i, kBHChunks + 8 * i, kBHKeyTable + 8 * i});
  for (const std::uint64_t field : fields) {
    for (const std::uint64_t word : {0ULL, 1ULL, 0x7fULL, 0xffffULL, 0x7fffffffULL, 0xffffffffULL,
                                     1ULL << 62, ~0ULL >> 1, 1ULL << 63, ~0ULL}) {
      write(field, word);
      for (const BootInstant instant : {BootInstant(0), BootInstant(INT64_MAX), BootInstant()}) {
        boot = instant;
        readAll(boot.has_value());
      }
    }
    restore();
  }
}

TEST_F(HostileSegment, MayChangeWhileItIsRead) {
  std::atomic<bool> isDone = false;
  std::thread writer([&] {
    std::mt19937 random(1);
    while (!isDone) {
      const std::uint64_t word = std::uint64_t{random()} << 32 | random();
      const std::uint64_t place = random() % (random() % 2 == 0 ? 4096 : original_.size()) & ~7U;
      if (place < kBHNames || place >= kBHNames + 64) write(place, word >> random() % 64);
      if (random() % 64 == 0) restore();
    }
  });
  for (int i = 0; i < 2'000; ++i)
    readAll(i % 2 == 0);
  isDone = true;
  writer.join();
  restore();
  EXPECT_EQ(readAll(), "1 300 0");
}

}  // namespace
}  // namespace tavrel
