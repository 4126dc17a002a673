// The keys of channels and aggregates, besides those that they share with legends.
#pragma once

#include <string_view>

#include "platform/report_protocol.h"  // IWYU pragma: export

namespace tavrel {

// In a channel.
inline constexpr std::string_view kDriverIDKey = "DriverID";
inline constexpr std::string_view kDriverNameKey = "DriverName";
inline constexpr std::string_view kLegendChannelKey = "LegendChannel";
inline constexpr std::string_view kRawElementsKey = "RawElements";  // of a sample

// Cached by getters in a channel.
inline constexpr std::string_view kChannelNameKey = "ChannelName";
inline constexpr std::string_view kUnitLabelKey = "UnitLabel";
inline constexpr std::string_view kStateNamesKey = "StateNames";
inline constexpr std::string_view kProcessedConfigKey = "ProcessedChannelConfig";

// In the channel info.
inline constexpr std::string_view kChannelConfigKey = "IOReportChannelConfig";

// In an aggregate.
inline constexpr std::string_view kDriversKey = "IOReportDrivers";
inline constexpr std::string_view kChannelGroupsKey = "IOReportChannelGroups";
inline constexpr std::string_view kQueryOptsKey = "QueryOpts";

}  // namespace tavrel
