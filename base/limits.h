// Limits of the device's programs, with unit and reason; fleet/ and client/ have their own. Code
// that drops or refuses something because of one reports it, unless its comment says otherwise.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tavrel::limits {

/// Width and precision of a format directive, in characters. A format text may come from a device.
inline constexpr std::int32_t kLargestFormatWidth = 4096;

/// Nesting of containers in a property list, read or written. Walks over values recurse, and no
/// document of ours is deeper than ten.
inline constexpr std::size_t kPropertyListDepth = 128;

/// Values in one property list that is read, or written in binary, with shared references expanded.
/// Binary documents may refer to one container from many places, so a few bytes could stand for an
/// endless tree. XML that is written, such as the daily log, is limited only by its bytes.
inline constexpr std::size_t kPropertyListValues = 1'000'000;

/// Bytes of a property-list document: more than any preference domain, recording or message needs.
inline constexpr std::size_t kPropertyListBytes = 64U << 20;

/// Bytes of the whitelist file. Ten thousand keys with options take one MiB. A larger file counts
/// as unreadable. The worst file of this size takes some 100 MiB of memory.
inline constexpr std::size_t kWhitelistBytes = 4U << 20;

/// Findings listed for one whitelist. Nobody reads more at once, and each stores its location.
inline constexpr std::size_t kWhitelistFindings = 1000;

/// Boundaries of one histogram. A larger number counts as a failed allocation of its counters: no
/// chart has that many bars, and a file must not decide how much memory a key costs.
inline constexpr std::size_t kHistogramBoundaries = 65'536;

/// Bytes of an allocation whose size a device decides. A larger one counts as failed.
inline constexpr std::uint64_t kDeviceAllocationBytes = 64U << 20;

/// Entries of one parsed statistics context. A real buffer has some 1,300. Each takes 232 bytes, so
/// a buffer of the largest size could demand two GB. A larger number counts as a failed allocation.
inline constexpr std::size_t kStatisticsEntries = 1'000'000;

/// How long to wait for a locked statistics store, in milliseconds.
inline constexpr int kStoreBusyMilliseconds = 10'000;

/// Bytes of the statistics that wait in a file beside a store that cannot be written: some sixty
/// days of the daily run's scalars.
inline constexpr std::size_t kKeptValueBytes = 1U << 20;

/// Bytes of the name of a preference domain. Taskings supply domains, and the name with its endings
/// must fit the 255 bytes of a file name.
inline constexpr std::size_t kPreferenceDomainBytes = 200;

/// Bytes of one preference domain's file. Each value takes at least nine bytes of it, so a written
/// file stays below `kPropertyListValues` and can be read again.
inline constexpr std::size_t kPreferenceFileBytes = 8U << 20;

/// Bytes of one day's structured records of one type. Records come from drivers; more of them in
/// one day would wear the flash and add nothing new.
inline constexpr std::size_t kStructuredRecordFileBytes = 16U << 20;

/// Bytes of a small configuration file of the system, such as os-release.
inline constexpr std::size_t kSystemFactBytes = 64U << 10;

/// How long to wait for the lock of a file that another process writes, in milliseconds.
inline constexpr int kFileLockMilliseconds = 10'000;

/// Bytes of a key in the statistics store. Keys are names, far shorter than this. A row is read
/// with its whole key: without a limit, the key's writer would decide how much memory that takes.
inline constexpr std::size_t kStoreKeyBytes = 1U << 20;

/// Files in the folder of segments that a fold looks at. Each costs a system call.
inline constexpr std::size_t kSegmentFolderEntries = 1'000'000;

/// Segments that a fold reads, per user and in all; the rest wait for the next fold. Each live
/// process that records has one.
inline constexpr std::size_t kSegmentsPerUser = 2'048;
inline constexpr std::size_t kSegments = 16'384;

/// Bytes of the positions of one user's segments in the store. A program with fifty scalars takes
/// one KiB. Segments whose positions would exceed this wait.
inline constexpr std::size_t kPositionBytesPerUser = 1U << 20;

/// How large values of users other than root may make the store, in percent of its limit
/// (`DeviceLimits`); beyond that, their segments wait. Tidying brings it back below the limit once
/// a day.
inline constexpr std::int64_t kFoldStorePercent = 125;

/// Measurements that a fold takes, per user and in all; the remaining segments wait for the next
/// fold. The hourly segments of many programs, of 200,000 measurements each, stay below.
inline constexpr std::uint64_t kFoldValuesPerUser = 16'000'000;
inline constexpr std::uint64_t kFoldValues = 64'000'000;

/// Rows of the store, one per key and day, that a fold changes, per user and in all; further values
/// are refused. Nothing else keeps a program that makes up keys from filling the store.
inline constexpr std::size_t kFoldRowsPerUser = 65'536;
inline constexpr std::size_t kFoldRows = 262'144;

/// Bounds of one transaction of a fold: bytes of scalar keys, segments (each an open file), and
/// measurements. They bound memory, and the time for which other writers wait.
inline constexpr std::size_t kFoldKeyBytes = 4U << 20;
inline constexpr std::size_t kFoldSegmentsAtOnce = 256;
inline constexpr std::uint64_t kFoldValuesAtOnce = 4'000'000;

