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

/// Values in one property list that is read, or written in binary, after shared references are
/// expanded. Binary documents may refer to one container from many places, so that a few bytes
/// could stand for an endless tree. What is written as XML, the daily log, is limited by its bytes
/// alone.
inline constexpr std::size_t kPropertyListValues = 1'000'000;

/// Bytes of a property-list document. Larger than any preference domain, recording or message.
inline constexpr std::size_t kPropertyListBytes = 64U << 20;

/// Bytes of the whitelist file. Ten thousand keys with options are one MiB; a larger file counts
/// as unreadable and keeps the run below 64 MiB of memory.
inline constexpr std::size_t kWhitelistBytes = 4U << 20;

/// Findings about one whitelist that are listed. Nobody reads more at once, and each holds a copy
/// of its place.
inline constexpr std::size_t kWhitelistFindings = 1000;

/// Boundaries of one histogram. More counts as a failed allocation of its counters: no chart has
/// that many bars, and a file must not decide how much memory a key costs.
inline constexpr std::size_t kHistogramBoundaries = 65'536;

/// Bytes of an allocation whose size a device decides. More counts as a failed allocation.
inline constexpr std::uint64_t kDeviceAllocationBytes = 64U << 20;

/// Entries of one parsed statistics context. A real buffer has some 1,300; each takes 232 bytes, so
/// that a buffer of the largest size could ask for two GB. More counts as a failed allocation.
inline constexpr std::size_t kStatisticsEntries = 1'000'000;

/// How long a locked statistics store is waited for, in milliseconds.
inline constexpr int kStoreBusyMilliseconds = 10'000;

/// Bytes of the statistics that wait in a file beside a store that cannot be written: some sixty
/// days of a run's scalars.
inline constexpr std::size_t kKeptValueBytes = 1U << 20;

/// Bytes of the name of a preference domain. Tasking supplies domains; with its endings the name
/// must fit the 255 bytes of a file name.
inline constexpr std::size_t kPreferenceDomainBytes = 200;

/// Bytes of one preference domain's file. No value takes less than nine bytes of it, so that what
/// was written stays below `kPropertyListValues` and can be read again.
inline constexpr std::size_t kPreferenceFileBytes = 8U << 20;

/// Bytes of one day's structured records of one type. Records come from devices; more of them on
/// one day would wear the flash and say nothing new.
inline constexpr std::size_t kStructuredRecordFileBytes = 16U << 20;

/// Bytes of a small configuration file of the system, such as os-release.
inline constexpr std::size_t kSystemFactBytes = 64U << 10;

/// How long the lock of a file that another process writes is waited for, in milliseconds.
inline constexpr int kFileLockMilliseconds = 10'000;

/// Bytes of a key in the statistics store. Keys are names, far shorter than this. A row is read
/// whole with its key: without a limit whoever wrote the key would decide how much memory it takes.
inline constexpr std::size_t kStoreKeyBytes = 1U << 20;

/// Age after which a temporary file that a killed process left behind is removed, in seconds.
inline constexpr std::int64_t kTemporaryFileSeconds = 86'400;

/// Bytes of a message that travels in a packet. The kernel's default socket buffer ends near
/// 200 kB, and one buffer of this size serves all peers.
inline constexpr std::size_t kPacketBytes = 64U << 10;

/// Bytes of a message in a sealed memory file. 5,000 applications are about one MiB.
inline constexpr std::size_t kMessageFileBytes = 16U << 20;

/// Peers of a named service at one time. Further ones wait in the kernel's queue until one leaves.
/// Each costs a descriptor.
inline constexpr std::size_t kServicePeers = 2048;

/// Connections in a row that sent nothing and yet prolong the service's wait. Without a bound a
/// peer that only connects could keep the process alive for ever.
inline constexpr int kSilentConnections = 32;

/// Log lines about refused peers and messages within a minute. A peer that reconnects and sends
/// garbage again must not fill the system log.
inline constexpr int kRefusalLinesPerMinute = 20;

/// Characters of the name of a service or a notification; it is a file name and goes into a socket
/// address of 108 bytes.
inline constexpr std::size_t kServiceNameBytes = 64;

/// Descriptors that the service manager may hand over.
inline constexpr int kActivationDescriptors = 64;

/// Bytes of a line in a text file of the system. Package descriptions, the longest lines there are,
/// stay far below.
inline constexpr std::size_t kTextLineBytes = 64U << 10;

/// Desktop entries that are counted. Their names are held while counting.
inline constexpr std::size_t kDesktopEntries = 100'000;

/// Files and folders that are looked at for desktop entries. Users put what they like into theirs.
inline constexpr std::size_t kDesktopFiles = 1'000'000;

/// Bytes of a desktop entry, which has some lines of text in as many languages as there may be.
inline constexpr std::uint64_t kDesktopEntryBytes = 1U << 20;

/// Languages in one list. Matching compares every preferred with every available one; the system's
/// own list of all locales has some 500.
inline constexpr std::size_t kLanguages = 1'000;

}  // namespace tavrel::limits
