// The packed form in which the values of a distribution are stored and passed on.
//
// A record has 12 bytes: the double's 64 bits, then the offset in seconds within the day, both
// little-endian. Records are adjacent, in the order of recording, at any alignment.
#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string>

namespace tavrel {

inline constexpr std::size_t kDistributionRecordBytes = 12;

struct DistributionSample {
  double value = 0;
  std::uint32_t secondsInDayOffset = 0;
};

namespace record_detail {

template <class Word>
Word reversedOnBigEndian(Word word) {
  if constexpr (std::endian::native == std::endian::little) return word;
  if constexpr (sizeof(Word) == 8) return __builtin_bswap64(word);
  return static_cast<Word>(__builtin_bswap32(static_cast<std::uint32_t>(word)));
}

}  // namespace record_detail

inline void appendDistributionRecord(std::string& records, const DistributionSample& sample) {
  const auto bits = record_detail::reversedOnBigEndian(std::bit_cast<std::uint64_t>(sample.value));
  const auto seconds = record_detail::reversedOnBigEndian(sample.secondsInDayOffset);
  char record[kDistributionRecordBytes];
  std::memcpy(record, &bits, sizeof bits);
  std::memcpy(record + sizeof bits, &seconds, sizeof seconds);
  records.append(record, sizeof record);
}

/// The record of `kDistributionRecordBytes` at `record`.
inline DistributionSample distributionSampleAt(const char* record) {
  std::uint64_t bits = 0;
  std::uint32_t seconds = 0;
  std::memcpy(&bits, record, sizeof bits);
  std::memcpy(&seconds, record + sizeof bits, sizeof seconds);
  return {std::bit_cast<double>(record_detail::reversedOnBigEndian(bits)),
          record_detail::reversedOnBigEndian(seconds)};
}

}  // namespace tavrel
