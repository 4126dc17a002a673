// The aggregate: a collection of channels, on which all of the library's operations work.
//
//   auto aggregate = IOReportCreateAggregate(kOptionGroupByDriver);
//   IOReportAddChannelDescription(aggregate, driverID, "disk <id 0x1234>", channelID, type,
//                                 "Reads", "Requests", std::nullopt, {}, nullptr);
//
// It is a tree of dictionaries. Each level holds an array of channels and, by name, levels for
// single drivers and groups; the top level also holds the options that decide where channels are
// filed. A channel is filed in one place, at the deepest level that the options and its names
// select. Channels are filed by reference: all holders of a channel see its changes.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

#include "base/plist.h"
#include "ioreport/error_object.h"

namespace tavrel {

/// Options of an aggregate; `kOptionPrintErrors` is another. Further bits are kept.
inline constexpr std::int32_t kOptionGroupByDriver = 1 << 0;
inline constexpr std::int32_t kOptionGroupByGroup = 1 << 1;

/// An empty handle when memory runs out.
plist::Dictionary IOReportCreateAggregate(std::int32_t options);

/// The options, 0 when there are none.
std::int32_t _getAggregateOpts(const plist::Dictionary& aggregate);

/// A channel info with only a unit; an empty handle when memory runs out.
plist::Dictionary IOReportCreateUnitInfo(std::uint64_t unit);

/// Builds a channel from its parts and files it.
KernelReturn IOReportAddChannelDescription(const plist::Dictionary& aggregate,
                                           std::uint64_t driverID, std::string_view driverName,
                                           std::uint64_t channelID, std::uint64_t channelType,
                                           std::optional<std::string_view> channelName,
                                           std::optional<std::string_view> group,
                                           std::optional<std::string_view> subGroup,
                                           const plist::Dictionary& channelInfo, ErrorOut error);

/// Files a channel by reference, as the options say.
KernelReturn _addChannel(const plist::Dictionary& aggregate, const plist::Dictionary& channel,
                         std::int32_t options, ErrorOut error);

/// The dictionary under a key, made when the key is absent; an empty handle when the value is no
/// dictionary.
plist::Dictionary getOrCreateSubDictionary(plist::Dictionary dictionary, std::string_view key);

}  // namespace tavrel
