// Selects channels by their properties.
//
//   auto disks = IOReportCopyChannelsInGroup(drivers, streams, "Disks", std::nullopt, 0, &error);
//
// The copying operations discover the channels of all drivers and then prune those not selected.
// Returned aggregates are the caller's own.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

#include "base/plist.h"
#include "ioreport/error_object.h"
#include "ioreport/iteration.h"
#include "platform/driver_registry.h"
#include "platform/standard_streams.h"

namespace tavrel {

/// The channels with at least one of the categories, and those whose type cannot be read.
plist::Dictionary IOReportCopyChannelsInCategories(DriverRegistry& drivers,
                                                   StandardStreams& streams,
                                                   std::uint16_t categories, std::int32_t options,
                                                   ErrorOut error);

plist::Dictionary IOReportCopyChannelsOfFormat(DriverRegistry& drivers, StandardStreams& streams,
                                               std::uint8_t format, std::int32_t options,
                                               ErrorOut error);

/// The channels with exactly that unit, including its scale.
plist::Dictionary IOReportCopyChannelsWithUnit(DriverRegistry& drivers, StandardStreams& streams,
                                               std::uint64_t unit, std::int32_t options,
                                               ErrorOut error);

/// The channels of a group, of a subgroup, or, when both are given, of that subgroup in that group.
plist::Dictionary IOReportCopyChannelsInGroup(DriverRegistry& drivers, StandardStreams& streams,
                                              std::optional<std::string_view> group,
                                              std::optional<std::string_view> subGroup,
                                              std::int32_t options, ErrorOut error);

/// The same in place: prunes all other channels.
IterateResult IOReportSelectChannelsInGroup(const plist::Dictionary& aggregate,
                                            std::optional<std::string_view> group,
                                            std::optional<std::string_view> subGroup,
                                            ErrorOut error);

}  // namespace tavrel
