// Kernel stack snapshots in the kernel's key-coded data format.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>

#include "base/bytes.h"

namespace tavrel {

inline constexpr std::uint32_t kStackSnapshotKeyCodedData = 0x10000;

/// A snapshot configuration. Releasing it frees the captured buffer.
class StackSnapshot {
 public:
  virtual ~StackSnapshot() = default;
  virtual bool setFlags(std::uint32_t flags) = 0;
  virtual bool capture() = 0;
  /// The captured bytes, borrowed from the configuration; nothing when there are none.
  virtual std::optional<ByteSpan> buffer() = 0;
};

class StackSnapshots {
 public:
  virtual ~StackSnapshots() = default;
  /// Null when no configuration can be made.
  virtual std::unique_ptr<StackSnapshot> create() = 0;
};

}  // namespace tavrel
