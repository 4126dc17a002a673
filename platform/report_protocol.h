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

/// Channels of interest: their number (32 bits) and 32 zero bits, then for each the driver ID, the
/// channel ID and the channel type (64 bits each).
inline constexpr std::size_t kInterestHeaderBytes = 8;
inline constexpr std::size_t kInterestBytes = 24;

/// The elements in which values arrive: IDs, type, timestamp and values, of 64 bits each. The first
/// byte of the type is the format; 16 of its bits are the number of elements in the channel's
/// group, which begins with this element.
inline constexpr std::size_t kElementBytes = 64;
inline constexpr std::size_t kElementValues = 4;
inline constexpr std::size_t kElementDriver = 0;  // offsets
inline constexpr std::size_t kElementChannel = 8;
inline constexpr std::size_t kElementType = 16;
inline constexpr std::size_t kElementGroupCount = 20;
inline constexpr std::size_t kElementTimestamp = 24;
inline constexpr std::size_t kElementFirstValue = 32;

}  // namespace tavrel
