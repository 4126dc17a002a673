#include "storage/counter_parsers.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cstring>
#include <utility>

#include "base/bytes.h"
#include "storage/counter_maps.h"
#include "storage/hex_string.h"

namespace tavrel {
namespace {

constexpr std::size_t kWordBytes = 4;

// Whether every range lies in its array and in the block, has as many elements as words, and none
// overlap.
template <std::size_t N>
consteval bool isSound(const std::array<CounterRange, N>& map) {
  std::array<bool, TelemetryCounters{}.elements.size()> taken{};
  for (const CounterRange& range : map) {
    const CounterArrayShape& shape = shapeOf(range.array);
    if (range.first > range.last || range.last >= shape.size) return false;
    if (range.lastWord - range.firstWord != range.last - range.first) return false;
    if (range.lastWord >= kCounterBlockBytes / kWordBytes) return false;
    for (std::size_t i = range.first; i <= range.last; ++i) {
      if (std::exchange(taken[shape.first + i], true)) return false;
    }
  }
  return true;
}

template <CounterRange kRange>
void copyRange(CounterBlock block, TelemetryCounters& record) {
  constexpr std::size_t kCount = kRange.last - kRange.first + 1;
  std::uint32_t* const to = &record.elements[shapeOf(kRange.array).first + kRange.first];
  if constexpr (std::endian::native == std::endian::little) {
    std::memcpy(to, &block[kRange.firstWord * kWordBytes], kCount * kWordBytes);
  } else {
    for (std::size_t i = 0; i < kCount; ++i)
      to[i] = loadLittle32(block, (kRange.firstWord + i) * kWordBytes).value_or(0);
  }
}

// The ranges become constants in the copying code, which needs no table at run time.
template <const auto& kMap>
void copyCounters(CounterBlock block, TelemetryCounters& record) {
  static_assert(isSound(kMap));
  record = {};
  [&]<std::size_t... kRows>(std::index_sequence<kRows...>) {
    (copyRange<kMap[kRows]>(block, record), ...);
  }
  (std::make_index_sequence<kMap.size()>());
}

constexpr struct {
  CounterParser parser;
  std::string_view name;
} kParsers[] = {
    {parseCountersAlgoGeneric, "parseCountersAlgoGeneric"},
    {parseCountersAlgoGenericK4, "parseCountersAlgoGenericK4"},
    {parseOnlyAlgoGenericCounters, "parseOnlyAlgoGenericCounters"},
    {parseOnlyAlgoGenericCountersK4, "parseOnlyAlgoGenericCountersK4"},
    {parseCounters1y, "parseCounters1y"},
    {parseCounters1xSandisk, "parseCounters1xSandisk"},
    {parseCounters1xHynix, "parseCounters1xHynix"},
};

}  // namespace

void parseOnlyAlgoGenericCounters(CounterBlock block, TelemetryCounters& record) {
  copyCounters<counter_maps::kAlgoGenericMap>(block, record);
}
void parseOnlyAlgoGenericCountersK4(CounterBlock block, TelemetryCounters& record) {
  copyCounters<counter_maps::kAlgoGenericK4Map>(block, record);
}
void parseCounters1y(CounterBlock block, TelemetryCounters& record) {
  copyCounters<counter_maps::k1yMap>(block, record);
}
void parseCounters1xSandisk(CounterBlock block, TelemetryCounters& record) {
  copyCounters<counter_maps::k1xSandiskMap>(block, record);
}
void parseCounters1xHynix(CounterBlock block, TelemetryCounters& record) {
  copyCounters<counter_maps::k1xHynixMap>(block, record);
}
void parseCountersAlgoGeneric(CounterBlock block, TelemetryCounters& record) {
  parseOnlyAlgoGenericCounters(block, record);
}
void parseCountersAlgoGenericK4(CounterBlock block, TelemetryCounters& record) {
  parseOnlyAlgoGenericCountersK4(block, record);
}

std::uint32_t chipGeneration(std::string_view chipId) {
  if (chipId == "K3V") return kGenerationK3;
  if (chipId == "K4V") return kGenerationK4;
  return 0;
}

ManufacturerId readManufacturerId(StandardStreams& streams, std::string_view text) {
  constexpr std::size_t kVendorDigits = 4;
  const std::string_view device = text.substr(std::min(kVendorDigits, text.size()));
  ManufacturerId id;
  id.vendor = static_cast<std::uint16_t>(hexStringToInt32(streams, text.substr(0, kVendorDigits)));
  id.device = hexStringToInt32(streams, device) & 0xFFFFFF00;
  return id;
}

CounterParser selectCounterParser(std::uint32_t generation, std::uint32_t vendor,
                                  std::uint32_t device) {
  if (generation == kGenerationK3) return parseCountersAlgoGeneric;
  if (generation == kGenerationK4) return parseCountersAlgoGenericK4;
  if (vendor == 0xAD82 && device == 0x52232100) return parseCounters1xHynix;
  if (vendor == 0x4582 && (device == 0x60DE5700 || device == 0x603A5700)) {
    return parseCounters1xSandisk;
  }
  return parseCounters1y;
}

std::string_view counterParserName(CounterParser parser) {
  for (const auto& row : kParsers) {
    if (row.parser == parser) return row.name;
  }
  return {};
}

}  // namespace tavrel
