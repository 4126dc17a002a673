// The elements of a sample: the 64-byte records, little-endian, in which a channel's values arrive.
//
//   offset  size
//        0     8  provider ID: the driver's
//        8     8  channel ID
//       16     8  channel type; it counts the elements of the channel
//       24     8  timestamp, unsigned, in the kernel's time base
//       32    32  four values, whose meaning depends on the format
//
// A sampled channel holds its elements as data under "RawElements".
#pragma once

#include <cstddef>
#include <cstdint>

#include "base/bytes.h"
#include "base/plist.h"
#include "ioreport/channel.h"
#include "platform/report_protocol.h"

namespace tavrel {

/// The meaning of an element's four values. A simple channel has its value in the first; an array
/// uses all four.
inline constexpr std::size_t kSimpleValue = 0;

inline constexpr std::size_t kBucketHits = 0;  // of a histogram's bucket
inline constexpr std::size_t kBucketMinimum = 1;
inline constexpr std::size_t kBucketMaximum = 2;
inline constexpr std::size_t kBucketSum = 3;

inline constexpr std::size_t kStateID = 0;  // of a state; its fourth value is not read
inline constexpr std::size_t kStateInTransitions = 1;
inline constexpr std::size_t kStateResidency = 2;

/// A view of the elements in a buffer, through which they can be written. It borrows the buffer.
/// Keeps only the low 16 bits of the count. Do not ask a missing element for anything but its
/// values, which are invalid.
class Elements {
 public:
  Elements() = default;
  explicit Elements(MutableByteSpan bytes)
      : bytes_(bytes), count_(static_cast<std::uint16_t>(bytes.size() / kElementBytes)) {}

  /// False for a channel without readable elements; true for a view of zero elements.
  explicit operator bool() const { return bytes_.data() != nullptr; }
  std::size_t count() const { return count_; }

  std::uint64_t channelID(std::size_t element) const { return word(element, kElementChannel); }
  std::uint64_t timestamp(std::size_t element) const { return word(element, kElementTimestamp); }
  std::int64_t value(std::size_t element, std::size_t index) const {
    if (element >= count_) return kInvalidValue;
    return static_cast<std::int64_t>(word(element, kElementFirstValue + 8 * index));
  }
  void setValue(std::size_t element, std::size_t index, std::int64_t value) const {
    storeLittle64(bytes_, element * kElementBytes + kElementFirstValue + 8 * index,
                  static_cast<std::uint64_t>(value));
  }

  /// Copies as many elements from `other`, which must have them.
  void copyFrom(const Elements& other) const;

 private:
  std::uint64_t word(std::size_t element, std::size_t offset) const {
    return *loadLittle64(bytes_, element * kElementBytes + offset);
  }

  MutableByteSpan bytes_;
  std::uint16_t count_ = 0;
};

/// The elements of a sample whose first element has the format; otherwise an empty view.
Elements getRawElements(const plist::Dictionary& channel, std::uint8_t expectedFormat);

/// The same, provided that the channel's type also has that format and, for histograms and states,
/// the same number of elements.
Elements elementsOfType(const plist::Dictionary& channel, std::uint8_t format);

/// One value of an element, for a channel of that format; invalid when there is none.
std::int64_t elementValue(const plist::Dictionary& channel, std::uint8_t format, std::int32_t index,
                          std::size_t value);

/// How many elements a channel of that format occupies according to its type; -1 for other
/// channels.
std::int32_t elementCountFor(const plist::Dictionary& channel, std::uint8_t format);

/// For `cloneElements`: all values of the copy become `kInvalidValue`.
inline constexpr std::uint32_t kClearValues = 1U << 0;

/// Gives a channel elements of its own, copied from those of another.
KernelReturn cloneElements(plist::Dictionary destination, const plist::Dictionary& source,
                           std::uint32_t flags);

}  // namespace tavrel
