// Converts the counter block of a NAND chip to the common form.
//
//   const auto id = readManufacturerId(streams, "4582603A5700");
//   const auto parse = selectCounterParser(chipGeneration("K2V"), id.vendor, id.device);
//   TelemetryCounters counters;
//   parse(block, counters);
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>

#include "platform/standard_streams.h"
#include "storage/telemetry_counters.h"

namespace tavrel {

inline constexpr std::size_t kCounterBlockBytes = 4096;
using CounterBlock = std::span<const std::byte, kCounterBlockBytes>;

/// Fills the whole record; counters that the block does not have are 0.
using CounterParser = void (*)(CounterBlock block, TelemetryCounters& record);

void parseOnlyAlgoGenericCounters(CounterBlock block, TelemetryCounters& record);
void parseOnlyAlgoGenericCountersK4(CounterBlock block, TelemetryCounters& record);
void parseCounters1y(CounterBlock block, TelemetryCounters& record);
void parseCounters1xSandisk(CounterBlock block, TelemetryCounters& record);
void parseCounters1xHynix(CounterBlock block, TelemetryCounters& record);
/// These do the same as those with "Only".
void parseCountersAlgoGeneric(CounterBlock block, TelemetryCounters& record);
void parseCountersAlgoGenericK4(CounterBlock block, TelemetryCounters& record);

/// Generations of chips with layouts of their own; all others are 0.
inline constexpr std::uint32_t kGenerationK3 = 1;
inline constexpr std::uint32_t kGenerationK4 = 2;

/// The generation in a controller's "chip-id".
std::uint32_t chipGeneration(std::string_view chipId);

struct ManufacturerId {
  std::uint16_t vendor = 0;
  std::uint32_t device = 0;  // without its lowest byte
};

/// Reads a controller's "manufacturer-id", up to 12 hexadecimal digits: 4 for the vendor, the rest
/// for the device. A shorter part is a smaller number, so an id without its last digits is another
/// chip's. A character that is no digit counts as 0 and is reported on standard output.
ManufacturerId readManufacturerId(StandardStreams& streams, std::string_view text);

/// The generation takes precedence over the maker.
CounterParser selectCounterParser(std::uint32_t generation, std::uint32_t vendor,
                                  std::uint32_t device);

/// The name of a parser.
std::string_view counterParserName(CounterParser parser);

}  // namespace tavrel
