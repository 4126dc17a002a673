#include <algorithm>
#include <cmath>
#include <gtest/gtest.h>
#include <unistd.h>

#include "platform/linux/process/linux_descriptor_writer.h"
#include "reporting.h"

namespace tavrel {
namespace {

using namespace reporting;
using namespace std::string_literals;

// What the accessors read: for a simple channel and an array at -1 to 8, then counts, extremes and
// the current state, and the values of buckets and states at -1 to 3; "-" for none.
std::string readingsOf(const Dictionary& channel) {
  const auto shown = [](std::int64_t value) {
    return value == kNone ? "-" : format("%lld", value);
  };
  std::string text = shown(IOReportSimpleGetIntegerValue(channel)) + " |";
  for (std::int32_t i = -1; i < 9; ++i)
    text += shown(IOReportArrayGetValueAtIndex(channel, i));
  text += format("| %d %s %s", IOReportHistogramGetBucketCount(channel),
                 shown(IOReportHistogramGetMinValue(channel)),
                 shown(IOReportHistogramGetMaxValue(channel)));
  for (const auto read :
       {IOReportHistogramGetBucketHits, IOReportHistogramGetBucketMinValue,
        IOReportHistogramGetBucketMaxValue, IOReportHistogramGetBucketSum,
        IOReportStateGetIDForIndex, IOReportStateGetInTransitions, IOReportStateGetResidency}) {
    if (read == IOReportStateGetIDForIndex) {
      text += format(" | %d %d %d", IOReportStateGetCount(channel),
                     IOReportStateGetCurrent(channel), IOReportStateGetIndexForID(channel, 5));
    }
    text += ' ';
    for (std::int32_t i = -1; i < 4; ++i)
      text += shown(read(channel, i));
  }
  return text;
}

TEST(ValuesTest, ReadsWhatIsOfItsFormatAndThere) {
  const auto typed = [](const Dictionary& sample, std::uint64_t type) {
    setChannelType(sample, type);
    return sample;
  };
  Dictionary brief = sampleOf(1, {{}});
  brief.set("RawElements", plist::Data(brief.data("RawElements").bytes().first(63)));
  const Sample four{{{0, 1, 2, 3}}, {{4, 5, 6, 7}}, {{8, 9, 10, 11}}, {{0, 12, 13, 14}}};
  const Sample states{{{5, 10, 1}, 5}, {{6, 11, 3}, 9}, {{5, 12, 0}, 9}};
  const std::string kNoArray = "- |----------| ";
  const std::string kNoBuckets = " - - ----- ----- ----- ----- | ";
  const std::string kNoStates = "-1 -1 -1 ----- ----- -----";
  const std::string kNothing = kNoArray + "-1" + kNoBuckets + kNoStates;
  const std::pair<Dictionary, std::string> kCases[] = {
      {{}, kNothing},
      {brief, kNothing},
      {sampleOf(1, {{}, {}}), kNothing},
      {typed(sampleOf(1, {{}}), typeOf(4, 1)), kNothing},
      // The type's count matters only for histograms and states.
      {typed(sampleOf(1, {{{-5}}}), typeOf(1, 9)), "-5" + kNothing.substr(1)},
      {sampleOf(4, {{{10, 11, 12, 13}}, {{14, 15, 16, 17}}}),
       "- |-1011121314151617-| -1" + kNoBuckets + kNoStates},
      {sampleOf(3, four), kNoArray + "4 5 10 -0480 -15912 -261013 -371114 | " + kNoStates},
      {typed(sampleOf(3, four), typeOf(3, 5)), kNoArray + "5" + kNoBuckets + kNoStates},
      {sampleOf(3, {{}, {}}), kNoArray + "2 - - -00-- -00-- -00-- -00-- | " + kNoStates},
      {sampleOf(2, states), kNoArray + "-1" + kNoBuckets + "3 1 2 -565- -101112- -130-"},
      {typed(sampleOf(2, states), typeOf(2, 2)),
       kNoArray + "-1" + kNoBuckets + "2" + kNoStates.substr(2)},
      {sampleOf(2, {{}}), kNoArray + "-1" + kNoBuckets + "1 -1 -1 -0--- -0--- -0---"}};
  for (const auto& [channel, readings] : kCases)
    EXPECT_EQ(readingsOf(channel), readings);

  std::int64_t unit = 3;
  IOReportSimpleGetIntegerValue(brief, &unit);
  EXPECT_EQ(unit, 3);
  IOReportSimpleGetIntegerValue(sampleOf(1, {{}}, 9, IOReportCreateUnitInfo(77)), &unit);
  EXPECT_EQ(unit, 77);
  for (const std::int32_t index : {INT32_MAX, INT32_MIN})
    EXPECT_EQ(IOReportArrayGetValueAtIndex(sampleOf(4, {{}}), index), kNone);
}

TEST(ValuesTest, ComparesResidenciesUnsigned) {
  const Dictionary states = sampleOf(2, {{{0, 0, kNone}, 1}, {{0, 0, INT64_MAX}, UINT64_MAX}});
  EXPECT_EQ(IOReportStateGetDutyCycle(states, 0), 0x1p63 / (0x1p64 - 1));
  EXPECT_EQ(IOReportStateGetDutyCycle(sampleOf(2, {{{0, 0, 1}}, {{0, 0, 3}}}), 0), 0.25);
  EXPECT_EQ(IOReportStateGetCurrent(states), 1);
  for (const std::int32_t index : {2, -1})
    EXPECT_TRUE(std::isnan(IOReportStateGetDutyCycle(states, index)));
  EXPECT_TRUE(std::isnan(IOReportStateGetDutyCycle(sampleOf(2, {{}, {}}), 0)));
}

TEST(ValuesTest, CountsElementsIn16Bits) {
  const Dictionary most = sampleOf(2, Sample(65535, Element{{1, 2, 3, 4}, 1}));
  EXPECT_EQ(IOReportStateGetResidency(most, 65534), 3);
  EXPECT_EQ(IOReportStateGetDutyCycle(most, 0), 1.0 / 65535);
  const Dictionary tooMany = sampleOf(2, Sample(65536));
  setChannelType(tooMany, typeOf(2, 0));
  EXPECT_TRUE(getRawElements(tooMany, 2));
  EXPECT_EQ(getRawElements(tooMany, 2).count(), 0U);
  EXPECT_EQ(IOReportStateGetResidency(tooMany, 0), kNone);
  EXPECT_EQ(IOReportSampleCopyDescription(tooMany, 0, nullptr), "");
}

struct Segment {
  std::uint32_t base, isExponential;
  std::int32_t count;
};

Dictionary configured(const std::vector<Segment>& segments, std::size_t elements,
                      std::size_t extraBytes = 0) {
  std::vector<std::byte> bytes;
  for (const auto& [base, isExponential, count] : segments) {
    append(bytes, {base | std::uint64_t{isExponential} << 32,
                   0xABCD | std::uint64_t{static_cast<std::uint32_t>(count)} << 32});
  }
  bytes.resize(bytes.size() + extraBytes);
  const Dictionary info{{"IOReportChannelConfig", plist::Data(bytes)}};
  return sampleOf(3, Sample(elements), 9, info);
}

// Bounds that do not ascend, overflow, or outnumber the elements fail; bytes after the last
// whole segment are not read.
TEST(ValuesTest, WorksOutBucketBounds) {
  using Case = std::pair<Dictionary, Array>;
  for (const auto& [channel, bounds] :
       {Case(configured({{2, 1, 4}, {20, 0, 3}}, 7), {2, 4, 8, 16, 20, 40, 60}),
        Case(configured({{5, 0, 2}}, 7, 15), {5, 10}),
        Case(configured({{9, 0, 0}, {9, 1, -1}, {3, 7, 2}, {1, 0, INT32_MIN}}, 2), {3, 9}),
        Case(configured({{0x80000000, 1, 2}}, 2), {0x80000000, 0x4000000000000000}),
        Case(configured({{20, 0, 3}, {2, 1, 4}}, 7), {}), Case(configured({{1, 0, 3}}, 2), {}),
        Case(configured({{1, 0, INT32_MAX}}, 65535), {}), Case(configured({{0, 0, 1}}, 1), {}),
        Case(configured({{1, 1, 2}}, 2), {}), Case(configured({{0x80000000, 0, 2}}, 2), {}),
        Case(configured({{0x10000, 1, 4}}, 4), {}), Case(configured({}, 1, 15), {}),
        Case(sampleOf(3, {{}}), {}), Case(sampleOf(1, {{}}), {})}) {
    std::int64_t expectedLower = 0;
    for (std::size_t i = 0; i < bounds.size(); ++i) {
      const std::int64_t expectedUpper = bounds.at(i).number()->int64();
      std::int64_t lower = -1, upper = -1;
      const auto bucket = static_cast<std::int32_t>(i);
      EXPECT_EQ(IOReportHistogramGetBucketBounds(channel, bucket, &lower, &upper), 0U);
      EXPECT_EQ(lower, std::exchange(expectedLower, expectedUpper));
      EXPECT_EQ(upper, expectedUpper);
    }
    for (const std::int32_t bucket : {static_cast<std::int32_t>(bounds.size()), -1})
      EXPECT_EQ(IOReportHistogramGetBucketBounds(channel, bucket, nullptr, nullptr), kKernelError);
    EXPECT_EQ(channel.array("ProcessedChannelConfig"), bounds);
  }
}

TEST(ValuesTest, KeepsBoundsAndNamesOnceTheyAreWorkedOut) {
  Dictionary histogram = configured({{5, 0, 1}}, 1);
  std::int64_t upper = 0;
  IOReportHistogramGetBucketBounds(histogram, 0, nullptr, nullptr);
  histogram.remove("IOReportChannelInfo");
  EXPECT_EQ(IOReportHistogramGetBucketBounds(histogram, 0, nullptr, &upper), kKernelSuccess);
  EXPECT_EQ(upper, 5);
  histogram.set("ProcessedChannelConfig", Array{"5"});
  EXPECT_EQ(IOReportHistogramGetBucketBounds(histogram, 0, nullptr, &upper), kKernelError);

  Dictionary states = sampleOf(2, {{{0x49444C45}}, {{0x41435456}}});
  EXPECT_EQ(IOReportStateGetNameForIndex(states, 1), "ACTV");
  EXPECT_EQ(states.array("StateNames"), (Array{"IDLE", "ACTV"}));
  states.set("StateNames", Array{"x", 5});
  EXPECT_EQ(IOReportStateGetNameForIndex(states, 0), "x");
  for (const std::int32_t index : {1, 2, -1})
    EXPECT_EQ(IOReportStateGetNameForIndex(states, index), std::nullopt);
  for (const std::int64_t unnameable : {std::int64_t{7}, kNone}) {
    const Dictionary channel = sampleOf(2, {{{0x49444C45}}, {{unnameable}}});
    EXPECT_EQ(IOReportStateGetNameForIndex(channel, 0), std::nullopt);
    EXPECT_FALSE(channel.contains("StateNames"));
  }
}

constexpr std::uint64_t unit(std::uint64_t quantity, std::uint64_t scale, std::uint64_t word = 0) {
  return quantity << 56 | scale << 32 | word;
}

TEST(UnitTest, LabelsQuantitiesAndScales) {
  std::string labels;
  for (const std::uint64_t code :
       {std::uint64_t{0}, unit(1, 0x7C), unit(7, 0x7C, 1), unit(9, 0), unit(9, 0, 1),
        unit(9, 0x8200), unit(9, 0x8C00, 4), unit(101, 0x82), unit(11, 0x89 << 8),
        unit(1, 0x79, 0x80000018), unit(77, 0x20000), unit(77, 0x820000)})
    labels += copyUnitLabel(static_cast<std::int64_t>(code)).value_or("none") + "|";
  EXPECT_EQ(labels, "|ms|H|b||B|4KiB|kpackets|Ki??|24Mticks|hwpage?|??|");
  EXPECT_EQ(copyUnitLabel(kNone), std::nullopt);

  const Dictionary channel{{"IOReportChannelInfo", IOReportCreateUnitInfo(unit(1, 0x7C))}};
  const auto label = IOReportChannelGetUnitLabel(channel);
  EXPECT_EQ(label, "ms");
  EXPECT_EQ(IOReportChannelGetUnitLabel(channel)->data(), label->data());
}

// A factor times 10^x times 2^y in 64 bits, in another way: the tens' twos are shifted.
std::uint64_t scaled(std::uint64_t factor, int tens, int twos) {
  for (int i = 0; i < tens; ++i)
    factor *= 5;
  const int shift = std::max(tens, 0) + std::max(twos, 0);
  return shift < 64 ? factor << shift : 0;
}

TEST(UnitTest, WorksOutEveryPairOfExponents) {
  const auto exponentOf = [](std::uint32_t byte) {
    return byte == 0 ? 0 : byte == 255 ? -128 : static_cast<int>(byte) - 127;
  };
  using Case = std::tuple<std::uint32_t, std::uint64_t, std::uint64_t>;
  for (std::uint32_t scale = 0; scale <= 0xFFFF; ++scale) {
    const int tens = exponentOf(scale & 0xFF);
    const int twos = exponentOf(scale >> 8);
    for (const auto& [word, factor, divisor] :
         {Case(0, 1, 1), Case(7, 7, 1), Case(0x80000007, 1, 7), Case(0x80000000, 1, 1)}) {
      std::uint64_t up = 99, down = 99;
      ASSERT_EQ(getFactorsFromScale(word, scale, up, down), kKernelSuccess);
      ASSERT_EQ(up, scaled(factor, tens, twos)) << scale;
      ASSERT_EQ(down, scaled(divisor, -tens, -twos)) << scale;
    }
  }
}

TEST(UnitTest, ScalesValuesOfOneQuantity) {
  constexpr std::uint64_t kSeconds = unit(1, 0);
  EXPECT_EQ(IOReportScaleValue(1500, unit(1, 0x7C), kSeconds), 1.5);
  EXPECT_EQ(IOReportScaleValue(3, unit(1, 0x79, 0x80000018), kSeconds), 1.25e-7);
  EXPECT_EQ(IOReportScaleValue(2, unit(9, 0x8C00, 4), unit(9, 0x8200)), 8192);
  EXPECT_EQ(IOReportScaleValue(UINT64_MAX, kSeconds, unit(1, 0x7C)), 0x1p64 * 1000);
  EXPECT_EQ(IOReportScaleValue(1, unit(1, 1), kSeconds), std::numeric_limits<double>::infinity());
  EXPECT_TRUE(std::isnan(IOReportScaleValue(1, kSeconds, unit(8, 0))));
  EXPECT_TRUE(std::isnan(IOReportScaleValue(1, unit(1, 0x10000), kSeconds)));
  EXPECT_TRUE(std::isnan(IOReportScaleValue(1, kSeconds, unit(1, 0x20000))));
  const std::tuple<std::uint64_t, std::uint64_t, bool> cases[] = {
      {0x7C, 0, true},
      {127 + 19, 0, true},
      {127 + 20, 0, false},
      {127 - 20, 0, false},
      {(127 + 63) << 8, 0, true},
      {(127 + 60) << 8, 0x10, false},
      {(127 - 60) << 8, 0x10, true},
      {(127 - 60) << 8, 0x80000010, false},
      {(127 + 8) << 8 | (127 + 18), 0, false},
      {0x10000, 0, false}};
  for (const auto& [scale, word, exact] : cases)
    EXPECT_EQ(hasExactFactors(unit(1, scale, word)), exact) << scale << ' ' << word;
}

TEST(DescriptionTest, DescribesChannels) {
  const Dictionary channel = sampleOf(3, Sample(12), 'A', IOReportCreateUnitInfo(unit(1, 0x7C)));
  setChannelType(channel, typeOf(3, 12, 0x100));
  EXPECT_EQ(IOReportChannelCopyDescription(channel, 0, "> "),
            "> disk <id 0x7> A < 0x41 (ms) | G/g (none)/(none) | cat 0x100 | format 0x03 | "
            "elts 12 >\n");
  Dictionary bare{{"LegendChannel", Array{1, 0}}, {"IOReportGroupName", "G"}};
  bare.set("IOReportSubGroupName", "S");
  EXPECT_EQ(IOReportChannelCopyDescription(bare, 0, nullptr),
            "(null) (null) < 0x1 ((null)) | G/g G/S | cat 0000 | format 0000 | elts 0 >\n");
  EXPECT_EQ(IOReportChannelCopyDescription({}, 0, ""), std::nullopt);
}

TEST(DescriptionTest, DescribesSamples) {
  const Dictionary ms = IOReportCreateUnitInfo(unit(1, 0x7C));
  std::vector<std::byte> configuration;
  append(configuration, {10, std::uint64_t{2} << 32});
  Dictionary bounds = plist::mutableCopy(ms);
  bounds.set("IOReportChannelConfig", plist::Data(configuration));
  const Sample buckets{{{0, 1, 2, 3}}, {{4, 11, 19, 60}}};
  const auto renamed = [](const std::string& name) {
    Dictionary channel = sampleOf(1, {{{5}}}, 0x0102030405060708);
    channel.set("ChannelName", name);
    return channel;
  };
  const Dictionary otherCount = sampleOf(2, {{{'A'}}});
  setChannelType(otherCount, typeOf(2, 2));
  const std::pair<Dictionary, std::optional<std::string>> kCases[] = {
      {sampleOf(1, {{{-12}}}, 'A', ms), format(">%32s = { %12d ms }\n", "A", -12)},
      {sampleOf(1, {{{1}}, {{2}}}, 1),
       format(">%32s = { %lld (null) }\n>%32s = { %lld (null) }\n", "0x1", kNone, "0x1", kNone)},
      {renamed("na\0me"s), format(">%32s = { %12d (null) }\n", "na", 5)},
      {renamed("\xff"), format(">%32s = { %12d (null) }\n", "0x1020304", 5)},
      {sampleOf(2, {{{0x49444C45, 3, 250}}, {{0x41435456, 2, 750}}}, 'A', ms),
       ">                   A[    IDLE] = { # 3        2.500e-01 s / 25.0% }\n"
       ">                   A[    ACTV] = { # 2        7.500e-01 s / 75.0% }\n"},
      {sampleOf(2, {{{7, 0, 0}}}, 'A'),
       ">                   A[     0x7] = { # 0              nan s /  nan% }\n"},
      {otherCount,
       ">                 0x9[0x8000000000000000] = { # 9223372036854775808       nan s /  nan% "
       "}\n"},
      {sampleOf(3, buckets, 'A', bounds),
       ">                   A[           0 -           10 ms] = { <no hits>; # 0 }\n"
       ">                   A[          10 -           20 ms] = { m           11; M           19; "
       "s           60; #            4 }\n"},
      {sampleOf(3, buckets, 'A', ms), {}},
      {sampleOf(3, {{{kNone}}}, 'A', bounds), {}},
      {sampleOf(4, {{}, {}}), "arrays unsupported?arrays unsupported?"},
      {sampleOf(5, {{}}), {}},
      {channelOf(7, 9, typeOf(1, 1)), {}},
      {{}, {}}};
  for (const auto& [channel, text] : kCases)
    EXPECT_EQ(IOReportSampleCopyDescription(channel, 0, ">"), text);
  // A long name for many elements would exhaust the memory.
  Dictionary large = sampleOf(1, Sample(1000));
  large.set("ChannelName", std::string(1 << 20, 'x'));
  EXPECT_EQ(IOReportSampleCopyDescription(large, 0, ""), std::nullopt);
}

struct FakeWriter : DescriptorWriter {
  std::ptrdiff_t answer = 0;
  std::string written;
  std::ptrdiff_t write(int, ByteSpan bytes) override {
    written = asText(bytes);
    return answer;
  }
};

TEST(DescriptionTest, WritesTextsWithOneCall) {
  FakeWriter writer;
  using Case = std::pair<std::ptrdiff_t, KernelReturn>;
  for (const auto& [answer, code] : {Case(4, 0), Case(3, kKernelUnderrun), Case(0, kKernelUnderrun),
                                     Case(5, kKernelError), Case(-1, kKernelIOError)}) {
    writer.answer = answer;
    EXPECT_EQ(IOReportWriteStringUTF8(writer, 1, "text\0more"s), code);
    EXPECT_EQ(writer.written, "text");
  }
  IOReportWriteStringUTF8(writer, 1, "a\xff");
  EXPECT_EQ(writer.written, "a\xEF\xBF\xBD");
  EXPECT_EQ(IOReportWriteStringUTF8(writer, 1, std::nullopt), kKernelBadArgument);
  writer.answer = 0;
  EXPECT_EQ(IOReportWriteStringUTF8(writer, 1, ""), kKernelSuccess);

  LinuxDescriptorWriter system;
  int ends[2];
  ASSERT_EQ(pipe(ends), 0);
  EXPECT_EQ(IOReportWriteStringUTF8(system, ends[1], "ab"), kKernelSuccess);
  close(ends[0]);
  close(ends[1]);
  EXPECT_EQ(IOReportWriteStringUTF8(system, ends[1], "ab"), kKernelIOError);
}

}  // namespace
}  // namespace tavrel
