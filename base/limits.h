// Every limit on data from outside, with its unit and its reason. What is dropped or refused for a
// limit is said where it happens.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tavrel::limits {

/// Width and precision of a format directive, in characters. A format text may come from a device.
inline constexpr std::int32_t kLargestFormatWidth = 4096;

/// Nesting of containers in a property list, read or written. Every walk over values recurses, and
/// no document of ours is deeper than ten.
inline constexpr std::size_t kPropertyListDepth = 128;

/// Values in one property list after shared references are expanded. Binary documents may refer to
/// one container from many places, so that a few bytes could stand for an endless tree.
inline constexpr std::size_t kPropertyListValues = 1'000'000;

/// Bytes of a property-list document. Larger than any preference domain, recording or message.
inline constexpr std::size_t kPropertyListBytes = 64U << 20;

/// Bytes of the whitelist file. Ten thousand keys with options are one MiB; a larger file counts
/// as unreadable and keeps the run below 64 MiB of memory.
inline constexpr std::size_t kWhitelistBytes = 4U << 20;

/// Bytes of an allocation whose size a device decides. More counts as a failed allocation.
inline constexpr std::uint64_t kDeviceAllocationBytes = 64U << 20;

/// How long a locked statistics store is waited for, in milliseconds.
inline constexpr int kStoreBusyMilliseconds = 10'000;

/// Age after which a temporary file that a killed process left behind is removed, in seconds.
inline constexpr std::int64_t kTemporaryFileSeconds = 86'400;

}  // namespace tavrel::limits
