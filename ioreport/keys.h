// The keys of channels, aggregates and legends, and of the services that publish them.
#pragma once

#include <string_view>

namespace tavrel {

// In a channel.
inline constexpr std::string_view kDriverIDKey = "DriverID";
inline constexpr std::string_view kDriverNameKey = "DriverName";
inline constexpr std::string_view kLegendChannelKey = "LegendChannel";
inline constexpr std::string_view kRawElementsKey = "RawElements";  // of a sample

// In a channel, and in a group entry of a legend.
inline constexpr std::string_view kGroupNameKey = "IOReportGroupName";
inline constexpr std::string_view kSubGroupNameKey = "IOReportSubGroupName";
inline constexpr std::string_view kChannelInfoKey = "IOReportChannelInfo";

// Cached by getters in a channel.
inline constexpr std::string_view kChannelNameKey = "ChannelName";
inline constexpr std::string_view kUnitLabelKey = "UnitLabel";
inline constexpr std::string_view kStateNamesKey = "StateNames";
inline constexpr std::string_view kProcessedConfigKey = "ProcessedChannelConfig";

// In the channel info.
inline constexpr std::string_view kChannelUnitKey = "IOReportChannelUnit";
inline constexpr std::string_view kChannelConfigKey = "IOReportChannelConfig";

// In an aggregate; the first also in a group entry of a legend.
inline constexpr std::string_view kChannelsKey = "IOReportChannels";
inline constexpr std::string_view kDriversKey = "IOReportDrivers";
inline constexpr std::string_view kChannelGroupsKey = "IOReportChannelGroups";
inline constexpr std::string_view kQueryOptsKey = "QueryOpts";

// Properties of a driver's service.
inline constexpr std::string_view kLegendKey = "IOReportLegend";
inline constexpr std::string_view kLegendPublicKey = "IOReportLegendPublic";

}  // namespace tavrel
