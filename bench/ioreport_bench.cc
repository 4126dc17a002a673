// The reporting client, per channel and for several numbers of channels: the time per channel must
// not grow with their number. Each driver has a hundred channels, in two groups.
#include <benchmark/benchmark.h>
#include <malloc.h>
#include <memory>
#include <string>
#include <vector>

#include "base/format.h"
#include "ioreport/ioreport.h"
#include "platform/linux/recorded/recorded_registry.h"

namespace {

using namespace tavrel;
using plist::Array;
using plist::Dictionary;

constexpr std::int64_t kChannelsPerDriver = 100;
constexpr std::uint64_t kSimpleType = 0x0000000101000001;  // one element, category 0x0100

struct NoLog : SystemLog {
  void write(LogLevel, std::string_view) override {}
};

struct NoStreams : StandardStreams {
  void writeOutput(std::string_view) override {}
  void writeError(std::string_view) override {}
};

std::vector<std::byte> elementOf(std::uint64_t driver, std::uint64_t channel) {
  std::vector<std::byte> bytes(64);
  const std::uint64_t words[] = {driver, channel, kSimpleType, 1, 1000 + channel};
  for (std::size_t i = 0; i < std::size(words); ++i)
    storeLittle64(bytes, 8 * i, words[i]);
  return bytes;
}

/// A recorded machine with a given number of simple channels.
struct Machine {
  explicit Machine(std::int64_t channels) {
    Array services = Array::create();
    Array hub = Array::create();
    for (std::int64_t driver = 1; driver * kChannelsPerDriver <= channels; ++driver) {
      Array groups[2] = {Array::create(), Array::create()};
      for (std::int64_t id = 1; id <= kChannelsPerDriver; ++id) {
        groups[id % 2].append(Array{id, kSimpleType, format("counter %lld", id)});
        const auto element =
            elementOf(static_cast<std::uint64_t>(driver), static_cast<std::uint64_t>(id));
        hub.append(Dictionary{
            {"DriverID", driver}, {"ChannelID", id}, {"Elements", plist::Data(element)}});
        buffer.insert(buffer.end(), element.begin(), element.end());
      }
      Array legend = Array::create();
      for (const Array& group : groups) {
        legend.append(Dictionary{{"IOReportGroupName", legend.empty() ? "Requests" : "Errors"},
                                 {"IOReportSubGroupName", "Disk"},
                                 {"IOReportChannelInfo", Dictionary{{"IOReportChannelUnit", 0}}},
                                 {"IOReportChannels", group}});
      }
      services.append(Dictionary{
          {"Class", "Disk"},
          {"EntryID", driver},
          {"Properties", Dictionary{{"IOReportLegendPublic", true}, {"IOReportLegend", legend}}}});
    }
    recording = Dictionary{{"Services", services}, {"Hub", Dictionary{{"Channels", hub}}}};
  }

  Dictionary channels(std::int32_t options = kOptionGroupByDriver) {
    return IOReportCopyAllChannels(registry(), streams, options, nullptr);
  }
  RecordedRegistry& registry() {
    if (!played) played = std::make_unique<RecordedRegistry>(recording, log);
    return *played;
  }

