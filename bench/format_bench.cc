// Formatting next to the C library's printf, and dictionaries of several sizes.
#include <array>
#include <benchmark/benchmark.h>
#include <cstdio>
#include <string>
#include <vector>

#include "base/format.h"

namespace {

using namespace tavrel;

// Both append to a string that is reused, as the callers do.
void messageByC(benchmark::State& state) {
  std::string out;
  for (auto _ : state) {
    char text[256];
    const int length = std::snprintf(text, sizeof text, "%s: collected %d of %u keys for day %d",
                                     "com.norvane.counter", 1234, 5678U, 20000);
    out.assign(text, static_cast<std::size_t>(length));
    benchmark::DoNotOptimize(out.data());
  }
}
BENCHMARK(messageByC);

void message(benchmark::State& state) {
  std::string out;
  for (auto _ : state) {
    out.clear();
    appendFormat(out, "%s: collected %d of %u keys for day %d", "com.norvane.counter", 1234, 5678U,
                 20000);
    benchmark::DoNotOptimize(out.data());
  }
}
BENCHMARK(message);

void decimalsByC(benchmark::State& state) {
  std::string out;
  for (auto _ : state) {
    char text[256];
    const int length = std::snprintf(text, sizeof text, "%10.3f %g", 1234.5678, 0.1);
    out.assign(text, static_cast<std::size_t>(length));
    benchmark::DoNotOptimize(out.data());
  }
}
BENCHMARK(decimalsByC);

void decimals(benchmark::State& state) {
  std::string out;
  for (auto _ : state) {
    out.clear();
    appendFormat(out, "%10.3f %g", 1234.5678, 0.1);
    benchmark::DoNotOptimize(out.data());
  }
}
BENCHMARK(decimals);

void snapshotFieldsFromForeignFormat(benchmark::State& state) {
  const std::array<FormatArgument, 2> arguments{123456U / 1000, 123456U % 1000 / 10};
  std::string out;
  for (auto _ : state) {
    out.clear();
    benchmark::DoNotOptimize(appendForeignFormat(out, " TH=%8u.%02u", arguments));
  }
}
BENCHMARK(snapshotFieldsFromForeignFormat);

std::vector<plist::String> keys(std::int64_t count) {
  std::vector<plist::String> keys;
  for (std::int64_t i = 0; i < count; ++i)
    keys.emplace_back(format("com.norvane.subsystem.counter.%lld", i));
  return keys;
}

// The time per item should hardly grow with the size.
void dictionaryInsert(benchmark::State& state) {
  const auto names = keys(state.range(0));
  for (auto _ : state) {
    plist::Dictionary dictionary;
    for (const plist::String& name : names)
      dictionary.set(name, 1);
    benchmark::DoNotOptimize(dictionary.size());
  }
  state.SetItemsProcessed(state.iterations() * state.range(0));
}
BENCHMARK(dictionaryInsert)->Arg(8)->Arg(100)->Arg(10'000);

void dictionaryLookUp(benchmark::State& state) {
  const auto names = keys(state.range(0));
  plist::Dictionary dictionary;
  for (const plist::String& name : names)
    dictionary.set(name, 1);
  for (auto _ : state) {
    for (const plist::String& name : names)
      benchmark::DoNotOptimize(dictionary.number(name));
  }
  state.SetItemsProcessed(state.iterations() * state.range(0));
}
BENCHMARK(dictionaryLookUp)->Arg(8)->Arg(100)->Arg(10'000);

}  // namespace
