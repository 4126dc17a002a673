// Counter blocks and manufacturer ids of any bytes. A parser must depend only on its block's words,
// and ids, whatever their characters, must read as a plain parser of digits reads them.
//
// Input: the length of the chip id (8 bits), the chip id, the length of the manufacturer id (8
// bits), the manufacturer id, the block, padded with zeros.
#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdlib>
#include <string>

#include "require.h"
#include "storage/counter_parsers.h"
#include "storage/hex_string.h"

namespace {

using namespace tavrel;
using fuzz::require;

struct CountingStreams : StandardStreams {
  std::size_t bytes = 0;
  void writeOutput(std::string_view text) override { bytes += text.size(); }
  void writeError(std::string_view) override { std::abort(); }
};

std::string_view take(std::string_view& input) {
  if (input.empty()) return {};
  const auto length = static_cast<unsigned char>(input.front());
  const std::string_view part = input.substr(1, length);
  input.remove_prefix(1 + part.size());
  return part;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  std::string_view input(reinterpret_cast<const char*>(data), size);
  const std::string_view chip = take(input);
  const std::string manufacturer(take(input));

  CountingStreams streams;
  const ManufacturerId id = readManufacturerId(streams, manufacturer);
  const std::string digits = manufacturer.substr(0, 12);
  const auto bad = static_cast<std::size_t>(std::ranges::count_if(digits, [](char c) {
    return std::string_view("0123456789abcdefABCDEF").find(c) == std::string_view::npos;
  }));
  require(streams.bytes == bad * (sizeof("unrecognized hex character: ")));
  require((id.device & 0xFF) == 0);
  if (bad == 0 && digits.size() == 12) {
    require(id.vendor == std::stoul(digits.substr(0, 4), nullptr, 16));
    require(id.device == (std::stoul(digits.substr(4), nullptr, 16) & 0xFFFFFF00));
  }

  const auto parse = selectCounterParser(chipGeneration(chip), id.vendor, id.device);
  require(!counterParserName(parse).empty());
  std::array<std::byte, kCounterBlockBytes> block{};
  std::ranges::copy(asBytes(input.substr(0, block.size())), block.begin());
  TelemetryCounters counters, again;
  again.elements.fill(0xFFFFFFFF);
  parse(block, counters);
  // Words after 532 are never read.
  std::fill(block.begin() + std::ptrdiff_t{533} * 4, block.end(), std::byte{0xA5});
  parse(block, again);
  require(counters == again);
  return 0;
}
