// The packed form in which the values of a distribution are stored and passed on.
//
// Values and their offsets are kept apart, so that a reader of the values alone reads nothing else.
// A value has 8 bytes: the double's 64 bits, little-endian. An offset has 4 bytes: seconds within
// the day, little-endian. They are adjacent, in the order of recording, at any alignment.
#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>

#include "base/bytes.h"

namespace tavrel {

inline constexpr std::size_t kPackedValueBytes = 8;
inline constexpr std::size_t kPackedOffsetBytes = 4;

struct DistributionSample {
  double value = 0;
  std::uint32_t secondsInDayOffset = 0;
};

/// Packed values and, when they were asked for, as many packed offsets.
struct DistributionBlock {
  std::string_view values;
  std::string_view offsets;
};

/// Packs samples into two spaces, each large enough.
inline void pack(std::span<const DistributionSample> samples, MutableByteSpan values,
                 MutableByteSpan offsets) {
  std::size_t value = 0;
  std::size_t offset = 0;
  for (const DistributionSample& sample : samples) {
    storeLittle64(values, value, std::bit_cast<std::uint64_t>(sample.value));
    storeLittle32(offsets, offset, sample.secondsInDayOffset);
    value += kPackedValueBytes;
    offset += kPackedOffsetBytes;
  }
}

/// Appends to packed values and to their packed offsets.
inline void appendPacked(std::string& values, std::string& offsets,
                         std::span<const DistributionSample> samples) {
  const std::size_t value = values.size();
  const std::size_t offset = offsets.size();
  values.resize(value + samples.size() * kPackedValueBytes);
  offsets.resize(offset + samples.size() * kPackedOffsetBytes);
  pack(samples, std::as_writable_bytes(std::span(values)).subspan(value),
       std::as_writable_bytes(std::span(offsets)).subspan(offset));
}

/// The value whose bytes begin at `value`.
inline double packedValueAt(const char* value) {
  return std::bit_cast<double>(*loadLittle64(asBytes({value, kPackedValueBytes}), 0));
}

/// The offset whose bytes begin at `offset`.
inline std::uint32_t packedOffsetAt(const char* offset) {
  return *loadLittle32(asBytes({offset, kPackedOffsetBytes}), 0);
}

}  // namespace tavrel
