// Finds the channels that drivers publish.
//
//   std::optional<ErrorObject> error;
//   auto channels = IOReportCopyAllChannels(drivers, streams, kOptionGroupByDriver, &error);
//
// A participating driver has the property "IOReportLegendPublic", and the property
// "IOReportLegend": an array of group entries, each a dictionary with the channels of one group. A
// query for one driver gets its channels whatever the value of the first property is; a search of
// all drivers finds those where it is true. Returned aggregates are the caller's own.
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

/// The channels of one driver; none when it does not publish any.
plist::Dictionary IOReportCopyChannelsForDriver(DriverService* service, std::int32_t options,
                                                ErrorOut error);

/// The channels of all services that match; fails when one driver has no legend.
plist::Dictionary IOReportCopyChannelsForDrivers(DriverRegistry& drivers,
                                                 const plist::Dictionary& matching,
                                                 std::int32_t options, ErrorOut error);

/// The channels of all drivers that publish some. Skips a driver that fails, and prints its error
/// when the options have `kOptionPrintErrors`.
plist::Dictionary IOReportCopyAllChannels(DriverRegistry& drivers, StandardStreams& streams,
                                          std::int32_t options, ErrorOut error);

/// A channel with that ID for each matching service, whether or not the service publishes one. Its
/// type is unknown until it is sampled.
plist::Dictionary IOReportCopyChannelsWithID(DriverRegistry& drivers,
                                             const plist::Dictionary& matching,
                                             std::uint64_t channelID, ErrorOut error);

/// "NAME <id 0x1234>"; nothing when the service has neither.
std::optional<std::string> IOReportCopyDriverName(DriverService& service);

/// "NAME <pid 123>".
std::string IOReportCopyCurrentProcessName(Process& process);

/// Calls back for each matching service until a callback returns a value other than 0, which is
/// then the result. If the registry changes meanwhile, the walk is aborted, not repeated.
KernelReturn iterateMatchingServices(DriverRegistry& drivers, const plist::Dictionary& matching,
                                     const std::function<KernelReturn(DriverService&)>& callback);

/// Files the channels of a legend. Stops at the first malformed group entry and keeps the channels
/// filed so far; within a group, skips the first channel that is not an array and all after it.
KernelReturn _addLegendChannels(const plist::Dictionary& aggregate, DriverService& service,
                                const plist::Array& legend, std::int32_t options, ErrorOut error);

/// A channel of a driver. Group and subgroup are texts or null.
plist::Dictionary createDriverChannel(DriverService& service, const plist::Array& legendChannel,
                                      const plist::Value& group, const plist::Value& subGroup,
                                      const plist::Dictionary& channelInfo, ErrorOut error);

}  // namespace tavrel
