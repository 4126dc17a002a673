// How a list is fetched from a storage driver: a size query, then the fetch itself.
//
//   std::uint32_t size = 0;
//   querySize(client, *exporter, SelectorRequest::sizeQuery(table).bytes(), size);
//   const DeviceBuffer buffer = DeviceBuffer::allocate(size);
//   fetchList(client, *exporter, SelectorRequest::fetch(table).bytes(), buffer.bytes(), length);
//
// A driver without selector tables is called without a request.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>

#include "base/kernel_return.h"
#include "storage/nand_exporters.h"

namespace tavrel {

/// The request sent with a size query or a fetch.
class SelectorRequest {
 public:
  /// 0: the selector (32 bits), 4: flags (16 bits), zeros to the end; little-endian.
  static constexpr std::size_t kBytes = 24;

  /// `requestFlag` is passed on to the driver; `subList` distinguishes the lists of one selector.
  static SelectorRequest sizeQuery(const SelectorTable& table, bool requestFlag = false,
                                   std::uint8_t subList = 0) {
    return {table.sizeQuery, kSizeQueryFlag, requestFlag, subList};
  }
  static SelectorRequest fetch(const SelectorTable& table, bool requestFlag = false,
                               std::uint8_t subList = 0) {
    return {table.fetch, 0, requestFlag, subList};
  }

  ByteSpan bytes() const { return bytes_; }

 private:
  static constexpr std::uint32_t kSizeQueryFlag = 1U << 0;
  static constexpr std::uint32_t kCallerFlag = 1U << 1;
  static constexpr unsigned kSubListShift = 2;

  SelectorRequest(std::uint32_t selector, std::uint32_t flags, bool requestFlag,
                  std::uint8_t subList) {
    flags |= (requestFlag ? kCallerFlag : 0) | std::uint32_t{subList} << kSubListShift;
    storeLittle32(bytes_, 0, selector);
    storeLittle16(bytes_, 4, static_cast<std::uint16_t>(flags));
  }

  std::array<std::byte, kBytes> bytes_{};
};

/// Asks for the size of a list in bytes. Missing bytes of the answer count as 0.
KernelReturn querySize(UserClient& client, const NandExporter& exporter, ByteSpan request,
                       std::uint32_t& size);

/// Fetches a list. `length` receives how many bytes the driver filled in, at most the size of the
/// buffer.
KernelReturn fetchList(UserClient& client, const NandExporter& exporter, ByteSpan request,
                       MutableByteSpan buffer, std::size_t& length);

}  // namespace tavrel
