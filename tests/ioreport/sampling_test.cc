#include <gtest/gtest.h>
#include <memory_resource>
#include <sstream>

#include "reporting.h"

namespace tavrel {
namespace {

using namespace reporting;

plist::Data simple(std::uint64_t id, std::int64_t value) {
  return plist::Data(groupOf(id, typeOf(1, 1, 5), {{{value}}}));
}
Dictionary hubChannel(std::uint64_t id, const Value& elements) {
  return {{"DriverID", 7}, {"ChannelID", id}, {"Elements", elements}};
}

const Dictionary kWanted = aggregateOf(
    {channelOf(7, 'A', typeOf(1, 1, 5)), channelOf(7, 'B', typeOf(1, 1, 5)), channelOf(7, 'C', 0)});
const Dictionary kHub{{"Channels", Array{hubChannel('A', Array{simple('A', 10), simple('A', 25)}),
                                         hubChannel('C', simple('C', 3))}}};

TEST(SubscriptionTest, SamplesWhatTheHubHolds) {
  Drivers drivers({}, kHub);
  Failure failure;
  Dictionary subscribed;
  const auto subscription =
      IOReportCreateSubscription(drivers.registry, nullptr, kWanted, &subscribed, 0, failure);
  ASSERT_TRUE(subscription) << failure.text();
  EXPECT_EQ(subscribed, kWanted);
  const auto valueOf = [](const Dictionary& samples, std::size_t index) {
    return IOReportSimpleGetIntegerValue(channelIn(samples, index));
  };
  const Dictionary first = IOReportCreateSamples(subscription.get(), subscribed, failure);
  const Dictionary second = IOReportCreateSamples(subscription.get(), subscribed, failure);
  EXPECT_EQ(namesIn(first), "AC");  // the hub does not hold B
  EXPECT_EQ(valueOf(second, 0), 25);
  const Dictionary delta = IOReportCreateSamplesDelta(first, second, failure);
  EXPECT_EQ(valueOf(delta, 0), 15);
  EXPECT_EQ(valueOf(delta, 1), 0);
  // The type of C arrived with its elements, only in the samples.
  std::uint64_t type = 0;
  EXPECT_EQ(getChannelType(channelIn(first, 1), type), kKernelSuccess);
  EXPECT_EQ(type, typeOf(1, 1, 5));
  EXPECT_EQ(IOReportChannelGetFormat(channelIn(subscribed, 2)), 0);
  const Dictionary noType{{"DriverID", 7}, {"LegendChannel", Array{65}}};
  const auto typed =
      IOReportCreateSamplesRaw(aggregateOf({noType}), simple('A', 1).bytes(), failure);
  EXPECT_EQ(valueOf(typed, 0), 1);
  EXPECT_EQ(failure.text(), "none");
  EXPECT_FALSE(IOReportCreateSamples(nullptr, subscribed, failure));
  EXPECT_EQ(failure.text(), "e00002c2 " + kNoText);
}

TEST(SubscriptionTest, FailsAtEachStepWithItsOwnWords) {
  const auto hubWith = [](const char* key, const Value& value) {
    Dictionary hub = plist::mutableCopy(kHub);
    hub.set(key, value);
    return hub;
  };
  const auto refusing = [&](const char* method) {
    return hubWith("MethodErrors", Dictionary{{method, 17}});
  };
  const Dictionary noType{{"DriverID", 1}, {"LegendChannel", Array{1}}};
  const std::string kNoList = "e00002bd createInterestList() failed";
  const std::tuple<Dictionary, Value, std::string> kCases[] = {
      {{}, kHub, "e00002c2 bad arguments"},
      {aggregateOf({5}), kHub, "e00002c2 iteration error"},
      {aggregateOf(Array::create()), kHub, "e00002c2 no channels"},
      {aggregateOf({channelOf(kNone, 1, 1)}), kHub, kNoList},
      {aggregateOf({channelOf(7, kNone, 1)}), kHub, kNoList},
      {aggregateOf({noType}), kHub, kNoList},
      {kWanted, {}, "e00002f0 " + kNoText},
      {kWanted, hubWith("OpenError", 17), "11 Could not open IOReportHub"},
      {kWanted, refusing("0"), "11 kIOReportUserClientOpen failed"},
      {kWanted, refusing("2"), "11 kIOReportUserClientConfigureInterests failed"},
      {kWanted, hubWith("MapError", 17), "11 IOConnectMapMemory() failed"}};
  Failure failure;
  Dictionary subscribed;
  const auto subscribe = [&](Drivers& drivers, const Dictionary& desired,
                             std::pmr::memory_resource* memory = nullptr) {
    return IOReportCreateSubscription(drivers.registry, memory, desired, &subscribed, 0, failure);
  };
  for (const auto& [desired, hub, text] : kCases) {
    Drivers drivers({}, hub);
    EXPECT_FALSE(subscribe(drivers, desired));
    EXPECT_EQ(failure.text(), text);
    EXPECT_FALSE(subscribed);
  }
  Drivers drivers({}, refusing("3"));
  EXPECT_FALSE(subscribe(drivers, kWanted, std::pmr::null_memory_resource()));
  EXPECT_EQ(failure.text(), "e00002bd " + kNoText);
  const auto subscription = subscribe(drivers, kWanted);
  ASSERT_TRUE(subscription);
  EXPECT_FALSE(IOReportCreateSamples(subscription.get(), subscribed, failure));
  EXPECT_EQ(failure.text(), "11 " + kNoText);
  for (const std::int32_t count : {2, 4, -1, 0x555554E})  // there are 3
    EXPECT_FALSE(createInterestList(kWanted, count)) << count;
}

TEST(SamplesTest, TakesTheFirstWholeGroupOfEachChannel) {
  // Elements as CHANNEL and COUNT, in lower case if they are another driver's; then the channels
  // that were found, each with the index of its first element and the number of its elements.
  const std::pair<std::string, std::string> kCases[] = {
      {"A1 B1 C1", "A0+1 B1+1 C2+1 "}, {"A2 B1 C1", "A0+2 C2+1 "},
      {"B3 A1 C1", "B0+3 "},           {"B4 A1 C1", ""},
      {"A1 C65535 B1", "A0+1 "},       {"C1 B2 A1 A1", "A3+1 B1+2 C0+1 "},
      {"A1 A2 A1", "A0+1 "},           {"c2 C1 A1", "A2+1 "},
      {"a1 A1 c2 C1", "A1+1 "},        {"X1 Y2 A1 B2 A1", "B3+2 "}};
  for (const auto& [elements, expected] : kCases) {
    std::vector<std::byte> buffer;
    std::istringstream words(elements);
    char channel = 0;
    std::uint64_t count = 0;
    for (std::uint64_t position = 0; words >> channel >> count; ++position) {
      const std::uint64_t driver = channel > 'Z' ? 8 : 7;
      const auto id = static_cast<std::uint64_t>(std::toupper(channel));
      append(buffer, {driver, id, typeOf(1, count), 0, position, 0, 0, 0});
    }
    buffer.resize(buffer.size() + 63);
    const Dictionary samples = IOReportCreateSamplesRaw(kWanted, buffer, nullptr);
    std::string found;
    for (const Value& sample : samples.array("IOReportChannels")) {
      const Elements raw = getRawElements(sample.dictionary(), 1);
      found +=
          format("%c%lld+%zu ", static_cast<char>(raw.channelID(0)), raw.value(0, 0), raw.count());
    }
    EXPECT_EQ(found, expected) << elements;
  }
}

TEST(SamplesTest, TellsWhyThereAreNone) {
  const auto one = groupOf('A', typeOf(1, 1), {{}});
  auto ended = one;
  append(ended, {7, 'B', typeOf(1, 0), 0, 0, 0, 0, 0});
  const ByteSpan empty = ByteSpan(ended).subspan(64);
  const auto other = groupOf('X', typeOf(1, 1), {{}});
  const Dictionary onlyA = aggregateOf({channelIn(kWanted)});
  const std::string kFailure = " couldn't create samples";
  const std::tuple<Dictionary, ByteSpan, std::string> kCases[] = {
      {{}, one, "e00002c2" + kFailure},
      {kWanted, {}, "e00002c2" + kFailure},
      {kWanted, ByteSpan(one).first(63), "e00002c2" + kFailure},
      {kWanted, empty, "e00002bc" + kFailure},
      {kWanted, ended, "e00002bc" + kFailure},
      {onlyA, ended, "none"},
      {aggregateOf({channelIn(kWanted, 1), 5}), one, "e00002f0" + kFailure},
      {kWanted, other, "none"}};  // no channel at all
  for (const auto& [channels, buffer, text] : kCases) {
    Failure failure;
    IOReportCreateSamplesRaw(channels, buffer, failure);
    EXPECT_EQ(failure.text(), text);
  }
}

TEST(DeltaTest, SubtractsByFormat) {
  using Case = std::tuple<std::uint64_t, Sample, Sample, std::optional<Sample>>;
  for (const auto& [format, previousElements, currentElements, expected] :
       {Case(1, {{{10}}}, {{{25}}}, Sample{{{15}}}), Case(1, {{{25}}}, {{{10}}}, Sample{{{-15}}}),
        Case(1, {{{-2}}}, {{{INT64_MAX}}}, Sample{{{INT64_MIN + 1}}}),
        Case(2, {{{5, 1, 2, 3}, 1}}, {{{7, 10, -1, 4}, 2}}, Sample{{{7, 9, -3, 4}, 2}}),
        Case(3, {{{5, 1, 2, 3}}}, {{{5, 7, 8, kNone}}}, Sample{{{0, 7, 8, kNone}}}),
        Case(3, {{{0, 1, 2, kNone}}}, {{{3, 7, 8, 9}}}, Sample{{{3, 7, 8, 9}}}),
        Case(3, {{{4, 1, 2, 30}}}, {{{6, 7, 8, 9}}}, Sample{{{2, 7, 8, -21}}}),
        Case(4, {{{1, kNone, 7, kNone}}}, {{{5, 7, kNone, kNone}}}, Sample{{{4, 7, 7, kNone}}}),
        // No delta.
        Case(1, {{{kNone}}}, {{{1}}}, {}), Case(1, {{{1}}}, {{{kNone}}}, {}),
        Case(1, {{}, {}}, {{}, {}}, {}), Case(2, {{{5, kNone, 2}}}, {{{5, 1, 2}}}, {}),
        Case(2, {{}, {{5, 1, 2}}}, {{}, {{5, 1, kNone}}}, {}), Case(3, {{{kNone}}}, {{{1}}}, {}),
        Case(3, {{{1}}}, {{{kNone}}}, {}), Case(3, {{{1, 0, 0, 5}}}, {{{2, 0, 0, kNone}}}, {}),
        Case(3, {{{1, 0, 0, kNone}}}, {{{2, 0, 0, 5}}}, {})}) {
    const Dictionary previous = sampleOf(format, previousElements);
    const Dictionary current = sampleOf(format, currentElements);
    const Value before = plist::deepCopy(Array{previous, current});
    Failure failure;
    const Dictionary delta = IOReportSampleCreateDelta(previous, current, failure);
    const Dictionary deltas =
        IOReportCreateSamplesDelta(aggregateOf({previous}), aggregateOf({current}), nullptr);
    EXPECT_EQ(Value(Array{previous, current}), before);
    ASSERT_EQ(static_cast<bool>(delta), expected.has_value());
    ASSERT_EQ(static_cast<bool>(deltas), expected.has_value());
    EXPECT_EQ(failure.text(), delta ? "none" : (format == 1 ? "e00002bc " : "1 ") + kNoText);
    if (!expected) continue;
    EXPECT_EQ(delta.get("RawElements"), sampleOf(format, *expected).get("RawElements"));
    // For a simple channel, only the first value is a value.
    const Elements paired = getRawElements(channelIn(deltas), static_cast<std::uint8_t>(format));
    for (std::size_t i = 0; i < (format == 1 ? 1 : 4); ++i)
      EXPECT_EQ(paired.value(0, i), expected->front().values.at(i));
    // The result may be the current sample itself.
    EXPECT_EQ(computeDelta(previous, current, current, nullptr), kKernelSuccess);
    EXPECT_EQ(getRawElements(current, static_cast<std::uint8_t>(format)).value(0, 0),
              expected->front().values[0]);
  }
}

TEST(DeltaTest, RefusesWhatItCannotSubtract) {
  const Dictionary simple1 = sampleOf(1, {{}});
  const Dictionary unknown = sampleOf(5, {{}});
  const std::tuple<Dictionary, Dictionary, std::string> kCases[] = {
      {simple1, sampleOf(4, {{}}), "e00002c2 mismatched formats"},
      {unknown, unknown, "e00002e6 unknown report format"},
      {sampleOf(0, {{}}), simple1, "e00002c2 " + kNoText},
      {{}, simple1, "e00002c2 " + kNoText},
      {simple1, {}, "e00002c2 " + kNoText},
      {channelOf(7, 9, typeOf(2, 1)), sampleOf(2, {{}}), "1 " + kNoText},
      {sampleOf(2, {{}}), sampleOf(2, {{}, {}}), "1 " + kNoText},
      {sampleOf(4, {{}, {}}), sampleOf(4, {{}}), "1 " + kNoText}};
  for (const auto& [previous, current, text] : kCases) {
    Failure failure;
    EXPECT_FALSE(IOReportSampleCreateDelta(previous, current, failure));
    EXPECT_EQ(failure.text(), text);
  }
  // Among whole samples, a channel without a match keeps its values.
  const Dictionary alone = aggregateOf({sampleOf(1, {{{12}}})});
  EXPECT_EQ(IOReportCreateSamplesDelta(aggregateOf(Array::create()), alone, nullptr), alone);
}

}  // namespace
}  // namespace tavrel
