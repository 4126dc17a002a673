// A connection to a driver: numbered methods and shared memory.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>

#include "base/bytes.h"
#include "base/kernel_return.h"

namespace tavrel {

/// Memory that the driver shares with the process, unmapped when released.
class MappedMemory {
 public:
  virtual ~MappedMemory() = default;
  virtual ByteSpan bytes() const = 0;
};

/// Closed when released; `close` does so earlier and returns the status.
class UserClient {
 public:
  virtual ~UserClient() = default;

  /// Calls a method. On success the first `scalarOutput.size()` scalars are filled, and
  /// `structureOutputLength` is set to the bytes written to `structureOutput`.
  virtual KernelReturn callMethod(std::uint32_t selector,
                                  std::span<const std::uint64_t> scalarInput,
                                  ByteSpan structureInput, std::span<std::uint64_t> scalarOutput,
                                  MutableByteSpan structureOutput,
                                  std::size_t& structureOutputLength) = 0;

  /// Maps a memory type into this task, at any address.
  virtual KernelReturn mapMemory(std::uint32_t memoryType,
                                 std::unique_ptr<MappedMemory>& mapped) = 0;

  virtual KernelReturn close() = 0;
};

}  // namespace tavrel
