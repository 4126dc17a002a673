// The report: summaries and histograms over packed values, whitelist look-ups, and coarsening.
#include <benchmark/benchmark.h>
#include <cstdlib>
#include <filesystem>
#include <random>
#include <string>
#include <unistd.h>
#include <vector>

#include "platform/linux/linux_platform.h"
#include "platform/linux/store/sqlite_batch.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/plist/xml.h"
#include "report/bh_report.h"
#include "report/rounding.h"

namespace tavrel {
namespace {

constexpr std::int32_t kDay = 20000;
constexpr std::size_t kValues = 1'000'000;

std::vector<double> randomValues(std::size_t count) {
  std::mt19937_64 generator(7);
  std::normal_distribution<double> distribution(100, 40);
  std::vector<double> values(count);
  for (double& value : values)
    value = distribution(generator);
  return values;
}

/// A device in its own folder, with one distribution of many values in its store.
struct Device {
  std::string root =
      (std::filesystem::temp_directory_path() / ("tavrel_bench." + std::to_string(getpid())))
          .string();
  LinuxPlatform linuxPlatform{DeviceRoot(root)};

  Device() {
    auto batch = linuxPlatform.store().beginBatch();
    if (!batch) std::abort();
    bool done = true;
    for (const double value : randomValues(kValues)) {
      done = done && (*batch)->appendValue(kDay, "distribution", 0, value);
    }
    if (!done || !(*batch)->commit()) std::abort();
  }
  ~Device() { std::filesystem::remove_all(root); }
};

/// The baseline of the summary: a bare loop with the same formula over an array.
void summaryBaseline(benchmark::State& state) {
  const std::vector<double> values = randomValues(kValues);
  for (auto _ : state) {
    double minimum = values[0];
    double maximum = values[0];
    double mean = values[0];
    double squaredDeviations = 0;
    std::int32_t count = 1;
    for (std::size_t i = 1; i < values.size(); ++i) {
      const double x = values[i];
      if (x < minimum) {
        minimum = x;
      } else if (x > maximum) {
        maximum = x;
      }
      ++count;
      const double delta = x - mean;
      mean += delta / count;
      squaredDeviations += delta * (x - mean);
    }
    benchmark::DoNotOptimize(minimum);
    benchmark::DoNotOptimize(maximum);
    benchmark::DoNotOptimize(squaredDeviations);
  }
  state.SetItemsProcessed(state.iterations() * static_cast<std::int64_t>(kValues));
}
BENCHMARK(summaryBaseline);

plist::Array ascending(std::int64_t count) {
  plist::Array boundaries = plist::Array::create();
  for (std::int64_t i = 0; i < count; ++i) {
    boundaries.append(200.0 * static_cast<double>(i + 1) / static_cast<double>(count + 1));
  }
  return boundaries;
}

/// From the store, with the given number of boundaries; without a histogram when it is 0.
void distributionFromStore(benchmark::State& state) {
  Device device;
  BHReport report(device.linuxPlatform.platform());
  plist::Dictionary options = plist::Dictionary::create();
  if (state.range(0) > 0) options.set("intervals", ascending(state.range(0)));
  const auto history = device.linuxPlatform.store().initWithDefaultPath();
  for (auto _ : state) {
    bool found = false;
    history->distributionsForKeyPrefix(
        "", kDay - 1, kDay,
        [&](std::string_view key, std::int32_t, BHHistoryDistributionEnumerator& values, bool&) {
          found = true;
          report.computeAndAddDistribution(values, key, options);
        });
    if (!found) std::abort();
  }
  state.SetItemsProcessed(state.iterations() * static_cast<std::int64_t>(kValues));
}
BENCHMARK(distributionFromStore)->Arg(0)->Arg(20)->Arg(2000);

void prefixLookup(benchmark::State& state) {
  std::vector<std::string> prefixes;
  for (std::int64_t i = 0; i < state.range(0); ++i) {
    prefixes.push_back("com.norvane." + std::to_string(i * 7919 % 100003) + ".subsystem.");
  }
  std::vector<std::string> keys;
  for (std::size_t i = 0; i < 1000; ++i) {
    keys.push_back(prefixes[i * 31 % prefixes.size()] + "counter." + std::to_string(i));
  }
  const PrefixTree tree(prefixes);
  std::size_t next = 0;
  for (auto _ : state) {
    benchmark::DoNotOptimize(tree.longestMatch(keys[next]));
    next = (next + 1) % keys.size();
  }
}
BENCHMARK(prefixLookup)->Arg(10)->Arg(100)->Arg(1000)->Arg(10000);

void coarsen(benchmark::State& state) {
  const plist::Dictionary options{{"bucket_interval", 10}, {"sig_fig", 2}};
  std::int64_t value = 1;
  for (auto _ : state)
    benchmark::DoNotOptimize(coarsened(value++, options));
}
BENCHMARK(coarsen);

}  // namespace
}  // namespace tavrel
