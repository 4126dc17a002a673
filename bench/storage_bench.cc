// Parses the statistics buffer and builds the NAND information; reads a chip's counters.
#include <benchmark/benchmark.h>
#include <filesystem>
#include <fstream>
#include <string>
#include <unistd.h>
#include <vector>

#include "platform/linux/linux_platform.h"
#include "platform/plist/xml.h"
#include "storage/counter_parsers.h"
#include "storage/nand_info.h"
#include "storage/parse/asp_parser.h"
#include "storage/parse/statistic_keys.h"

namespace tavrel {
namespace {

using Bytes = std::vector<std::byte>;

void append(Bytes& out, std::uint64_t unit) {
  out.resize(out.size() + 8);
  storeLittle64(out, out.size() - 8, unit);
}

void appendRecord(Bytes& out, std::uint32_t key, std::uint32_t count) {
  append(out, key | std::uint64_t{count} << 32);
  for (std::uint32_t i = 0; i < count; ++i)
    append(out, (key * 2654435761U + i) * 1000003ULL);
}

/// All statistics with all their values, in the version that has them.
Bytes fullBuffer() {
  Bytes bytes;
  for (const StatisticKey& row : kStatisticKeys)
    appendRecord(bytes, row.key, row.cap);
  append(bytes, 53 | 1ULL << 32);
  append(bytes, 0x20003);
  return bytes;
}

void parse(benchmark::State& state, const Bytes& bytes, std::int64_t values) {
  for (auto _ : state) {
    ASPContext context;
    benchmark::DoNotOptimize(ASPParseBufferToCxt(context, bytes));
    ASPReleaseContext(context);
  }
  state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(bytes.size()));
  if (values > 0) state.SetItemsProcessed(state.iterations() * values);
}

/// Skipped records, each of the given number of values.
void statisticsSkipped(benchmark::State& state) {
  Bytes bytes;
  while (bytes.size() < 1U << 20)
    appendRecord(bytes, 21, static_cast<std::uint32_t>(state.range(0)));
  parse(state, bytes, 0);
}
BENCHMARK(statisticsSkipped)->Arg(0)->Arg(1)->Arg(16);

/// Parses a full buffer into a released context.
void statisticsParsed(benchmark::State& state) {
  std::int64_t values = 1;
  for (const StatisticKey& row : kStatisticKeys)
    values += row.cap;
  parse(state, fullBuffer(), values);
}
BENCHMARK(statisticsParsed);

/// Parses many full buffers into one context.
void statisticsAppended(benchmark::State& state) {
  Bytes bytes;
  for (std::int64_t i = 0; i < state.range(0); ++i) {
    const Bytes part = fullBuffer();
    bytes.insert(bytes.end(), part.begin(), part.end());
  }
  parse(state, bytes, state.range(0) * 1268);
}
BENCHMARK(statisticsAppended)->Arg(10)->Arg(100);

plist::Dictionary answerOf(std::uint8_t flags, const Bytes& output) {
  return {{"Method", 8}, {"Selector", 13}, {"Flags", flags}, {"Output", plist::Data(output)}};
}

/// The whole query of a recorded driver, excluding the loading of the recording.
void nandInfo(benchmark::State& state) {
  const auto root =
      std::filesystem::temp_directory_path() / ("tavrel_storage_bench." + std::to_string(getpid()));
  const auto folder = root / "var/lib/tavrel/registry";
  std::filesystem::create_directories(folder);
  const Bytes buffer = fullBuffer();
  Bytes size(4);
  storeLittle32(size, 0, static_cast<std::uint32_t>(buffer.size()));
  const plist::Dictionary recording{
      {"Services", plist::Array{plist::Dictionary{
                       {"Class", "ASPStorage"},
                       {"Methods", plist::Array{answerOf(1, size), answerOf(0, buffer)}}}}}};
  std::ofstream(folder / "storage.plist") << *plist::writeXml(recording);
  {
    LinuxPlatform device{DeviceRoot(root.string())};
    if (CopyNANDInfo(device.platform()).size() < 300) state.SkipWithError("no information");
    for (auto _ : state)
      benchmark::DoNotOptimize(CopyNANDInfo(device.platform()));
  }
  std::filesystem::remove_all(root);
}
BENCHMARK(nandInfo)->Unit(benchmark::kMicrosecond);

/// Only the building.
void nandInfoBuilt(benchmark::State& state) {
  LinuxPlatform device{DeviceRoot("/nonexistent")};
  ASPContext context;
  ASPParseBufferToCxt(context, fullBuffer());
  for (auto _ : state)
    benchmark::DoNotOptimize(buildNANDInfo(device.platform().preferences, context, false));
}
BENCHMARK(nandInfoBuilt)->Unit(benchmark::kMicrosecond);

void counters(benchmark::State& state, CounterParser parser) {
  Bytes bytes(kCounterBlockBytes, std::byte{7});
  TelemetryCounters record;
  for (auto _ : state) {
    parser(CounterBlock(bytes.data(), kCounterBlockBytes), record);
    benchmark::DoNotOptimize(record);
  }
}
BENCHMARK_CAPTURE(counters, generic, parseCountersAlgoGeneric);
BENCHMARK_CAPTURE(counters, genericK4, parseCountersAlgoGenericK4);
BENCHMARK_CAPTURE(counters, 1y, parseCounters1y);
BENCHMARK_CAPTURE(counters, 1xHynix, parseCounters1xHynix);

}  // namespace
}  // namespace tavrel
