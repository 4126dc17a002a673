#include "tools/report/report_json.h"

#include <cmath>
#include <nlohmann/json.hpp>
#include <utility>

#include "ioreport/elements.h"
#include "ioreport/ioreport.h"
#include "tools/report/report_selection.h"

namespace tavrel {
namespace {

Json orNull(std::optional<std::string_view> text) {
  return text ? Json(*text) : Json();
}
Json orNull(std::int64_t value) {
  return value == kInvalidValue ? Json() : Json(value);
}
Json idOrNull(std::int64_t id) {
  return id == kInvalidValue ? Json() : Json(static_cast<std::uint64_t>(id));
}
Json countOrNull(std::int64_t count, bool isDelta) {
  return isDelta ? orNull(count) : idOrNull(count);
}

Json channelJson(const plist::Dictionary& channel) {
  std::uint64_t type = 0;
  const bool hasType = getChannelType(channel, type) == kKernelSuccess;
  return {{"driver", orNull(IOReportChannelGetDriverName(channel))},
          {"driver_id", idOrNull(IOReportChannelGetDriverID(channel))},
          {"group", orNull(IOReportChannelGetGroup(channel))},
          {"subgroup", orNull(IOReportChannelGetSubGroup(channel))},
          {"name", orNull(IOReportChannelGetChannelName(channel))},
          {"id", idOrNull(IOReportChannelGetChannelID(channel))},
          {"format", formatName(IOReportChannelGetFormat(channel))},
          {"categories", hasType ? Json(categoriesOf(type)) : Json()},
          {"elements", hasType ? Json(elementCountOf(type)) : Json()},
          {"unit", idOrNull(IOReportChannelGetUnit(channel))},
          {"unit_label", orNull(IOReportChannelGetUnitLabel(channel))}};
}

Json statesJson(const plist::Dictionary& channel, bool isDelta) {
  Json states = Json::array();
  const std::int32_t current = IOReportStateGetCurrent(channel);
  const Elements elements = elementsOfType(channel, kFormatState);
  const plist::Array names = stateNames(channel);
  const std::uint64_t total = totalResidency(elements);
  for (std::int32_t state = 0; state < IOReportStateGetCount(channel); ++state) {
    const auto i = static_cast<std::size_t>(state);
    const double duty = dutyCycle(elements, i, total);
    states.push_back(
        {{"id", idOrNull(elements.value(i, kStateID))},
         {"name", orNull(names.at(i).string())},
         {"in_transitions", countOrNull(elements.value(i, kStateInTransitions), isDelta)},
         {"residency", countOrNull(elements.value(i, kStateResidency), isDelta)},
         {"duty_cycle", std::isnan(duty) ? Json() : Json(duty)},
         {"current", state == current}});
  }
  return states;
}

Json bucketsJson(const plist::Dictionary& channel, bool isDelta) {
  Json buckets = Json::array();
  bool hasBounds = true;
  for (std::int32_t i = 0; i < IOReportHistogramGetBucketCount(channel); ++i) {
    std::int64_t lower = 0;
    std::int64_t upper = 0;
    hasBounds =
        hasBounds && IOReportHistogramGetBucketBounds(channel, i, &lower, &upper) == kKernelSuccess;
    buckets.push_back({{"lower", hasBounds ? Json(static_cast<std::uint64_t>(lower)) : Json()},
                       {"upper", hasBounds ? Json(static_cast<std::uint64_t>(upper)) : Json()},
                       {"hits", countOrNull(IOReportHistogramGetBucketHits(channel, i), isDelta)},
                       {"minimum", orNull(IOReportHistogramGetBucketMinValue(channel, i))},
                       {"maximum", orNull(IOReportHistogramGetBucketMaxValue(channel, i))},
                       {"sum", orNull(IOReportHistogramGetBucketSum(channel, i))}});
  }
  return buckets;
}

Json arrayJson(const plist::Dictionary& channel) {
  Json values = Json::array();
  const auto count = static_cast<std::int32_t>(kElementValues *
                                               getRawElements(channel, kFormatSimpleArray).count());
  for (std::int32_t i = 0; i < count; ++i)
    values.push_back(orNull(IOReportArrayGetValueAtIndex(channel, i)));
  return values;
}

Json sampleJson(const plist::Dictionary& channel, bool isDelta) {
  Json json = channelJson(channel);
  const std::uint8_t form = IOReportChannelGetFormat(channel);
  const Elements elements = getRawElements(channel, form);
  // The delta of a simple channel keeps the earlier time, which says nothing about it.
  const bool hasTime = elements && !(isDelta && form == kFormatSimple);
  json["timestamp"] = hasTime ? Json(elements.timestamp(0)) : Json();
  if (form == kFormatSimple) json["value"] = orNull(IOReportSimpleGetIntegerValue(channel));
  if (form == kFormatState) json["states"] = statesJson(channel, isDelta);
  if (form == kFormatHistogram) json["buckets"] = bucketsJson(channel, isDelta);
  if (form == kFormatSimpleArray) json["values"] = arrayJson(channel);
  return json;
}

}  // namespace

void addChannels(JsonList& list, const plist::Dictionary& channels) {
  for (const plist::Dictionary& channel : channelsIn(channels))
    list.add(channelJson(channel));
}

void addSamples(JsonList& list, const plist::Dictionary& samples, bool isDelta) {
  for (const plist::Dictionary& channel : channelsIn(samples))
    list.add(sampleJson(channel, isDelta));
}

}  // namespace tavrel
