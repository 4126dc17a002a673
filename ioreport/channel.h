// The channel: a dictionary with the publisher, the ID, the type and the name of a quantity.
//
// A channel's legend is an array of its ID, its type and, if it has one, its name. It belongs to
// its publisher and is shared between the channel, its copies and its samples, so `setChannelType`
// gives the channel a legend of its own before changing it. The getters cache their results in the
// channel and return texts borrowed from it.
//
// Every 64-bit quantity that is absent or unreadable reads as `kInvalidValue`.
#pragma once

#include <cstdint>
#include <limits>
#include <optional>
#include <string>
#include <string_view>

#include "base/plist.h"
#include "ioreport/error_object.h"
#include "platform/report_protocol.h"  // IWYU pragma: export

namespace tavrel {

inline constexpr std::int64_t kInvalidValue = std::numeric_limits<std::int64_t>::min();

/// A number as a signed 64-bit integer; an unsigned one keeps its bits. `kInvalidValue` for a real
/// number that is not whole or exceeds 64 bits.
std::int64_t integerOf(const std::optional<plist::Number>& number);

/// A new legend; an empty handle when memory runs out.
plist::Array createLegendChannel(std::uint64_t channelID, std::uint64_t channelType,
                                 std::optional<std::string_view> channelName, ErrorOut error);

/// A new channel that shares the legend and the info; an empty handle for a legend without ID or
/// type. Group and subgroup are texts or null.
plist::Dictionary createChannel(std::uint64_t driverID, std::string_view driverName,
                                const plist::Array& legendChannel, const plist::Value& group,
                                const plist::Value& subGroup, const plist::Dictionary& channelInfo,
                                ErrorOut error);

/// A channel that differs from another one only in its legend. It shares everything else, down to
/// the texts of the keys, so that the channels of a large legend are small.
plist::Dictionary createSiblingChannel(const plist::Dictionary& sibling,
                                       const plist::Array& legendChannel, ErrorOut error);

KernelReturn getChannelType(const plist::Dictionary& channel, std::uint64_t& channelType);
/// Adds a type to a legend that has none.
KernelReturn setChannelType(const plist::Dictionary& channel, std::uint64_t channelType);

std::uint8_t IOReportChannelGetFormat(const plist::Dictionary& channel);
/// All bits set when the type cannot be read.
std::uint16_t IOReportChannelGetCategories(const plist::Dictionary& channel);
std::int64_t IOReportChannelGetDriverID(const plist::Dictionary& channel);
std::int64_t IOReportChannelGetChannelID(const plist::Dictionary& channel);
std::int64_t IOReportChannelGetUnit(const plist::Dictionary& channel);
std::optional<std::string_view> IOReportChannelGetDriverName(const plist::Dictionary& channel);
std::optional<std::string_view> IOReportChannelGetGroup(const plist::Dictionary& channel);
std::optional<std::string_view> IOReportChannelGetSubGroup(const plist::Dictionary& channel);
/// The name in the legend, otherwise the ID when it spells one.
std::optional<std::string_view> IOReportChannelGetChannelName(const plist::Dictionary& channel);

/// The characters that an ID spells, from its highest byte down and without zero bytes; nothing
/// when a byte is not printable or all are zero.
std::optional<std::string> _copyPrintableIDString(std::uint64_t id);

/// Stores a getter's result and returns the stored text.
std::string_view keepText(plist::Dictionary channel, std::string_view key,
                          const plist::Value& text);

/// Null when there is no text.
plist::Value textOrNull(std::optional<std::string_view> text);

}  // namespace tavrel
