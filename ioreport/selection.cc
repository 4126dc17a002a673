#include "ioreport/selection.h"

#include "ioreport/channel.h"
#include "ioreport/discovery.h"

namespace tavrel {
namespace {

using Predicate = std::function<bool(const plist::Dictionary& channel)>;

IterateResult keepOnly(const plist::Dictionary& aggregate, const Predicate& keeps, ErrorOut error) {
  const IterateResult result =
      IOReportPrune(aggregate, [&](const plist::Dictionary& channel) -> IterateResult {
        return keeps(channel) ? kIterateContinue : kIterateRemove;
      });
  if (!walkFailed(result)) return result;
  fail(error, kKernelError, "channel pruning failed");
  return kIterateStop;
}

plist::Dictionary copyOnly(DriverRegistry& drivers, StandardStreams& streams, std::int32_t options,
                           const Predicate& keeps, ErrorOut error) {
  const plist::Dictionary all = IOReportCopyAllChannels(drivers, streams, options, error);
  if (!all || walkFailed(keepOnly(all, keeps, error))) return {};
  return all;
}

}  // namespace

plist::Dictionary IOReportCopyChannelsInCategories(DriverRegistry& drivers,
                                                   StandardStreams& streams,
                                                   std::uint16_t categories, std::int32_t options,
                                                   ErrorOut error) {
  const auto hasCategory = [categories](const plist::Dictionary& channel) {
    return (categories & IOReportChannelGetCategories(channel)) != 0;
  };
  return copyOnly(drivers, streams, options, hasCategory, error);
}

plist::Dictionary IOReportCopyChannelsOfFormat(DriverRegistry& drivers, StandardStreams& streams,
                                               std::uint8_t format, std::int32_t options,
                                               ErrorOut error) {
  const auto hasFormat = [format](const plist::Dictionary& channel) {
    return IOReportChannelGetFormat(channel) == format;
  };
  return copyOnly(drivers, streams, options, hasFormat, error);
}

plist::Dictionary IOReportCopyChannelsWithUnit(DriverRegistry& drivers, StandardStreams& streams,
                                               std::uint64_t unit, std::int32_t options,
                                               ErrorOut error) {
  const auto hasUnit = [unit](const plist::Dictionary& channel) {
    return static_cast<std::uint64_t>(IOReportChannelGetUnit(channel)) == unit;
  };
  return copyOnly(drivers, streams, options, hasUnit, error);
}

plist::Dictionary IOReportCopyChannelsInGroup(DriverRegistry& drivers, StandardStreams& streams,
                                              std::optional<std::string_view> group,
                                              std::optional<std::string_view> subGroup,
                                              std::int32_t options, ErrorOut error) {
  const plist::Dictionary all = IOReportCopyAllChannels(drivers, streams, options, error);
  if (!all || walkFailed(IOReportSelectChannelsInGroup(all, group, subGroup, error))) return {};
  return all;
}

IterateResult IOReportSelectChannelsInGroup(const plist::Dictionary& aggregate,
                                            std::optional<std::string_view> group,
                                            std::optional<std::string_view> subGroup,
                                            ErrorOut error) {
  if (!group && !subGroup) {
    fail(error, kKernelBadArgument, "no group or subgroup!");
    return kIterateStop;
  }
  const auto isThere = [&](const plist::Dictionary& channel) {
    return (!group || IOReportChannelGetGroup(channel) == group) &&
           (!subGroup || IOReportChannelGetSubGroup(channel) == subGroup);
  };
  return keepOnly(aggregate, isThere, error);
}

}  // namespace tavrel