/// Values that one segment can claim to have dropped since the last fold.
inline constexpr std::uint64_t kLargestDrop = 1'000'000'000;

/// Pieces of waiting distributions that a viewer of the store remembers: one per segment, key and
/// day, 16 bytes each.
inline constexpr std::size_t kWaitingBlocks = 262'144;

/// Files in the folder of segments that one fold refuses unopened, each with a text in memory.
inline constexpr std::size_t kListedRefusals = 4'096;

/// Log lines about refused files, keys and users until the device restarts; further ones are only
/// counted. Files that stay are refused by every fold.
inline constexpr std::size_t kFoldRefusalLines = 100;

/// Age after which a temporary file that a killed process left behind is removed, in seconds.
inline constexpr std::int64_t kTemporaryFileSeconds = 86'400;

/// Bytes of a message sent in a packet. The kernel's default socket buffer ends near 200 kB, and
/// one buffer of this size serves all peers.
inline constexpr std::size_t kPacketBytes = 64U << 10;

/// Bytes of a message in a sealed memory file. A list of 5,000 applications takes about one MiB.
inline constexpr std::size_t kMessageFileBytes = 16U << 20;

/// Simultaneous peers of a named service, each with a descriptor. Further ones wait in the kernel's
/// queue until one leaves.
inline constexpr std::size_t kServicePeers = 2048;

/// Connections in a row that send nothing and still prolong the service's wait. Without a bound, a
/// peer that only connects could keep the process alive for ever.
inline constexpr int kSilentConnections = 32;

/// Log lines per minute about refused peers and messages. A peer that reconnects and sends garbage
/// again must not fill the system log.
inline constexpr int kRefusalLinesPerMinute = 20;

/// Characters of the name of a service or a notification. It is a file name, and part of a socket
/// address of 108 bytes.
inline constexpr std::size_t kServiceNameBytes = 64;

/// Descriptors that the service manager may hand over.
inline constexpr int kActivationDescriptors = 64;

/// Bytes of a line in a text file of the system. Even the longest, package descriptions, are far
/// shorter.
inline constexpr std::size_t kTextLineBytes = 64U << 10;

/// Desktop entries that are counted, since counting keeps a hash of each name.
inline constexpr std::size_t kDesktopEntries = 100'000;

/// Files and folders examined for desktop entries: users may put anything into their folders.
inline constexpr std::size_t kDesktopFiles = 1'000'000;

/// Folders in each other, below `applications`, that are searched for desktop entries. Each one
/// takes a descriptor.
inline constexpr int kDesktopFolderDepth = 16;

/// Bytes of a desktop entry: a few lines of text in many languages.
inline constexpr std::uint64_t kDesktopEntryBytes = 1U << 20;

/// Languages in one list. Matching compares each preferred language with each available one; the
/// system's own list of all locales has some 500. Further ones are left out without a line.
inline constexpr std::size_t kLanguages = 1'000;

/// Bytes of a drive's reading, of some fifty figures.
inline constexpr std::size_t kReadingBytes = 64U << 10;

/// Bytes of the memory file for drives, some four KiB per drive.
inline constexpr std::size_t kHealthMemoryBytes = 4U << 20;

/// Seconds after which a drive that was not seen is forgotten: more than a year, so that a drive
/// plugged in once a year goes on counting.
inline constexpr std::int64_t kDriveMemorySeconds = 400LL * 86'400;

/// Bytes of a kernel text; lines beyond are not shown. That is enough for some 300,000 counts of
/// interrupts: for 600 handlers on 512 processors.
inline constexpr std::size_t kLiveFileBytes = 4U << 20;

/// Elements of a live channel. An element has room for the counts of four processors, or for one
/// state; a type counts up to 65,535.
inline constexpr std::size_t kLiveElements = 4096;

/// Devices of one kind that are shown live, the first by name. Each costs a few files, read one by
/// one.
inline constexpr std::size_t kLiveDevices = 1000;

/// Processors that are shown live: the most for which the kernel can be built.
inline constexpr std::size_t kLiveProcessors = 8192;

/// Rows of one kernel table that are shown live, such as network interfaces.
inline constexpr std::size_t kLiveRows = 20'000;

/// Milliseconds in which one sensor, and all sensors together, must answer. On one-wire buses, each
/// takes up to a second.
inline constexpr int kSensorMilliseconds = 1'000;
inline constexpr int kSensorsMilliseconds = 4'000;

/// Sensors that may keep a thread waiting at the same time. Each costs a thread's stack.
inline constexpr int kWaitingSensors = 4;

/// The uploader's pause after a failure, in seconds, doubled by each further failure; and the
/// longest pause, which also bounds pauses from a server or the configuration.
inline constexpr double kUploadPauseSeconds = 600;
inline constexpr std::int64_t kLongestUploadPauseSeconds = 86'400;

/// Bytes of a header that the uploader sends. Servers accept some 8 KiB per line.
inline constexpr std::size_t kUploadHeaderBytes = 4'096;

/// Bytes of the body of a server's answer. Its content is not used.
inline constexpr std::size_t kUploadAnswerBytes = 64U << 10;

/// Refused logs that are kept for inspection: their number, and their bytes together.
inline constexpr std::size_t kRefusedLogs = 16;
inline constexpr std::uint64_t kRefusedBytes = 4U << 20;

}  // namespace tavrel::limits
