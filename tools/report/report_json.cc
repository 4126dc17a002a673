#include "tools/report/report_json.h"

#include <algorithm>
#include <optional>
#include <string_view>

#include "ioreport/elements.h"
#include "ioreport/ioreport.h"
#include "tools/report/report_quantity.h"
#include "tools/report/report_selection.h"

namespace tavrel {
namespace {

void textOrNull(JsonWriter& json, std::optional<std::string_view> text) {
  if (text) return json.text(*text);
  json.null();
}
void valueOrNull(JsonWriter& json, std::int64_t value) {
  if (value == kInvalidValue) return json.null();
  json.integer(value);
}
void wordOrNull(JsonWriter& json, std::int64_t word) {
  if (word == kInvalidValue) return json.null();
  json.integer(static_cast<std::uint64_t>(word));
}
// Counts are unsigned, but their differences may be negative.
void countOrNull(JsonWriter& json, std::int64_t count, bool isDelta) {
  if (isDelta) return valueOrNull(json, count);
  wordOrNull(json, count);
}
// Every word is a valid bound when the array has bounds.
void boundOrNull(JsonWriter& json, std::int64_t bound, bool hasBounds) {
  if (hasBounds) return json.integer(static_cast<std::uint64_t>(bound));
  json.null();
}

void writeChannel(JsonWriter& json, const plist::Dictionary& channel) {
  std::uint64_t type = 0;
  const bool hasType = getChannelType(channel, type) == kKernelSuccess;
  textOrNull(json.member("driver"), IOReportChannelGetDriverName(channel));
  wordOrNull(json.member("driver_id"), IOReportChannelGetDriverID(channel));
  textOrNull(json.member("group"), IOReportChannelGetGroup(channel));
  textOrNull(json.member("subgroup"), IOReportChannelGetSubGroup(channel));
  textOrNull(json.member("name"), IOReportChannelGetChannelName(channel));
  wordOrNull(json.member("id"), IOReportChannelGetChannelID(channel));
  json.member("format").text(formatName(hasType ? formatOf(type) : kFormatUnknown));
  wordOrNull(json.member("categories"), hasType ? categoriesOf(type) : kInvalidValue);
  wordOrNull(json.member("elements"), hasType ? elementCountOf(type) : kInvalidValue);
  wordOrNull(json.member("unit"), IOReportChannelGetUnit(channel));
  textOrNull(json.member("unit_label"), IOReportChannelGetUnitLabel(channel));
}

void writeConverted(JsonWriter& json, const plist::Dictionary& channel, std::int64_t value) {
  const auto converted = convertedValue(channel, value);
  if (!converted) return json.null();
  json.beginObject();
  json.member("value").real(converted->value);
  json.member("unit").text(converted->unit);
  json.endObject();
}

void writeStates(JsonWriter& json, const plist::Dictionary& channel, bool isDelta) {
  json.beginArray();
  const std::int32_t current = IOReportStateGetCurrent(channel);
  const std::int32_t count = IOReportStateGetCount(channel);
  const Elements elements = elementsOfType(channel, kFormatState);
  const plist::Array names = stateNames(channel);
  const std::uint64_t total = residencyToShare(elements, isDelta);
  for (std::int32_t state = 0; state < count; ++state) {
    const auto i = static_cast<std::size_t>(state);
    const double duty = dutyCycle(elements, i, total);
    json.element().beginObject();
    wordOrNull(json.member("id"), elements.value(i, kStateID));
    textOrNull(json.member("name"), names.at(i).string());
    countOrNull(json.member("in_transitions"), elements.value(i, kStateInTransitions), isDelta);
    const std::int64_t residency = elements.value(i, kStateResidency);
    countOrNull(json.member("residency"), residency, isDelta);
    // A negative count has no meaningful conversion.
    writeConverted(json.member("converted"), channel, residency < 0 ? kInvalidValue : residency);
    json.member("duty_cycle").real(duty);
    json.member("current").boolean(state == current);
    json.endObject();
  }
  json.endArray();
}

void writeMean(JsonWriter& json, std::int64_t hits, std::int64_t sum) {
  if (hits <= 0 || sum == kInvalidValue) return json.null();
  json.real(static_cast<double>(sum) / static_cast<double>(hits));
}

void writeBuckets(JsonWriter& json, const plist::Dictionary& channel, bool isDelta) {
  json.beginArray();
  const std::int32_t count = IOReportHistogramGetBucketCount(channel);
  const Elements elements = elementsOfType(channel, kFormatHistogram);
  bool hasBounds = true;
  for (std::int32_t bucket = 0; bucket < count; ++bucket) {
    const auto i = static_cast<std::size_t>(bucket);
    std::int64_t lower = 0;
    std::int64_t upper = 0;
    hasBounds = hasBounds &&
                IOReportHistogramGetBucketBounds(channel, bucket, &lower, &upper) == kKernelSuccess;
    json.element().beginObject();
    boundOrNull(json.member("lower"), lower, hasBounds);
    boundOrNull(json.member("upper"), upper, hasBounds);
    const std::int64_t hits = elements.value(i, kBucketHits);
    const std::int64_t sum = elements.value(i, kBucketSum);
    countOrNull(json.member("hits"), hits, isDelta);
    valueOrNull(json.member("minimum"), elements.value(i, kBucketMinimum));
    valueOrNull(json.member("maximum"), elements.value(i, kBucketMaximum));
    valueOrNull(json.member("sum"), sum);
    writeMean(json.member("mean"), hits, sum);
    json.endObject();
  }
  json.endArray();
}

void writeArray(JsonWriter& json, const plist::Dictionary& channel) {
  json.beginArray();
  const Elements elements = elementsOfType(channel, kFormatSimpleArray);
  const std::size_t count = getRawElements(channel, kFormatSimpleArray).count();
  for (std::size_t element = 0; element < count; ++element) {
    for (std::size_t i = 0; i < kElementValues; ++i)
      valueOrNull(json.element(), elements.value(element, i));
  }
  json.endArray();
}

void writeSample(JsonWriter& json, const plist::Dictionary& channel, bool isDelta) {
  writeChannel(json, channel);
  const std::uint8_t form = IOReportChannelGetFormat(channel);
  const Elements elements = getRawElements(channel, form);
  json.member("timestamp");
  std::uint64_t timestamp = 0;
  for (std::size_t i = 0; i < elements.count(); ++i)
    timestamp = std::max(timestamp, elements.timestamp(i));
  // The delta of a simple channel keeps the earlier time, which says nothing about the delta. Of
  // live states only the current one has a time.
  if (timestamp != 0 && !(isDelta && form == kFormatSimple)) {
    json.integer(timestamp);
  } else {
    json.null();
  }
  if (form == kFormatSimple) {
    const std::int64_t value = IOReportSimpleGetIntegerValue(channel);
    valueOrNull(json.member("value"), value);
    writeConverted(json.member("converted"), channel, value);
  } else if (form == kFormatState) {
    writeStates(json.member("states"), channel, isDelta);
  } else if (form == kFormatHistogram) {
    writeBuckets(json.member("buckets"), channel, isDelta);
  } else if (form == kFormatSimpleArray) {
    writeArray(json.member("values"), channel);
  }
}

// All elements share one writer and so its buffer.
template <class Write>
void addEach(JsonList& list, const plist::Dictionary& channels, const Write& write) {
  JsonWriter json = list.elementWriter();
  for (const plist::Dictionary& channel : channelsIn(channels)) {
    json.clear();
    json.beginObject();
    write(json, channel);
    json.endObject();
    list.addText(json.text());
  }
}

}  // namespace

void addChannels(JsonList& list, const plist::Dictionary& channels) {
  addEach(list, channels, writeChannel);
}

void addSamples(JsonList& list, const plist::Dictionary& samples, bool isDelta) {
  addEach(list, samples, [isDelta](JsonWriter& json, const plist::Dictionary& channel) {
    writeSample(json, channel, isDelta);
  });
}

}  // namespace tavrel
