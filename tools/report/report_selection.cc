#include "tools/report/report_selection.h"

#include <algorithm>
#include <iterator>
#include <unordered_set>

#include "base/format.h"
#include "base/parse_number.h"
#include "tools/report/report_failure.h"

namespace tavrel {
namespace {

constexpr std::uint64_t kLargestMask = 0xFFFF;
constexpr std::uint64_t kLargestFormat = 0xFF;

constexpr std::string_view kFormatNames[] = {"unknown", "simple", "state", "histogram", "array"};

// The selection, translated to properties of channels.
struct Filter {
  std::optional<std::uint64_t> categories;
  std::optional<std::uint64_t> format;
  std::string_view unitLabel;
  std::optional<std::uint64_t> unit;
  std::string_view driverName;
  std::optional<std::uint64_t> driverID;
};

bool isDriver(const plist::Dictionary& channel, const Filter& filter) {
  if (filter.driverName.empty()) return true;
  const auto id = static_cast<std::uint64_t>(IOReportChannelGetDriverID(channel));
  const std::string_view name = IOReportChannelGetDriverName(channel).value_or("");
  return filter.driverID == id || name == filter.driverName ||
         name == format("%s <id %#llx>", filter.driverName, id);
}

bool isUnit(const plist::Dictionary& channel, const Filter& filter) {
  if (filter.unitLabel.empty()) return true;
  if (filter.unit == static_cast<std::uint64_t>(IOReportChannelGetUnit(channel))) return true;
  return IOReportChannelGetUnitLabel(channel) == filter.unitLabel;
}

bool passes(const plist::Dictionary& channel, const Filter& filter) {
  if (filter.categories && (IOReportChannelGetCategories(channel) & *filter.categories) == 0) {
    return false;
  }
  if (filter.format && IOReportChannelGetFormat(channel) != *filter.format) return false;
  return isUnit(channel, filter) && isDriver(channel, filter);
}

std::optional<std::uint64_t> parseFormat(const std::string& text) {
  const auto* const named = std::find(std::begin(kFormatNames), std::end(kFormatNames), text);
  if (named != std::end(kFormatNames))
    return static_cast<std::uint64_t>(named - std::begin(kFormatNames));
  const auto number = parseWord(text);
  return number <= kLargestFormat ? number : std::nullopt;
}

std::optional<std::uint64_t> parseMask(const std::string& text) {
  const auto mask = parseWord(text);
  return mask <= kLargestMask ? mask : std::nullopt;
}

Filter filterOf(const ReportSelection& selection) {
  return {.categories = parseMask(selection.categories),
          .format = parseFormat(selection.format),
          .unitLabel = selection.unit,
          .unit = parseWord(selection.unit),
          .driverName = selection.driver,
          .driverID = parseWord(selection.driver)};
}

std::optional<std::string_view> given(const std::string& text) {
  if (text.empty()) return std::nullopt;
  return text;
}

}  // namespace

void addSelectionOptions(Command command, ReportSelection& selection) {
  command.addOption("--group", selection.group, "Only channels of this group").typeName("NAME");
  command.addOption("--subgroup", selection.subGroup, "Only channels of this subgroup")
      .typeName("NAME");
  command
      .addOption("--category", selection.categories, "Only channels with one of these categories")
      .typeName("MASK")
      .check([](const std::string& text) {
        return parseMask(text) ? "" : format("not a number of at most 16 bits: %s", text);
      });
  command
      .addOption("--format", selection.format,
                 "Only channels of this format: simple, state, histogram, array, unknown, a number")
      .typeName("FORMAT")
      .check([](const std::string& text) {
        return parseFormat(text) ? "" : format("not a format of report channels: %s", text);
      });
  command.addOption("--unit", selection.unit, "Only channels of this unit: a label or its code")
      .typeName("UNIT");
  command
      .addOption("--driver", selection.driver, "Only channels of this driver: its name or its id")
      .typeName("DRIVER");
  const Option live =
      command.addFlag("--live", selection.live, "Only channels of this machine's kernel");
  command.addFlag("--recorded", selection.recorded, "Only channels of recordings").excludes(live);
}

Expected<plist::Dictionary> selectChannels(Platform& platform, const ReportSelection& selection) {
  const Filter filter = filterOf(selection);
  std::optional<ErrorObject> error;
  const auto channels = IOReportCopyAllChannels(
      platform.drivers, platform.standardStreams,
      kOptionGroupByDriver | kOptionGroupByGroup | kOptionPrintErrors, &error);
  if (!channels) {
    return Error{error ? reportFailure("list the channels", error)
                       : reportFailure("list the channels", error,
                                       "the registry may have changed meanwhile: try again")};
  }
  const bool byGroup = !selection.group.empty() || !selection.subGroup.empty();
  if (byGroup && walkFailed(IOReportSelectChannelsInGroup(channels, given(selection.group),
                                                          given(selection.subGroup), &error))) {
    return Error{reportFailure("select channels", error)};
  }
  const IterateResult pruned = IOReportPrune(channels, [&](const plist::Dictionary& channel) {
    return passes(channel, filter) ? kIterateContinue : kIterateRemove;
  });
  if (walkFailed(pruned)) return Error{reportFailure("select channels", std::nullopt)};
  return channels;
}

void keepOrigin(const plist::Dictionary& channels, const ReportSelection& selection,
                const plist::Array& live) {
  if (selection.live == selection.recorded) return;
  std::unordered_set<std::int64_t> drivers;
  for (const plist::Value& service : live) {
    if (const auto id = service.dictionary().number("EntryID")) drivers.insert(id->int64());
  }
  IOReportPrune(channels, [&](const plist::Dictionary& channel) {
    const bool isLive = drivers.contains(IOReportChannelGetDriverID(channel));
    return isLive == selection.live ? kIterateContinue : kIterateRemove;
  });
}

std::vector<plist::Dictionary> channelsIn(const plist::Dictionary& aggregate) {
  std::vector<plist::Dictionary> channels;
  IOReportIterate(aggregate, [&](const plist::Dictionary& channel) {
    channels.push_back(channel);
    return kIterateContinue;
  });
  return channels;
}

std::string formatName(std::uint8_t format) {
  return format < std::size(kFormatNames) ? std::string(kFormatNames[format])
                                          : std::to_string(format);
}

std::optional<std::uint64_t> parseWord(std::string_view text) {
  const bool isHexadecimal = text.starts_with("0x") || text.starts_with("0X");
  if (isHexadecimal) text.remove_prefix(2);
  return parseNumber<std::uint64_t>(text, isHexadecimal ? 16 : 10);
}

}  // namespace tavrel
