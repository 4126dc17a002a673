// The packed form in which the values of a distribution are stored and passed on.
//
// A record has 12 bytes: the double's 64 bits, then the offset in seconds within the day, both
// little-endian. Records are adjacent, in the order of recording, at any alignment.
#pragma once

#include <array>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <string>

#include "base/bytes.h"

namespace tavrel {

inline constexpr std::size_t kDistributionRecordBytes = 12;

struct DistributionSample {
  double value = 0;
  std::uint32_t secondsInDayOffset = 0;
};

inline void appendDistributionRecord(std::string& records, const DistributionSample& sample) {
  std::array<std::byte, kDistributionRecordBytes> record;
  storeLittle64(record, 0, std::bit_cast<std::uint64_t>(sample.value));
  storeLittle32(record, 8, sample.secondsInDayOffset);
  records += asText(record);
}

/// The record of `kDistributionRecordBytes` at `record`.
inline DistributionSample distributionSampleAt(const char* record) {
  const ByteSpan bytes = asBytes({record, kDistributionRecordBytes});
  return {std::bit_cast<double>(*loadLittle64(bytes, 0)), *loadLittle32(bytes, 8)};
}

}  // namespace tavrel
