#include "ioreport/discovery.h"

#include "base/format.h"
#include "ioreport/aggregate.h"
#include "ioreport/allocation.h"
#include "ioreport/channel.h"
#include "ioreport/iteration.h"
#include "ioreport/keys.h"

namespace tavrel {
namespace {

// The value when it is a text, otherwise null.
plist::Value textUnder(const plist::Dictionary& entry, std::string_view key) {
  plist::Value value = entry.get(key);
  return value.string() ? value : plist::Value();
}

plist::Dictionary publicDrivers(ErrorOut error) {
  const auto property = madeOrNull([] { return plist::Dictionary{{kLegendPublicKey, true}}; });
  if (!property) {
    fail(error, kKernelNoMemory, "prop create failed");
    return {};
  }
  const auto matching = madeOrNull([&] {
    return plist::Dictionary{{"IOPropertyMatch", property}};
  });
  if (!matching) fail(error, kKernelNoMemory, "dict create failed");
  return matching;
}

// An aggregate of the channels that `file` files for each matching service; an empty handle on
// failure.
template <class File>
plist::Dictionary collect(DriverRegistry& drivers, const plist::Dictionary& matching,
                          std::int32_t options, ErrorOut error, const File& file) {
  const plist::Dictionary aggregate = IOReportCreateAggregate(options);
  if (!aggregate) {
    fail(error, kKernelNoMemory, "couldn't make dict");
    return {};
  }
  const KernelReturn walk = iterateMatchingServices(
      drivers, matching, [&](DriverService& service) { return file(aggregate, service); });
  return walk == kKernelSuccess ? aggregate : plist::Dictionary();
}

KernelReturn addGroup(const plist::Dictionary& aggregate, DriverService& service,
                      const plist::Dictionary& entry, const plist::Array& channels,
                      std::int32_t options, ErrorOut error) {
  plist::Dictionary first;
  for (const plist::Value& element : channels) {
    const plist::Array legendChannel = element.array();
    if (!legendChannel) break;
    const plist::Dictionary channel =
        first ? createSiblingChannel(first, legendChannel, error)
              : createDriverChannel(service, legendChannel, textUnder(entry, kGroupNameKey),
                                    textUnder(entry, kSubGroupNameKey),
                                    entry.dictionary(kChannelInfoKey), error);
    if (!channel || _addChannel(aggregate, channel, options, error) != kKernelSuccess) {
      return kKernelError;
    }
    if (!first) first = channel;
  }
  return kKernelSuccess;
}

}  // namespace

KernelReturn iterateMatchingServices(DriverRegistry& drivers, const plist::Dictionary& matching,
                                     const std::function<KernelReturn(DriverService&)>& callback) {
  std::unique_ptr<ServiceIterator> services;
  const KernelReturn lookup = drivers.matchingServices(matching, services);
  if (lookup != kKernelSuccess) return lookup;
  if (!services || !services->isValid()) return kKernelSuccess;
  while (const auto service = services->next()) {
    const KernelReturn result = callback(*service);
    if (result != kKernelSuccess) return result;
  }
  return services->isValid() ? kKernelSuccess : kKernelAborted;
}

std::optional<std::string> IOReportCopyDriverName(DriverService& service) {
  std::string name;
  std::uint64_t id = 0;
  if (service.name(name) != kKernelSuccess || service.entryID(id) != kKernelSuccess) {
    return std::nullopt;
  }
  return madeOrNull([&] { return std::optional(format("%s <id %#llx>", name, id)); });
}

std::string IOReportCopyCurrentProcessName(Process& process) {
  return format("%s <pid %d>", process.name(), process.identifier());
}

plist::Dictionary createDriverChannel(DriverService& service, const plist::Array& legendChannel,
                                      const plist::Value& group, const plist::Value& subGroup,
                                      const plist::Dictionary& channelInfo, ErrorOut error) {
  std::uint64_t driverID = 0;
  const KernelReturn lookup = service.entryID(driverID);
  if (lookup != kKernelSuccess) {
    fail(error, lookup, "error extracting driver info");
    return {};
  }
  const auto driverName = IOReportCopyDriverName(service);
  if (!driverName) return {};
  return createChannel(driverID, *driverName, legendChannel, group, subGroup, channelInfo, error);
}

KernelReturn _addLegendChannels(const plist::Dictionary& aggregate, DriverService& service,
                                const plist::Array& legend, std::int32_t options, ErrorOut error) {
  for (const plist::Value& element : legend) {
    const plist::Dictionary entry = element.dictionary();
    if (!entry) break;
    if (entry.string(kSubGroupNameKey) && !entry.string(kGroupNameKey)) break;
    const plist::Array channels = entry.array(kChannelsKey);
    if (!channels) break;
    const KernelReturn result = addGroup(aggregate, service, entry, channels, options, error);
    if (result != kKernelSuccess) return result;
  }
  return kKernelSuccess;
}

plist::Dictionary IOReportCopyChannelsForDriver(DriverService* service, std::int32_t options,
                                                ErrorOut error) {
  const auto failed = [&](KernelReturn code, const char* text) {
    fail(error, code, text);
    return plist::Dictionary();
  };
  if (!service || service->userRetainCount() == 0) {
    return failed(kKernelBadArgument, "invalid driver");
  }
  const plist::Dictionary aggregate = IOReportCreateAggregate(options);
  if (!aggregate) return failed(kKernelNoMemory, "could not allocate collection");
  if (!service->property(kLegendPublicKey)) return aggregate;
  const plist::Value published = service->property(kLegendKey);
  if (!published) return failed(kKernelNotFound, "no legend");
  const plist::Array legend = published.array();
  if (!legend) return failed(kKernelInternalError, "bad legend");
  const KernelReturn result = _addLegendChannels(aggregate, *service, legend, options, error);
  if (result != kKernelSuccess) return failed(result, nullptr);
  return aggregate;
}

plist::Dictionary IOReportCopyChannelsForDrivers(DriverRegistry& drivers,
                                                 const plist::Dictionary& matching,
                                                 std::int32_t options, ErrorOut error) {
  if (!matching) {
    fail(error, kKernelBadArgument, "no matching dict");
    return {};
  }
  const auto merge = [&](const plist::Dictionary& aggregate,
                         DriverService& service) -> KernelReturn {
    const auto channels = IOReportCopyChannelsForDriver(&service, 0, error);
    if (!channels) return kKernelError;
    return static_cast<KernelReturn>(IOReportMergeChannels(aggregate, channels, error));
  };
  return collect(drivers, matching, options, error, merge);
}

plist::Dictionary IOReportCopyAllChannels(DriverRegistry& drivers, StandardStreams& streams,
                                          std::int32_t options, ErrorOut error) {
  const plist::Dictionary matching = publicDrivers(error);
  if (!matching) return {};
  const auto merge = [&](const plist::Dictionary& aggregate,
                         DriverService& service) -> KernelReturn {
    std::optional<ErrorObject> driverError;
    const auto channels = IOReportCopyChannelsForDriver(&service, options, &driverError);
    if (channels) {
      return static_cast<KernelReturn>(IOReportMergeChannels(aggregate, channels, error));
    }
    if (driverError) iorErrLog(streams, options, IOReportCopyDriverName(service), driverError);
    return kKernelSuccess;
  };
  return collect(drivers, matching, options, error, merge);
}

plist::Dictionary IOReportCopyChannelsWithID(DriverRegistry& drivers,
                                             const plist::Dictionary& matching,
                                             std::uint64_t channelID, ErrorOut error) {
  if (!matching) return {};
  const auto file = [&](const plist::Dictionary& aggregate,
                        DriverService& service) -> KernelReturn {
    const auto legend = createLegendChannel(channelID, kFormatUnknown, std::nullopt, error);
    if (!legend) return kKernelError;
    const auto channel = createDriverChannel(service, legend, {}, {}, {}, error);
    return channel ? _addChannel(aggregate, channel, 0, error) : kKernelError;
  };
  return collect(drivers, matching, 0, error, file);
}

}  // namespace tavrel
