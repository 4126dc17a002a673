// The protocol between the kernel's reporting hub and its clients. All numbers are little-endian.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace tavrel {

/// The class of the hub's service.
inline constexpr std::string_view kReportHubClass = "IOReportHub";

/// Methods of the hub.
inline constexpr std::uint32_t kIOReportUserClientOpen = 0;
inline constexpr std::uint32_t kIOReportUserClientConfigureInterests = 2;
inline constexpr std::uint32_t kIOReportUserClientUpdateKernelBuffer = 3;

/// Properties of a driver's service.
inline constexpr std::string_view kLegendKey = "IOReportLegend";
inline constexpr std::string_view kLegendPublicKey = "IOReportLegendPublic";

/// In a group entry of a legend. Channels have the first three, too, and aggregates the last.
inline constexpr std::string_view kGroupNameKey = "IOReportGroupName";
inline constexpr std::string_view kSubGroupNameKey = "IOReportSubGroupName";
inline constexpr std::string_view kChannelInfoKey = "IOReportChannelInfo";
inline constexpr std::string_view kChannelUnitKey = "IOReportChannelUnit";  // in the channel info
inline constexpr std::string_view kChannelsKey = "IOReportChannels";

/// The first byte of a channel type: the layout of its elements' values.
inline constexpr std::uint8_t kFormatUnknown = 0;
inline constexpr std::uint8_t kFormatSimple = 1;
inline constexpr std::uint8_t kFormatState = 2;
inline constexpr std::uint8_t kFormatHistogram = 3;
inline constexpr std::uint8_t kFormatSimpleArray = 4;

/// The fields of a channel type. Its other bits pass through unchanged.
constexpr std::uint8_t formatOf(std::uint64_t channelType) {
  return static_cast<std::uint8_t>(channelType);
}
constexpr std::uint16_t categoriesOf(std::uint64_t channelType) {
  return static_cast<std::uint16_t>(channelType >> 16);
}
/// How many elements the channel occupies in a sample.
constexpr std::uint16_t elementCountOf(std::uint64_t channelType) {
  return static_cast<std::uint16_t>(channelType >> 32);
}
constexpr std::uint64_t channelTypeOf(std::uint8_t format, std::uint16_t categories,
                                      std::uint16_t elements) {
  return std::uint64_t{format} | std::uint64_t{categories} << 16 | std::uint64_t{elements} << 32;
}

/// Channels of interest: their number (32 bits) and 32 zero bits, then for each the driver ID, the
/// channel ID and the channel type (64 bits each).
inline constexpr std::size_t kInterestHeaderBytes = 8;
inline constexpr std::size_t kInterestBytes = 24;

/// The elements in which values arrive: IDs, type, timestamp and values, of 64 bits each. The
/// type's number of elements is that of the channel's group, which begins with this element.
inline constexpr std::size_t kElementBytes = 64;
inline constexpr std::size_t kElementValues = 4;
inline constexpr std::size_t kElementDriver = 0;  // offsets
inline constexpr std::size_t kElementChannel = 8;
inline constexpr std::size_t kElementType = 16;
inline constexpr std::size_t kElementGroupCount = 20;
inline constexpr std::size_t kElementTimestamp = 24;
inline constexpr std::size_t kElementFirstValue = 32;

}  // namespace tavrel
