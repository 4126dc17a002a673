#include "platform/linux/recorded/hub_channels.h"

#include <algorithm>
#include <utility>

#include "base/format.h"
#include "platform/linux/recorded/typed_fields.h"
#include "platform/report_protocol.h"

namespace tavrel {
namespace {

bool isGroupOf(ByteSpan group, std::uint64_t driverID, std::uint64_t channelID) {
  return !group.empty() && group.size() % kElementBytes == 0 &&
         loadLittle16(group, kElementGroupCount) == group.size() / kElementBytes &&
         loadLittle64(group, kElementDriver) == driverID &&
         loadLittle64(group, kElementChannel) == channelID;
}

}  // namespace

HubChannel::HubChannel(plist::Value elements) : elements_(std::move(elements)) {
  largest_ = elements_.data().size();
  for (const plist::Value& group : elements_.array())
    largest_ = std::max(largest_, group.data().size());
}

ByteSpan HubChannel::group(std::size_t update) const {
  const plist::Array groups = elements_.array();
  if (!groups) return elements_.data().bytes();
  return groups.at(std::min(update, groups.size() - 1)).data().bytes();
}

void HubChannels::add(const plist::Array& channels, std::string_view origin, RefusalLog& refusals) {
  channels_.reserve(channels_.size() + channels.size());
  std::size_t index = 0;
  for (const plist::Value& channel : channels) {
    if (const char* fault = addOne(channel.dictionary())) {
      refusals.write(format("%s: hub channel %zu is left out: %s", origin, index, fault));
    }
    ++index;
  }
}

const char* HubChannels::addOne(const plist::Dictionary& channel) {
  const auto driverID = wordOf(channel.get("DriverID"));
  const auto channelID = wordOf(channel.get("ChannelID"));
  if (!driverID || !channelID) return "it has no \"DriverID\" or no \"ChannelID\"; give integers";

  plist::Value elements = channel.get("Elements");
  if (const plist::Array groups = elements.array()) elements = plist::mutableCopy(groups);
  const plist::Array groups = elements.array();
  const auto isGroup = [&](const plist::Value& group) {
    return isGroupOf(group.data().bytes(), *driverID, *channelID);
  };
  bool isWhole = isGroup(elements);
  if (groups) {
    const auto isAbsent = [](const plist::Value& group) {
      return group.data() && group.data().size() == 0;
    };
    isWhole = std::any_of(groups.begin(), groups.end(), isGroup) &&
              std::all_of(groups.begin(), groups.end(), [&](const plist::Value& group) {
                return isAbsent(group) || isGroup(group);
              });
  }
  if (!isWhole) {
    return "its \"Elements\" are not groups of this channel; give elements of 64 bytes with its "
           "ids, the "
           "first with their number at offset 20";
  }
  if (!channels_.emplace(Key{*driverID, *channelID}, HubChannel(elements)).second) {
    return "an earlier channel has the same ids; give each channel of a driver its own";
  }
  return nullptr;
}

const HubChannel* HubChannels::find(std::uint64_t driverID, std::uint64_t channelID) const {
  const auto at = channels_.find({driverID, channelID});
  return at == channels_.end() ? nullptr : &at->second;
}

}  // namespace tavrel
