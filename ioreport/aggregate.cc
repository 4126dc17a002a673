#include "ioreport/aggregate.h"

#include "ioreport/allocation.h"
#include "ioreport/channel.h"
#include "ioreport/keys.h"

namespace tavrel {
namespace {

// The level with that name in a container of levels, made if absent; empty for an empty `level`.
plist::Dictionary sublevel(const plist::Dictionary& level, std::string_view container,
                           std::optional<std::string_view> name) {
  if (!level || !name) return {};
  const plist::Dictionary levels = getOrCreateSubDictionary(level, container);
  return levels ? getOrCreateSubDictionary(levels, *name) : plist::Dictionary();
}

plist::Dictionary levelFor(const plist::Dictionary& aggregate, const plist::Dictionary& channel,
                           std::int32_t options) {
  plist::Dictionary level = aggregate;
  if ((options & kOptionGroupByDriver) != 0) {
    level = sublevel(level, kDriversKey, IOReportChannelGetDriverName(channel));
  }
  const auto group = IOReportChannelGetGroup(channel);
  if ((options & kOptionGroupByGroup) != 0 && group) {
    level = sublevel(level, kChannelGroupsKey, group);
    const auto subGroup = IOReportChannelGetSubGroup(channel);
    if (subGroup) level = sublevel(level, kChannelGroupsKey, subGroup);
  }
  return level;
}

bool appendChannel(plist::Dictionary level, const plist::Dictionary& channel) {
  if (!level) return false;
  const plist::Value present = level.get(kChannelsKey);
  plist::Array channels = present.array();
  if (!channels) {
    if (present) return false;
    channels = plist::Array::create();
    level.set(kChannelsKey, channels);
  }
  channels.append(channel);
  return true;
}

}  // namespace

plist::Dictionary IOReportCreateAggregate(std::int32_t options) {
  return madeOrNull([&] { return plist::Dictionary{{kQueryOptsKey, options}}; });
}

std::int32_t _getAggregateOpts(const plist::Dictionary& aggregate) {
  const auto options = aggregate.number(kQueryOptsKey);
  return options ? options->int32() : 0;
}

plist::Dictionary IOReportCreateUnitInfo(std::uint64_t unit) {
  return madeOrNull([&] {
    return plist::Dictionary{{kChannelUnitKey, static_cast<std::int64_t>(unit)}};
  });
}

KernelReturn IOReportAddChannelDescription(const plist::Dictionary& aggregate,
                                           std::uint64_t driverID, std::string_view driverName,
                                           std::uint64_t channelID, std::uint64_t channelType,
                                           std::optional<std::string_view> channelName,
                                           std::optional<std::string_view> group,
                                           std::optional<std::string_view> subGroup,
                                           const plist::Dictionary& channelInfo, ErrorOut error) {
  const plist::Array legend = createLegendChannel(channelID, channelType, channelName, error);
  if (!legend) return kKernelError;
  const plist::Dictionary channel = madeOrNull([&] {
    return createChannel(driverID, driverName, legend, textOrNull(group), textOrNull(subGroup),
                         channelInfo, error);
  });
  if (!channel) return kKernelError;
  return _addChannel(aggregate, channel, _getAggregateOpts(aggregate), error);
}

KernelReturn _addChannel(const plist::Dictionary& aggregate, const plist::Dictionary& channel,
                         std::int32_t options, ErrorOut error) {
  constexpr const char* kFailure = "_addChannel() failed";
  if (!aggregate || !channel) return fail(error, kKernelBadArgument, kFailure);
  const bool filed =
      madeOrNull([&] { return appendChannel(levelFor(aggregate, channel, options), channel); });
  return filed ? kKernelSuccess : fail(error, kKernelError, kFailure);
}

plist::Dictionary getOrCreateSubDictionary(plist::Dictionary dictionary, std::string_view key) {
  const plist::Value present = dictionary.get(key);
  if (!dictionary || present) return present.dictionary();
  plist::Dictionary created = plist::Dictionary::create();
  dictionary.set(key, created);
  return created;
}

}  // namespace tavrel
