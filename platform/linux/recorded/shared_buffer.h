// Memory that a driver in this process shares with its client: an anonymous memory file that one
// side writes and the other maps for reading.
#pragma once

#include <cstddef>
#include <memory>
#include <utility>

#include "base/bytes.h"
#include "base/expected.h"
#include "platform/linux/files/descriptor.h"
#include "platform/user_client.h"

namespace tavrel {

/// A mapped range of memory, unmapped on destruction.
class MemoryRange {
 public:
  MemoryRange() = default;
  MemoryRange(void* address, std::size_t size) : address_(address), size_(size) {}
  MemoryRange(MemoryRange&& other) noexcept
      : address_(std::exchange(other.address_, nullptr)), size_(std::exchange(other.size_, 0)) {}
  MemoryRange& operator=(MemoryRange&& other) noexcept {
    std::swap(address_, other.address_);
    std::swap(size_, other.size_);
    return *this;
  }
  ~MemoryRange();

  MutableByteSpan bytes() const { return {static_cast<std::byte*>(address_), size_}; }

 private:
  void* address_ = nullptr;
  std::size_t size_ = 0;
};

class SharedBuffer {
 public:
  /// Zero-filled memory of `size` bytes, which must not be 0. It is fully allocated: writing to it
  /// cannot run out of memory later.
  static Expected<SharedBuffer> create(std::size_t size);

  /// The driver's side.
  MutableByteSpan bytes() const { return range_.bytes(); }
  /// The client's side, which may outlive the buffer.
  Expected<std::unique_ptr<MappedMemory>> map() const;

 private:
  SharedBuffer(Descriptor file, MemoryRange range)
      : file_(std::move(file)), range_(std::move(range)) {}

  Descriptor file_;
  MemoryRange range_;
};

}  // namespace tavrel
