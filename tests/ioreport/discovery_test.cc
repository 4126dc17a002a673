#include <gtest/gtest.h>

#include "reporting.h"

namespace tavrel {
namespace {

using namespace reporting;

const Dictionary kMatching{{"IOProviderClass", "Driver"}};
const Array kA{1, 1, "a"};

Dictionary groupOf(const Value& group, const Value& subGroup, const Value& channels) {
  Dictionary entry = aggregateOf(channels);
  entry.set("IOReportGroupName", group);
  entry.set("IOReportSubGroupName", subGroup);
  return entry;
}
Dictionary channelsOf(std::initializer_list<Value> channels) {
  return groupOf("F", {}, Array(channels));
}
const Dictionary kSound = groupOf("G", {}, Array{Array{3, 1, "c"}});

TEST(DiscoveryTest, ReadsLegendsAsFarAsTheyAreSound) {
  const auto legend = [](const Value& entries) { return driverOf("disk", 7, entries); };
  const auto with = [&](const char* key, const Value& value) {
    Dictionary driver = legend(Array{kSound});
    driver.set(key, value);
    return driver;
  };
  const auto publishing = [&](const Value& isPublic) {
    return with("Properties",
                Dictionary{{"IOReportLegend", Array{kSound}}, {"IOReportLegendPublic", isPublic}});
  };
  const std::string kBad = "e00002bc " + kNoText;
  const std::tuple<Dictionary, const char*, std::string> kCases[] = {
      {legend(Array{groupOf("F", "S", Array{kA, Array{2, 1, "b"}}), kSound}), "abc", "none"},
      {legend(Array::create()), "", "none"},
      {legend({}), "", "e00002f0 no legend"},
      {legend("text"), "", "e00002c9 bad legend"},
      // A malformed entry ends the walk; a group that is not an array is skipped.
      {legend(Array{channelsOf({kA}), 5, kSound}), "a", "none"},
      {legend(Array{kSound, groupOf({}, "S", Array{kA}), kSound}), "c", "none"},
      {legend(Array{kSound, groupOf(1, "S", Array{kA}), kSound}), "c", "none"},
      {legend(Array{groupOf(1, 2, Array{kA}), kSound}), "ac", "none"},
      {legend(Array{kSound, groupOf("F", {}, "x"), kSound}), "c", "none"},
      {legend(Array{channelsOf({kA, "x", Array{2, 1, "b"}}), kSound}), "ac", "none"},
      // A channel without id or type fails the driver.
      {legend(Array{kSound, channelsOf({kA, Array::create()})}), "", kBad},
      {legend(Array{channelsOf({Array{1}})}), "", kBad},
      {legend(Array{channelsOf({Array{1, "1"}})}), "", kBad},
      {legend(Array{channelsOf({Array{kNone, 1}})}), "", kBad},
      {legend(Array{channelsOf({Array{1.5, 1}})}), "", kBad},
      {legend(Array{channelsOf({Array{3.0, -1, "x"}, Array{UINT64_MAX, 1, "y"}})}), "xy", "none"},
      {with("RetainCount", 0), "", "e00002c2 invalid driver"},
      {with("RetainCount", 1LL << 32), "c", "none"},
      {with("NameError", 1LL << 32), "", kBad},
      {with("EntryID", {}), "", kBad},
      {publishing({}), "", "none"},
      {publishing(1), "c", "none"}};
  for (const auto& [driver, names, text] : kCases) {
    Drivers drivers(Array{driver});
    Failure failure;
    const auto service = drivers.registry.firstService("Driver");
    EXPECT_EQ(namesIn(IOReportCopyChannelsForDriver(service.get(), 0, failure)), names);
    EXPECT_EQ(failure.text(), text);
  }
  EXPECT_FALSE(IOReportCopyChannelsForDriver(nullptr, 0, nullptr));

  // Drivers that fail are printed on request; the others are still found.
  const Array services{driverOf("bad", 17, Array{channelsOf({Array{"x", 1}})}), publishing(1),
                       driverOf("worse", 18, 5), legend(Array{kSound})};
  const std::string kPrinted = "bad <id 0x11>: " + kNoText + "\nworse <id 0x12>: bad legend\n";
  for (const std::int32_t options : {1, kOptionPrintErrors | 1}) {
    Drivers drivers(services);
    Failure failure;
    EXPECT_EQ(namesIn(IOReportCopyAllChannels(drivers.registry, drivers.streams, options, failure)),
              "c");
    EXPECT_EQ(drivers.streams.error, options < 0 ? kPrinted : "");
    EXPECT_EQ(failure.text(), "none");
  }
}

TEST(DiscoveryTest, FilesChannelsByDriverGroupAndSubgroup) {
  Drivers drivers(Array{driverOf("disk", 7, Array{groupOf("G", "S", Array{Array{1, 1}})})});
  Dictionary channel = channelOf(7, 1, 1);
  channel.set("IOReportGroupName", "G");
  channel.set("IOReportSubGroupName", "S");
  const auto in = [](const char* container, const char* name, const Dictionary& level) {
    return Dictionary{{container, Dictionary{{name, level}}}};
  };
  const Dictionary flat = aggregateOf({channel});
  const Dictionary group = in("IOReportChannelGroups", "G", in("IOReportChannelGroups", "S", flat));
  const Dictionary kFiled[] = {flat, in("IOReportDrivers", "disk <id 0x7>", flat), group,
                               in("IOReportDrivers", "disk <id 0x7>", group)};
  for (const std::int32_t options : {0, 1, 2, 3}) {
    Dictionary all = IOReportCopyAllChannels(drivers.registry, drivers.streams, options, nullptr);
    EXPECT_EQ(_getAggregateOpts(all), options);
    all.remove("QueryOpts");
    EXPECT_EQ(all, kFiled[options]);
  }

  const Dictionary plain = channelOf(7, 1, 1);
  const Dictionary nameless{{"LegendChannel", Array{1, 1}}, {"IOReportGroupName", "G"}};
  const Dictionary empty = Dictionary::create();
  const Dictionary noGroups{{"IOReportChannelGroups", Dictionary{{"G", 1}}}};
  using Case = std::tuple<Dictionary, Dictionary, std::int32_t, KernelReturn>;
  for (const auto& [aggregate, added, options, code] :
       {Case({}, plain, 0, kKernelBadArgument), Case(empty, {}, 0, kKernelBadArgument),
        Case(aggregateOf("text"), plain, 0, kKernelError),
        Case({{"IOReportDrivers", 1}}, plain, 1, kKernelError),
        Case(empty, nameless, 1, kKernelError), Case(noGroups, nameless, 2, kKernelError),
        // The table of a group is made; without a group, the channel is at the top level.
        Case(in("IOReportChannelGroups", "G", {}), nameless, 2, kKernelSuccess),
        Case(empty, plain, 2, kKernelSuccess)}) {
    Failure failure;
    EXPECT_EQ(_addChannel(aggregate, added, options, failure), code);
    EXPECT_EQ(failure.text(), code ? format("%x _addChannel() failed", code) : "none");
  }
  Failure failure;
  const std::uint64_t noID = 1ULL << 63;
  IOReportAddChannelDescription(empty, 7, "disk", noID, 1, {}, {}, {}, {}, failure);
  EXPECT_EQ(failure.text(), "e00002bc couldn't create channel");
}

TEST(DiscoveryTest, CopiesFromMatchingDriversAllOrNone) {
  const Dictionary disk = driverOf("disk", 7, Array{kSound});
  const Dictionary bare{{"Class", "Driver"}};
  const Dictionary found = channelOf(7, 0x41, 0);
  using Case = std::tuple<Array, Dictionary, std::string, std::string>;
  for (const auto& [services, matching, names, text] :
       {Case({disk, disk}, kMatching, "cc", "none"),
        Case({disk}, {}, "", "e00002c2 no matching dict"),
        Case({disk, driverOf("e", 8, {})}, kMatching, "", "e00002f0 no legend")}) {
    Drivers drivers(services);
    Failure failure;
    const auto copy = IOReportCopyChannelsForDrivers(drivers.registry, matching, 3, failure);
    EXPECT_EQ(namesIn(copy), names);
    EXPECT_EQ(failure.text(), text);
  }
  const std::tuple<Array, Dictionary, std::uint64_t, Array, std::string> kByID[] = {
      {{disk, disk}, kMatching, 0x41, {found, found}, "none"},
      {{disk}, kMatching, 1ULL << 63, {}, "e00002bc couldn't create channel"},
      {{bare}, kMatching, 1, {}, "e00002f0 error extracting driver info"},
      {{disk}, {}, 1, {}, "none"}};
  for (const auto& [services, matching, id, channels, text] : kByID) {
    Drivers drivers(services);
    Failure failure;
    const auto copy = IOReportCopyChannelsWithID(drivers.registry, matching, id, failure);
    EXPECT_EQ(copy.array("IOReportChannels"), channels);
    EXPECT_EQ(failure.text(), text);
  }
}

TEST(DiscoveryTest, StopsWalksThatFailOrThatTheRegistryChangedUnder) {
  Drivers drivers(Array{driverOf("X", 0x1234, {}), driverOf("Y", 8, {})});
  std::string seen;
  const auto walk = [&](KernelReturn answer, int generation) {
    return iterateMatchingServices(drivers.registry, kMatching, [&](DriverService& service) {
      seen += *IOReportCopyDriverName(service) + ", ";
      drivers.recording.set("Generation", generation);
      return answer;
    });
  };
  EXPECT_EQ(walk(0, 0), 0U);
  EXPECT_EQ(walk(5, 0), 5U);
  EXPECT_EQ(seen, "X <id 0x1234>, Y <id 0x8>, X <id 0x1234>, ");
  EXPECT_EQ(walk(0, 2), kKernelAborted);
  fakes::FakeProcess process;
  EXPECT_EQ(IOReportCopyCurrentProcessName(process), "tavrel <pid 211>");

  const ErrorObject bare{.code = 5, .failureReason = {}};
  const std::tuple<std::int32_t, Text, std::optional<ErrorObject>, std::string_view> kPrints[] = {
      {INT32_MAX, "f", createCFErr(1, "why"), ""},
      {INT32_MIN, "f", createCFErr(1, "why"), "f: why\n"},
      {-1, {}, bare, "<unknown> function: KernelReturn error 0x5\n"},
      {-1, "f", createCFErr(1, "\xff"), "f: <unknown> error\n"}};  // not UTF-8, so no error object
  for (const auto& [options, name, error, printed] : kPrints) {
    fakes::FakeStreams streams;
    iorErrLog(streams, options, name, error);
    EXPECT_EQ(streams.error, printed);
  }
}

}  // namespace
}  // namespace tavrel