  Dictionary recording;
  std::vector<std::byte> buffer;
  NoLog log;
  NoStreams streams;
  std::unique_ptr<RecordedRegistry> played;
};

void countChannels(benchmark::State& state) {
  using benchmark::Counter;
  state.counters["s/channel"] = Counter(static_cast<double>(state.range(0)),
                                        Counter::kIsIterationInvariantRate | Counter::kInvert);
}

void discovery(benchmark::State& state) {
  Machine machine(state.range(0));
  for (auto _ : state)
    benchmark::DoNotOptimize(machine.channels(kOptionGroupByDriver | kOptionGroupByGroup));
  countChannels(state);
}

void merge(benchmark::State& state) {
  Machine machine(state.range(0));
  const Dictionary channels = machine.channels();
  for (auto _ : state) {
    const Dictionary destination = IOReportCreateAggregate(3);
    benchmark::DoNotOptimize(IOReportMergeChannels(destination, channels, nullptr));
  }
  countChannels(state);
}

void prune(benchmark::State& state) {
  Machine machine(state.range(0));
  const Dictionary channels = machine.channels(0);
  for (auto _ : state) {
    state.PauseTiming();
    const Dictionary pruned{
        {"IOReportChannels", plist::mutableCopy(channels.array("IOReportChannels"))}};
    state.ResumeTiming();
    benchmark::DoNotOptimize(IOReportPrune(pruned, [](const Dictionary& channel) {
      return IOReportChannelGetChannelID(channel) % 2 == 0 ? kIterateContinue : kIterateRemove;
    }));
  }
  countChannels(state);
}

void count(benchmark::State& state) {
  Machine machine(state.range(0));
  const Dictionary channels = machine.channels();
  for (auto _ : state)
    benchmark::DoNotOptimize(IOReportGetChannelCount(channels));
  countChannels(state);
}

void subscription(benchmark::State& state) {
  Machine machine(state.range(0));
  const Dictionary channels = machine.channels();
  for (auto _ : state) {
    Dictionary subscribed;
    benchmark::DoNotOptimize(
        IOReportCreateSubscription(machine.registry(), nullptr, channels, &subscribed, 0, nullptr));
  }
  countChannels(state);
}

// Flat, so that a single array holds all channels.
void sampling(benchmark::State& state) {
  Machine machine(state.range(0));
  const Dictionary channels = machine.channels(0);
  Dictionary samples;
  for (auto _ : state) {
    samples = {};
    samples = IOReportCreateSamplesRaw(channels, machine.buffer, nullptr);
  }
  countChannels(state);
  const std::size_t before = mallinfo2().uordblks;
  const Dictionary more = IOReportCreateSamplesRaw(channels, machine.buffer, nullptr);
  state.counters["bytes/channel"] =
      static_cast<double>(mallinfo2().uordblks - before) / static_cast<double>(state.range(0));
}

void samplingThroughTheHub(benchmark::State& state) {
  Machine machine(state.range(0));
  Dictionary subscribed;
  const auto hub = IOReportCreateSubscription(machine.registry(), nullptr, machine.channels(),
                                              &subscribed, 0, nullptr);
  for (auto _ : state)
    benchmark::DoNotOptimize(IOReportCreateSamples(hub.get(), subscribed, nullptr));
  countChannels(state);
}

void delta(benchmark::State& state) {
  Machine machine(state.range(0));
  const Dictionary samples = IOReportCreateSamplesRaw(machine.channels(0), machine.buffer, nullptr);
  for (auto _ : state)
    benchmark::DoNotOptimize(IOReportCreateSamplesDelta(samples, samples, nullptr));
  countChannels(state);
}

// Each channel needs a search, because the others are in reverse order or missing.
void deltaOfOtherOrder(benchmark::State& state) {
  Machine machine(state.range(0));
  const Dictionary samples = IOReportCreateSamplesRaw(machine.channels(0), machine.buffer, nullptr);
  const Array channels = samples.array("IOReportChannels");
  Array reversed = Array::create();
  for (std::size_t i = channels.size(); i-- > 0;)
    reversed.append(channels.at(i));
  const Dictionary others{{"IOReportChannels", reversed}};
  for (auto _ : state)
    benchmark::DoNotOptimize(IOReportCreateSamplesDelta(others, samples, nullptr));
  countChannels(state);
}

void readingAValue(benchmark::State& state) {
  Machine machine(100);
  const Dictionary samples = IOReportCreateSamplesRaw(machine.channels(0), machine.buffer, nullptr);
  const Dictionary channel = samples.array("IOReportChannels").at(50).dictionary();
  for (auto _ : state)
    benchmark::DoNotOptimize(IOReportSimpleGetIntegerValue(channel));
}

void describing(benchmark::State& state) {
  Machine machine(state.range(0));
  const Dictionary samples = IOReportCreateSamplesRaw(machine.channels(0), machine.buffer, nullptr);
  for (auto _ : state) {
    IOReportIterate(samples, [](const Dictionary& channel) {
      benchmark::DoNotOptimize(IOReportSampleCopyDescription(channel, 0, nullptr));
      return kIterateContinue;
    });
  }
  countChannels(state);
}

void sizes(benchmark::internal::Benchmark* benchmark) {
  benchmark->RangeMultiplier(10)->Range(100, 100'000)->Unit(benchmark::kMicrosecond);
}

BENCHMARK(discovery)->Name("ioreport/discovery")->Apply(sizes);
BENCHMARK(merge)->Name("ioreport/merge")->Apply(sizes);
BENCHMARK(prune)->Name("ioreport/prune")->Apply(sizes);
BENCHMARK(count)->Name("ioreport/count")->Apply(sizes);
BENCHMARK(subscription)->Name("ioreport/subscription")->Apply(sizes);
BENCHMARK(sampling)->Name("ioreport/sampling")->Apply(sizes);
BENCHMARK(samplingThroughTheHub)->Name("ioreport/samplingThroughTheHub")->Apply(sizes);
BENCHMARK(delta)->Name("ioreport/delta")->Apply(sizes);
BENCHMARK(deltaOfOtherOrder)->Name("ioreport/deltaOfOtherOrder")->Apply(sizes);
BENCHMARK(describing)->Name("ioreport/describing")->Apply(sizes);
BENCHMARK(readingAValue)->Name("ioreport/readingAValue");

}  // namespace
