// Finding the channels that drivers publish.
//
//   std::optional<ErrorObject> error;
//   auto channels = IOReportCopyAllChannels(drivers, streams, kOptionGroupByDriver, &error);
//
// A driver that takes part has the property "IOReportLegendPublic", and the property
// "IOReportLegend": an array of group entries, each a dictionary with the channels of one group.
// Whoever asks for a driver gets its channels whatever the value of the first is; a search of all
// drivers finds those where it is true. Aggregates that are handed out are the caller's own.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>

#include "base/plist.h"
#include "ioreport/error_object.h"
#include "platform/driver_registry.h"
#include "platform/process.h"
#include "platform/standard_streams.h"

namespace tavrel {

/// The channels of one driver, none when it does not publish them.
plist::Dictionary IOReportCopyChannelsForDriver(DriverService* service, std::int32_t options,
                                                ErrorOut error);

/// The channels of every service that matches; a driver without a legend fails them all.
plist::Dictionary IOReportCopyChannelsForDrivers(DriverRegistry& drivers,
                                                 const plist::Dictionary& matching,
                                                 std::int32_t options, ErrorOut error);

/// The channels of every driver that publishes some. A driver that fails is passed over, and
/// printed when the options have `kOptionPrintErrors`.
plist::Dictionary IOReportCopyAllChannels(DriverRegistry& drivers, StandardStreams& streams,
                                          std::int32_t options, ErrorOut error);

/// For every service that matches a channel of that id, whether it publishes one or not. Its type
/// is unknown until it is sampled.
plist::Dictionary IOReportCopyChannelsWithID(DriverRegistry& drivers,
                                             const plist::Dictionary& matching,
                                             std::uint64_t channelID, ErrorOut error);

/// "NAME <id 0x1234>"; nothing when the service does not tell either.
std::optional<std::string> IOReportCopyDriverName(DriverService& service);

/// "NAME <pid 123>".
std::string IOReportCopyCurrentProcessName(Process& process);

/// Calls back for each service that matches until one does not answer 0, and answers what that one
/// did. A walk that the registry changed under is aborted, not begun again.
KernelReturn iterateMatchingServices(DriverRegistry& drivers, const plist::Dictionary& matching,
                                     const std::function<KernelReturn(DriverService&)>& callback);

/// Files the channels of a legend. It ends, with what was filed, at the first group entry that is
/// malformed; within a group the rest is passed over behind the first channel that is no array.
KernelReturn _addLegendChannels(const plist::Dictionary& aggregate, DriverService& service,
                                const plist::Array& legend, std::int32_t options, ErrorOut error);

/// A channel of a driver. Group and subgroup are texts or null.
plist::Dictionary createDriverChannel(DriverService& service, const plist::Array& legendChannel,
                                      const plist::Value& group, const plist::Value& subGroup,
                                      const plist::Dictionary& channelInfo, ErrorOut error);

}  // namespace tavrel
