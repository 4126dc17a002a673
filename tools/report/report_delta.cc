#include "tools/report/report_delta.h"

#include <cstdint>
#include <map>
#include <optional>
#include <utility>

#include "base/format.h"
#include "ioreport/ioreport.h"
#include "tools/report/report_failure.h"
#include "tools/report/report_selection.h"

namespace tavrel {
namespace {

using Identity = std::pair<std::int64_t, std::int64_t>;

Identity identityOf(const plist::Dictionary& channel) {
  return {IOReportChannelGetDriverID(channel), IOReportChannelGetChannelID(channel)};
}

std::string placeOf(const plist::Dictionary& channel) {
  std::string place;
  for (const auto& name :
       {IOReportChannelGetDriverName(channel), IOReportChannelGetGroup(channel),
        IOReportChannelGetSubGroup(channel), IOReportChannelGetChannelName(channel)}) {
    if (!name) continue;
    if (!place.empty()) place += ' ';
    place += *name;
  }
  return place;
}

}  // namespace

SampleChanges changesBetween(const plist::Dictionary& previous, const plist::Dictionary& current) {
  std::map<Identity, plist::Dictionary> earlier;
  for (const plist::Dictionary& channel : channelsIn(previous))
    earlier.emplace(identityOf(channel), channel);

  const std::int32_t options = _getAggregateOpts(current);
  SampleChanges delta;
  delta.samples = IOReportCreateAggregate(options);
  for (const plist::Dictionary& channel : channelsIn(current)) {
    std::optional<ErrorObject> error;
    std::string reason = "the previous sample has no value of it";
    if (const auto before = earlier.find(identityOf(channel)); before != earlier.end()) {
      const auto change = IOReportSampleCreateDelta(before->second, channel, &error);
      if (change && _addChannel(delta.samples, change, options, &error) == kKernelSuccess) continue;
      reason = reasonOf(error).value_or("a value is not set, or the number of values changed");
    }
    if (delta.leftOut++ > 0) continue;
    delta.firstLeftOut = format("%s: %s", placeOf(channel), reason);
  }
  return delta;
}

}  // namespace tavrel
