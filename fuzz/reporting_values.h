// Builds property-list values from the fuzzer's bytes, biased to look like aggregates, channels and
// legends, and exercises everything that can be asked of them.
#pragma once

#include <span>
#include <string>
#include <string_view>

#include "ioreport/ioreport.h"
#include "require.h"

namespace tavrel::fuzz {

/// The keys of aggregates, channels and samples.
inline constexpr std::string_view kReportingKeys[] = {"QueryOpts",
                                                      "IOReportChannels",
                                                      "IOReportDrivers",
                                                      "IOReportChannelGroups",
                                                      "IOReportChannels",
                                                      "DriverID",
                                                      "DriverName",
                                                      "LegendChannel",
                                                      "IOReportGroupName",
                                                      "IOReportSubGroupName",
                                                      "IOReportChannelInfo",
                                                      "IOReportChannelUnit",
                                                      "IOReportChannelConfig",
                                                      "ChannelName",
                                                      "UnitLabel",
                                                      "StateNames",
                                                      "ProcessedChannelConfig",
                                                      "RawElements",
                                                      "a",
                                                      "b"};

/// Takes values off the front of the input; null once it is used up.
class ValueReader {
 public:
  explicit ValueReader(ByteSpan input, std::span<const std::string_view> keys = kReportingKeys)
      : rest_(input), keys_(keys) {}

  std::uint64_t word(std::size_t bytes) {
    std::uint64_t taken = 0;
    for (; bytes > 0 && !rest_.empty(); --bytes) {
      taken = taken << 8 | std::to_integer<std::uint64_t>(rest_.front());
      rest_ = rest_.subspan(1);
    }
    return taken;
  }
  ByteSpan bytes(std::size_t most) {
    const ByteSpan taken = rest_.first(std::min(most, rest_.size()));
    rest_ = rest_.subspan(taken.size());
    return taken;
  }
  ByteSpan rest() const { return rest_; }

  plist::Value value(int depth = 0) {
    const std::uint64_t kind = word(1);
    if (rest_.empty() || depth == 12) return {};
    switch (kind % 10) {
      case 0:
        return dictionary(depth);
      case 1:
        return array(depth);
      case 2:
        return static_cast<std::int64_t>(word(8));
      case 3:
        return word(1);
      case 4:
        return asText(bytes(word(1) % 8));
      case 5:
        return plist::Data(bytes(word(2) % 1024));
      case 6:
        return std::bit_cast<double>(word(8));
      case 7:
        return legendChannel();
      default:
        return channel();
    }
  }

  plist::Dictionary dictionary(int depth) {
    plist::Dictionary made = plist::Dictionary::create();
    for (std::uint64_t count = word(1) % 8; count > 0 && !rest_.empty(); --count) {
      const std::string_view key = keys_[word(1) % keys_.size()];
      made.set(key, value(depth + 1));
    }
    return made;
  }

 private:
  plist::Array array(int depth) {
    plist::Array made = plist::Array::create();
    for (std::uint64_t count = word(1) % 16; count > 0 && !rest_.empty(); --count)
      made.append(value(depth + 1));
    return made;
  }

  plist::Array legendChannel() {
    const std::uint64_t type = word(1) % 6 | (word(1) % 4) << 32;
    return createLegendChannel(word(1) % 4, type, std::nullopt, nullptr);
  }

  plist::Dictionary channel() {
    plist::Dictionary made{{"DriverID", word(1) % 3},
                           {"DriverName", "d"},
                           {"LegendChannel", legendChannel()},
                           {"IOReportChannelInfo", value(8)}};
    std::uint64_t type = 0;
    getChannelType(made, type);
    std::vector<std::byte> elements(64 * (elementCountOf(type) + word(1) / 255));
    std::ranges::copy(bytes(elements.size()), elements.begin());
    if (elements.size() > 16) elements[16] = std::byte{formatOf(type)};
    made.set("RawElements", plist::Data(elements));
    return made;
  }

  ByteSpan rest_;
  std::span<const std::string_view> keys_;
};

/// Asks a channel everything that the interface offers.
inline void examine(const plist::Dictionary& channel) {
  std::int64_t unit = 0;
  const auto name = IOReportChannelGetChannelName(channel);
  require(name == IOReportChannelGetChannelName(channel));
  require(IOReportChannelGetUnitLabel(channel) == IOReportChannelGetUnitLabel(channel));
  const bool isSimple = IOReportSimpleGetIntegerValue(channel, &unit) != kInvalidValue;
  require(!isSimple || IOReportChannelGetFormat(channel) == kFormatSimple);
  for (std::int32_t i = -1; i < 20; ++i) {
    std::int64_t lower = 0;
    std::int64_t upper = 0;
    IOReportArrayGetValueAtIndex(channel, i);
    IOReportHistogramGetBucketHits(channel, i);
    IOReportHistogramGetBucketSum(channel, i);
    IOReportHistogramGetBucketBounds(channel, i, &lower, &upper);
    const auto at = IOReportStateGetIndexForID(channel, IOReportStateGetIDForIndex(channel, i));
    require(IOReportStateGetIDForIndex(channel, i) == kInvalidValue || at >= i);
    const auto state = IOReportStateGetNameForIndex(channel, i);
    require(!state || i >= 0);
    const double duty = IOReportStateGetDutyCycle(channel, i);
    require(!(duty < 0));
    IOReportStateGetInTransitions(channel, i);
  }
  IOReportHistogramGetMinValue(channel);
  IOReportHistogramGetMaxValue(channel);
  require(IOReportStateGetCurrent(channel) < 0x10000);
  const auto description = IOReportChannelCopyDescription(channel, 0, nullptr);
  require(!description || description->ends_with(" >\n"));
  IOReportSampleCopyDescription(channel, 0, "> ");
}

}  // namespace tavrel::fuzz
