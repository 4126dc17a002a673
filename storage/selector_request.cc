#include "storage/selector_request.h"

#include <algorithm>

namespace tavrel {

KernelReturn querySize(UserClient& client, const NandExporter& exporter, ByteSpan request,
                       std::uint32_t& size) {
  std::array<std::byte, 4> answer{};
  std::size_t length = answer.size();
  const KernelReturn status =
      client.callMethod(exporter.sizeSelector, {}, request, {}, answer, length);
  if (status == kKernelSuccess) size = *loadLittle32(answer, 0);
  return status;
}

KernelReturn fetchList(UserClient& client, const NandExporter& exporter, ByteSpan request,
                       MutableByteSpan buffer, std::size_t& length) {
  std::size_t answered = buffer.size();
  const KernelReturn status =
      client.callMethod(exporter.dataSelector, {}, request, {}, buffer, answered);
  if (status == kKernelSuccess) length = std::min(answered, buffer.size());
  return status;
}

}  // namespace tavrel
