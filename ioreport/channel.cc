#include "ioreport/channel.h"

#include "ioreport/allocation.h"
#include "ioreport/keys.h"

namespace tavrel {
namespace {

constexpr std::size_t kLegendID = 0;
constexpr std::size_t kLegendType = 1;
constexpr std::size_t kLegendName = 2;

std::int64_t legendInteger(const plist::Array& legend, std::size_t index) {
  return integerOf(legend.at(index).number());
}

bool identifiesChannel(const plist::Array& legend) {
  return legendInteger(legend, kLegendID) != kInvalidValue &&
         legendInteger(legend, kLegendType) != kInvalidValue;
}

template <class Make>
plist::Dictionary createWithLegend(const plist::Array& legend, ErrorOut error, const Make& make) {
  plist::Dictionary channel = identifiesChannel(legend) ? madeOrNull(make) : plist::Dictionary();
  if (!channel) fail(error, kKernelError, "couldn't create channel");
  return channel;
}

}  // namespace

std::int64_t integerOf(const std::optional<plist::Number>& number) {
  if (!number) return kInvalidValue;
  if (number->isFloating() && plist::Number(number->int64()) != *number) return kInvalidValue;
  return number->int64();
}

plist::Array createLegendChannel(std::uint64_t channelID, std::uint64_t channelType,
                                 std::optional<std::string_view> channelName, ErrorOut error) {
  plist::Array legend = madeOrNull([&] {
    plist::Array created = plist::Array::create(3);
    created.append(static_cast<std::int64_t>(channelID));
    created.append(static_cast<std::int64_t>(channelType));
    if (channelName) created.append(*channelName);
    return created;
  });
  if (!legend) fail(error, kKernelNoMemory, "couldn't create channel legend");
  return legend;
}

plist::Dictionary createChannel(std::uint64_t driverID, std::string_view driverName,
                                const plist::Array& legendChannel, const plist::Value& group,
                                const plist::Value& subGroup, const plist::Dictionary& channelInfo,
                                ErrorOut error) {
  return createWithLegend(legendChannel, error, [&] {
    return plist::Dictionary{{kDriverIDKey, static_cast<std::int64_t>(driverID)},
                             {kDriverNameKey, driverName},
                             {kLegendChannelKey, legendChannel},
                             {kGroupNameKey, group},
                             {kSubGroupNameKey, subGroup},
                             {kChannelInfoKey, channelInfo}};
  });
}

plist::Dictionary createSiblingChannel(const plist::Dictionary& sibling,
                                       const plist::Array& legendChannel, ErrorOut error) {
  return createWithLegend(legendChannel, error, [&] {
    plist::Dictionary channel = plist::mutableCopy(sibling);
    channel.set(kLegendChannelKey, legendChannel);
    return channel;
  });
}

KernelReturn getChannelType(const plist::Dictionary& channel, std::uint64_t& channelType) {
  const std::int64_t type = legendInteger(channel.array(kLegendChannelKey), kLegendType);
  if (type == kInvalidValue) return kKernelError;
  channelType = static_cast<std::uint64_t>(type);
  return kKernelSuccess;
}

KernelReturn setChannelType(const plist::Dictionary& channel, std::uint64_t channelType) {
  const plist::Array published = channel.array(kLegendChannelKey);
  if (published.empty()) return kKernelError;
  const auto type = static_cast<std::int64_t>(channelType);
  const bool isSet = madeOrNull([&] {
    plist::Array legend = plist::mutableCopy(published);
    if (legend.size() == kLegendType) {
      legend.append(type);
    } else {
      legend.set(kLegendType, type);
    }
    plist::Dictionary(channel).set(kLegendChannelKey, legend);
    return true;
  });
  return isSet ? kKernelSuccess : kKernelError;
}

std::uint8_t IOReportChannelGetFormat(const plist::Dictionary& channel) {
  std::uint64_t type = 0;
  return getChannelType(channel, type) == kKernelSuccess ? formatOf(type) : kFormatUnknown;
}

std::uint16_t IOReportChannelGetCategories(const plist::Dictionary& channel) {
  std::uint64_t type = 0;
  return getChannelType(channel, type) == kKernelSuccess ? categoriesOf(type) : 0xFFFF;
}

std::int64_t IOReportChannelGetDriverID(const plist::Dictionary& channel) {
  return integerOf(channel.number(kDriverIDKey));
}

std::int64_t IOReportChannelGetChannelID(const plist::Dictionary& channel) {
  return legendInteger(channel.array(kLegendChannelKey), kLegendID);
}

std::int64_t IOReportChannelGetUnit(const plist::Dictionary& channel) {
  return integerOf(channel.dictionary(kChannelInfoKey).number(kChannelUnitKey));
}

std::optional<std::string_view> IOReportChannelGetDriverName(const plist::Dictionary& channel) {
  return channel.string(kDriverNameKey);
}

std::optional<std::string_view> IOReportChannelGetGroup(const plist::Dictionary& channel) {
  return channel.string(kGroupNameKey);
}

std::optional<std::string_view> IOReportChannelGetSubGroup(const plist::Dictionary& channel) {
  return channel.string(kSubGroupNameKey);
}

std::optional<std::string_view> IOReportChannelGetChannelName(const plist::Dictionary& channel) {
  if (channel.contains(kChannelNameKey)) return channel.string(kChannelNameKey);
  return madeOrNull([&]() -> std::optional<std::string_view> {
    const plist::Value published = channel.array(kLegendChannelKey).at(kLegendName);
    if (published.string()) return keepText(channel, kChannelNameKey, published);
    const auto id = static_cast<std::uint64_t>(IOReportChannelGetChannelID(channel));
    const auto spelled = _copyPrintableIDString(id);
    if (!spelled) return std::nullopt;
    return keepText(channel, kChannelNameKey, *spelled);
  });
}

std::optional<std::string> _copyPrintableIDString(std::uint64_t id) {
  std::string text;
  for (int shift = 56; shift >= 0; shift -= 8) {
    const auto character = static_cast<char>(id >> shift & 0xFF);
    if (character == 0) continue;
    if (character < 0x20 || character > 0x7E) return std::nullopt;
    text += character;
  }
  if (text.empty()) return std::nullopt;
  return text;
}

std::string_view keepText(plist::Dictionary channel, std::string_view key,
                          const plist::Value& text) {
  channel.set(key, text);
  return *channel.string(key);
}

plist::Value textOrNull(std::optional<std::string_view> text) {
  return text ? plist::Value(*text) : plist::Value();
}

}  // namespace tavrel
