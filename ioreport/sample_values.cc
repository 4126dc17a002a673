#include "ioreport/sample_values.h"

#include "ioreport/channel.h"
#include "ioreport/elements.h"

namespace tavrel {

std::int64_t IOReportSimpleGetIntegerValue(const plist::Dictionary& channel, std::int64_t* unit) {
  const Elements elements = elementsOfType(channel, kFormatSimple);
  if (elements.count() != 1) return kInvalidValue;
  if (unit) *unit = IOReportChannelGetUnit(channel);
  return elements.value(0, kSimpleValue);
}

std::int64_t IOReportArrayGetValueAtIndex(const plist::Dictionary& channel, std::int32_t index) {
  if (index < 0) return kInvalidValue;
  const Elements elements = elementsOfType(channel, kFormatSimpleArray);
  const auto position = static_cast<std::size_t>(index);
  return elements.value(position / kElementValues, position % kElementValues);
}

}  // namespace tavrel
