#pragma once

#include <array>
#include <string>
#include <vector>

#include "ioreport/elements.h"
#include "ioreport/ioreport.h"
#include "platform/linux/recorded/recorded_registry.h"
#include "tests/fakes/fake_platform.h"

namespace tavrel::reporting {

using plist::Array;
using plist::Dictionary;
using plist::Value;
using Text = std::optional<std::string_view>;

inline constexpr std::int64_t kNone = kInvalidValue;
inline const std::string kNoText = "createCFErr() passed a NULL string!";

constexpr std::uint64_t typeOf(std::uint64_t format, std::uint64_t count,
                               std::uint64_t categories = 0) {
  return format | categories << 16 | count << 32;
}

inline void append(std::vector<std::byte>& bytes, std::initializer_list<std::uint64_t> words) {
  for (const std::uint64_t word : words) {
    bytes.resize(bytes.size() + 8);
    storeLittle64(bytes, bytes.size() - 8, word);
  }
}

struct Element {
  std::array<std::int64_t, 4> values{};
  std::uint64_t time = 0;
};

using Sample = std::vector<Element>;

/// A group of elements of driver 7, as stored in a buffer.
inline std::vector<std::byte> groupOf(std::uint64_t channelID, std::uint64_t type,
                                      const Sample& elements) {
  std::vector<std::byte> bytes;
  for (const Element& element : elements) {
    append(bytes, {7, channelID, type, element.time});
    for (const std::int64_t value : element.values)
      append(bytes, {static_cast<std::uint64_t>(value)});
  }
  return bytes;
}

inline Dictionary channelOf(std::int64_t driverID, std::int64_t channelID, std::uint64_t type) {
  return {{"DriverID", driverID},
          {"DriverName", "disk <id 0x7>"},
          {"LegendChannel", Array{channelID, static_cast<std::int64_t>(type)}}};
}

/// A sampled channel with as many elements as its type says.
inline Dictionary sampleOf(std::uint64_t format, const Sample& elements, std::int64_t channelID = 9,
                           const Dictionary& info = {}) {
  const std::uint64_t type = typeOf(format, elements.size());
  Dictionary channel = channelOf(7, channelID, type);
  channel.set("IOReportChannelInfo", info);
  const auto id = static_cast<std::uint64_t>(channelID);
  channel.set("RawElements", plist::Data(groupOf(id, type, elements)));
  return channel;
}

inline Dictionary aggregateOf(const Value& channels) {
  return {{"IOReportChannels", channels}};
}
inline Dictionary aggregateOf(std::initializer_list<Value> channels) {
  return aggregateOf(Value(Array(channels)));
}
inline Dictionary channelIn(const Dictionary& aggregate, std::size_t index = 0) {
  return aggregate.array("IOReportChannels").at(index).dictionary();
}

inline Dictionary driverOf(const char* name, std::int64_t entryID, const Value& legend) {
  const Dictionary properties{{"IOReportLegendPublic", true}, {"IOReportLegend", legend}};
  return {{"Class", "Driver"}, {"Name", name}, {"EntryID", entryID}, {"Properties", properties}};
}

struct Drivers {
  explicit Drivers(const Array& services, const Value& hub = {})
      : recording{{"Services", services}, {"Hub", hub}} {}
  Dictionary recording;
  fakes::FakeLog log;
  fakes::FakeStreams streams;
  RecordedRegistry registry{recording, log};
};

/// An error as "CODE TEXT", or "none".
struct Failure {
  std::optional<ErrorObject> error;
  operator ErrorOut() { return &error; }
  std::string text() const {
    return error ? format("%x %s", error->code, error->failureReason.value_or("-")) : "none";
  }
};

/// Names of an aggregate's channels in the order of a walk.
inline std::string namesIn(const Dictionary& aggregate) {
  std::string names;
  IOReportIterate(aggregate, [&](const Dictionary& channel) {
    names += IOReportChannelGetChannelName(channel).value_or("?");
    return kIterateContinue;
  });
  return names;
}

}  // namespace tavrel::reporting
