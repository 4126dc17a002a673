// The counters of a NAND chip, in a form common to the blocks of all makers.
//
//   for (const CounterArrayShape& shape : kCounterArrays)
//     for (const std::uint32_t counter : counters[shape.array]) ...
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>

namespace tavrel {

enum class CounterArray : std::uint8_t {
  readStage,
  initialReadStage,
  nandStageOfLife,
  dspExceptionParameter,
  readStage18NumOfErrorsBin,
  readStage9NumOfErrorsBin,
  readStage10NumOfErrorsBin,
  readStage17NumOfErrorsBin,
  readStage19NumOfErrorsBin,
  algoNANDAccessesBin,
  retentionIndication,
};

struct CounterArrayShape {
  CounterArray array;
  std::string_view name;
  std::size_t size;       // in elements
  std::size_t first = 0;  // index of its first element in the record
};

/// The arrays, in order.
inline constexpr auto kCounterArrays = [] {
  using enum CounterArray;
  auto shapes = std::to_array<CounterArrayShape>({
      {readStage, "readStage", 33},
      {initialReadStage, "initialReadStage", 23},
      {nandStageOfLife, "nandStageOfLife", 8},
      {dspExceptionParameter, "dspExceptionParameter", 38},
      {readStage18NumOfErrorsBin, "readStage18NumOfErrorsBin", 12},
      {readStage9NumOfErrorsBin, "readStage9NumOfErrorsBin", 10},
      {readStage10NumOfErrorsBin, "readStage10NumOfErrorsBin", 10},
      {readStage17NumOfErrorsBin, "readStage17NumOfErrorsBin", 10},
      {readStage19NumOfErrorsBin, "readStage19NumOfErrorsBin", 12},
      {algoNANDAccessesBin, "algoNANDAccessesBin", 8},
      {retentionIndication, "retentionIndication", 12},
  });
  std::size_t first = 0;
  for (CounterArrayShape& shape : shapes) {
    shape.first = first;
    first += shape.size;
  }
  return shapes;
}();

constexpr const CounterArrayShape& shapeOf(CounterArray array) {
  return kCounterArrays[static_cast<std::size_t>(array)];
}

/// All arrays, one after another.
struct TelemetryCounters {
  std::array<std::uint32_t, kCounterArrays.back().first + kCounterArrays.back().size> elements{};

  constexpr std::span<const std::uint32_t> operator[](CounterArray array) const {
    return std::span(elements).subspan(shapeOf(array).first, shapeOf(array).size);
  }
  bool operator==(const TelemetryCounters&) const = default;
};

}  // namespace tavrel
