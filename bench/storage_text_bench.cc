// Snapshot lines in the fixed layout and in the same layout given by a descriptor; the walk over a
// kernel snapshot by size of its items and by depth of its containers.
#include <benchmark/benchmark.h>
#include <string>
#include <vector>

#include "storage/parse/snapshot_record.h"
#include "storage/parse/snapshot_text.h"
#include "storage/vm_freezer.h"

namespace {

using namespace tavrel;

using Bytes = std::vector<std::byte>;

constexpr std::size_t kRecords = 1000;
constexpr std::size_t kLineBytes = 1024;

Bytes snapshotRecords() {
  Bytes bytes(kRecords * kSnapshotRecordBytes);
  for (std::size_t at = 0; at < bytes.size(); at += 4)
    storeLittle32(bytes, at, static_cast<std::uint32_t>(at * 2654435761U >> 12 | 1));
  return bytes;
}

Bytes descriptorOfTheFixedLayout() {
  const std::size_t count = kSnapshotRecordFields.size();
  Bytes bytes(40 + count * 28);
  storeLittle32(bytes, 4, 5);
  storeLittle32(bytes, 8, kSnapshotRecordBytes);
  storeLittle32(bytes, 12, kRecords);
  storeLittle32(bytes, 24, 32);
  storeLittle32(bytes, 32, static_cast<std::uint32_t>(count));
  for (std::size_t i = 0; i < count; ++i) {
    const SnapshotField& field = kSnapshotRecordFields[i];
    const std::size_t at = 40 + i * 28;
    storeLittle16(bytes, at, static_cast<std::uint16_t>(1 + static_cast<unsigned>(field.kind)));
    storeLittle32(bytes, at + 4, field.offset);
    storeLittle32(bytes, at + 8, field.triples * 12);
    for (std::size_t c = 0; c < field.format.size(); ++c)
      bytes[at + 12 + c] = static_cast<std::byte>(field.format[c]);
  }
  return bytes;
}

void reportRecords(benchmark::State& state) {
  state.SetItemsProcessed(state.iterations() * static_cast<std::int64_t>(kRecords));
}

void snapshotFixed(benchmark::State& state) {
  const Bytes records = snapshotRecords();
  std::vector<char> text(kRecords * kLineBytes);
  for (auto _ : state) {
    std::size_t length = text.size();
    if (ASPParseSnapshotBuffer(records, text, length) != 1) state.SkipWithError("no room");
    benchmark::DoNotOptimize(text.data());
  }
  reportRecords(state);
}
BENCHMARK(snapshotFixed);

void snapshotDescribed(benchmark::State& state) {
  const Bytes records = snapshotRecords();
  const Bytes descriptor = descriptorOfTheFixedLayout();
  std::vector<char> text(kRecords * kLineBytes);
  for (auto _ : state) {
    std::size_t length = text.size();
    if (ASPParseSnapshotBufferWithInplaceParser(records, text, length, descriptor) != 1) {
      state.SkipWithError("no room or refused");
    }
    benchmark::DoNotOptimize(text.data());
  }
  reportRecords(state);
}
BENCHMARK(snapshotDescribed);

void appendItem(Bytes& out, std::uint32_t type, std::uint64_t flags, std::size_t payload) {
  const std::size_t at = out.size();
  out.resize(at + 16 + payload);
  storeLittle32(out, at, type);
  storeLittle32(out, at + 4, static_cast<std::uint32_t>(payload));
  storeLittle64(out, at + 8, flags);
}

void walk(benchmark::State& state, const Bytes& items) {
  std::optional<ByteSpan> statistics;
  for (auto _ : state) {
    benchmark::DoNotOptimize(getIOStatsWithThreadnameFromKCData(items, "VM_swapout", statistics));
  }
  state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(items.size()));
}

// Items with a payload of that many bytes, all of them skipped.
void freezerPassedOver(benchmark::State& state) {
  Bytes items;
  appendItem(items, 0x13, 1, 4);
  while (items.size() < 4U << 20)
    appendItem(items, 0x910, 0, static_cast<std::size_t>(state.range(0)));
  walk(state, items);
}
BENCHMARK(freezerPassedOver)->Arg(0)->Arg(8)->Arg(64)->Arg(1024);

// The time per byte should hardly grow with the depth.
void freezerNested(benchmark::State& state) {
  const auto depth = static_cast<std::uint64_t>(state.range(0));
  Bytes items;
  for (std::uint64_t i = 0; i < depth; ++i)
    appendItem(items, 0x13, i, 4);
  for (std::uint64_t i = depth; i-- > 0;)
    appendItem(items, 0x14, i, 0);
  walk(state, items);
}
BENCHMARK(freezerNested)->Arg(1'000)->Arg(10'000)->Arg(100'000)->Arg(1'000'000);

}  // namespace
