// Flash writes of the virtual-memory freezer: the writes of its kernel thread, found by name in a
// stack snapshot.
//
//   const plist::Dictionary info = CopyVMFreezerNANDInfo(platform.stackSnapshots);
//
// A snapshot in the kernel's key-coded data format is a sequence of items, little-endian:
//
//    0  type (32 bits)
//    4  size of the payload, in bytes (32 bits)
//    8  flags (64 bits); of the begin and the end of a container its identifier
//   16  payload; the next item follows at once
#pragma once

#include <cstddef>
#include <optional>
#include <string_view>

#include "base/bytes.h"
#include "base/plist.h"
#include "platform/stack_snapshot.h"

namespace tavrel {

/// Takes a snapshot. Yields a dictionary of the caller's own with the freezer's writes under
/// kNANDInfoVMFreezerNumPhysicalWritesKey, 0 when its thread has no IO statistics. Yields the two
/// error keys when there is no snapshot, the thread is not in it, or its IO statistics end before
/// the counter.
plist::Dictionary CopyVMFreezerNANDInfo(StackSnapshots& snapshots);

/// Searches the first container of `items`, and everything in it, for a container that holds a
/// thread name equal to `threadName`; the innermost ends first and wins. Of a name item, at most 64
/// bytes count, up to a zero byte.
///
/// When there is one, returns true and sets `ioStatistics` to the payload of its last IO statistics
/// item, or to nothing when it has none. Otherwise, and when there is no name to search for,
/// returns false and leaves `ioStatistics` unchanged. Takes time in proportion to `items` and
/// memory in proportion to the depth of nesting, less than twice the size of `items`.
bool getIOStatsWithThreadnameFromKCData(ByteSpan items, std::optional<std::string_view> threadName,
                                        std::optional<ByteSpan>& ioStatistics);

/// The same; `position`, when given, is set to the part of `items` that begins with the item that
/// ended the scan: the end of the container that was found, otherwise the end of the first one, or
/// whatever took the place of an end (the end of the buffer, a truncated item). It stays unchanged
/// when there is no container.
bool getIOStatsWithThreadnameFromKCDataHelper(ByteSpan items,
                                              std::optional<std::string_view> threadName,
                                              std::optional<ByteSpan>& ioStatistics,
                                              ByteSpan* position);

}  // namespace tavrel
