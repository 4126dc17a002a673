#include "ioreport/elements.h"

#include <algorithm>

#include "ioreport/allocation.h"
#include "ioreport/keys.h"

namespace tavrel {
void Elements::copyFrom(const Elements& other) const {
  if (bytes_.data() == other.bytes_.data()) return;
  std::ranges::copy(other.bytes_.first(count() * kElementBytes), bytes_.begin());
}

Elements getRawElements(const plist::Dictionary& channel, std::uint8_t expectedFormat) {
  const MutableByteSpan bytes = channel.data(kRawElementsKey).bytes();
  if (bytes.size() < kElementBytes || *loadByte(bytes, kElementType) != expectedFormat) return {};
  return Elements(bytes);
}

Elements elementsOfType(const plist::Dictionary& channel, std::uint8_t format) {
  const Elements elements = getRawElements(channel, format);
  std::uint64_t type = 0;
  if (!elements || getChannelType(channel, type) != kKernelSuccess || formatOf(type) != format) {
    return {};
  }
  const bool isCounted = format == kFormatState || format == kFormatHistogram;
  if (isCounted && elementCountOf(type) != elements.count()) return {};
  return elements;
}

std::int64_t elementValue(const plist::Dictionary& channel, std::uint8_t format, std::int32_t index,
                          std::size_t value) {
  if (index < 0) return kInvalidValue;
  return elementsOfType(channel, format).value(static_cast<std::size_t>(index), value);
}

std::int32_t elementCountFor(const plist::Dictionary& channel, std::uint8_t format) {
  std::uint64_t type = 0;
  const bool isReadable = getChannelType(channel, type) == kKernelSuccess;
  return isReadable && formatOf(type) == format ? elementCountOf(type) : -1;
}

KernelReturn cloneElements(plist::Dictionary destination, const plist::Dictionary& source,
                           std::uint32_t flags) {
  const plist::Data original = source.data(kRawElementsKey);
  if (!destination || !original) return kKernelError;
  const bool isCopied = madeOrNull([&] {
    destination.set(kRawElementsKey, plist::mutableCopy(original));
    return true;
  });
  if (!isCopied) return kKernelError;
  if ((flags & kClearValues) == 0) return kKernelSuccess;

  std::uint64_t type = 0;
  if (getChannelType(destination, type) != kKernelSuccess) return kKernelError;
  const Elements elements = getRawElements(destination, formatOf(type));
  if (!elements) return kKernelError;
  for (std::size_t element = 0; element < elements.count(); ++element) {
    for (std::size_t index = 0; index < kElementValues; ++index)
      elements.setValue(element, index, kInvalidValue);
  }
  return kKernelSuccess;
}

}  // namespace tavrel
