// Memory for data from a driver, in a size that the driver chose.
//
//   const DeviceBuffer buffer = DeviceBuffer::allocate(size);
//   if (!buffer) complain();
//   fetch(..., buffer.bytes(), length);
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <new>

#include "base/bytes.h"
#include "base/limits.h"

namespace tavrel {

/// Page-aligned and zeroed: bytes that the driver does not fill read as 0. The handle is empty when
/// the allocation failed or would exceed the limit; with 0 bytes, it is not.
class DeviceBuffer {
 public:
  DeviceBuffer() = default;

  static DeviceBuffer allocate(std::uint64_t size) {
    DeviceBuffer buffer;
    if (size > limits::kDeviceAllocationBytes) return buffer;
    const auto bytes = static_cast<std::size_t>(size);
    void* const memory = ::operator new(bytes, kAlignment, std::nothrow);
    if (!memory) return buffer;
    std::memset(memory, 0, bytes);
    buffer.memory_.reset(static_cast<std::byte*>(memory));
    buffer.size_ = bytes;
    return buffer;
  }

  explicit operator bool() const { return memory_ != nullptr; }
  MutableByteSpan bytes() const { return {memory_.get(), size_}; }

 private:
  /// In bytes. No device has larger pages.
  static constexpr std::align_val_t kAlignment{65536};

  struct Free {
    void operator()(std::byte* memory) const { ::operator delete(memory, kAlignment); }
  };

  std::unique_ptr<std::byte, Free> memory_;
  std::size_t size_ = 0;
};

}  // namespace tavrel
