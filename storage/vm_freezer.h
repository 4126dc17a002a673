// Flash writes of the virtual-memory freezer: those of its kernel thread, found by name in a stack
// snapshot.
//
//   const plist::Dictionary info = CopyVMFreezerNANDInfo(platform.stackSnapshots);
//
// A snapshot in the kernel's key-coded data format is a sequence of items, little-endian:
//
//    0  type (32 bits)
//    4  size of the payload, in bytes (32 bits)
//    8  flags (64 bits); at a container's begin and end, its identifier
//   16  payload, directly followed by the next item
#pragma once

#include <optional>
#include <string_view>

#include "base/bytes.h"
#include "base/plist.h"
#include "platform/stack_snapshot.h"

namespace tavrel {

/// Takes a snapshot. Returns a dictionary, owned by the caller, with the freezer's writes under
/// kNANDInfoVMFreezerNumPhysicalWritesKey, 0 when its thread has no IO statistics. Returns the two
/// error keys when there is no snapshot, the thread is not in it, or its IO statistics end before
/// the counter.
plist::Dictionary CopyVMFreezerNANDInfo(StackSnapshots& snapshots);

/// Searches the first container of `items`, with everything in it, for a container with a thread
/// name equal to `threadName`; the innermost ends first and wins. At most 64 bytes of a name item
/// count, up to a zero byte.
///
/// If found, returns true and sets `ioStatistics` to the payload of its last IO statistics item, or
/// to nothing when it has none. Otherwise, or without a name to search for, returns false and
/// leaves `ioStatistics` unchanged. Takes time proportional to `items`, and memory proportional to
/// the depth of nesting, less than twice the size of `items`.
bool getIOStatsWithThreadnameFromKCData(ByteSpan items, std::optional<std::string_view> threadName,
                                        std::optional<ByteSpan>& ioStatistics);

/// The same; `position`, if given, is set to the part of `items` that begins with the item that
/// ended the scan: the end of the container that was found or else of the first one, or what ended
/// the scan instead (the end of the buffer, a truncated item). It stays unchanged when there is no
/// container.
bool getIOStatsWithThreadnameFromKCDataHelper(ByteSpan items,
                                              std::optional<std::string_view> threadName,
                                              std::optional<ByteSpan>& ioStatistics,
                                              ByteSpan* position);

}  // namespace tavrel
