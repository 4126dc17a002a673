#include <gtest/gtest.h>

#include "storage/counter_parsers.h"
#include "storage/hex_string.h"
#include "tests/fakes/fake_platform.h"

namespace tavrel {
namespace {

using fakes::FakeStreams;

/// Which words the elements came from, with "*n" for n elements that are 0; arrays of zeros are
/// left out. Word w of the block holds w + 1.
std::string described(const TelemetryCounters& counters) {
  std::string text;
  for (const CounterArrayShape& shape : kCounterArrays) {
    const auto array = counters[shape.array];
    std::string line;
    for (std::size_t i = 0, end = 0; i < array.size(); i = end) {
      const std::uint32_t step = array[i] == 0 ? 0 : 1;
      for (end = i + 1; end < array.size() && array[end] == array[end - 1] + step;)
        ++end;
      if (step == 0) {
        line += end - i < array.size() ? format(" *%zu", end - i) : "";
      } else {
        line += format(" %u", array[i] - 1);
        if (end - i > 1) line += format("-%u", array[end - 1] - 1);
      }
    }
    if (!line.empty()) text += format("%s%s; ", shape.name, line);
  }
  return text;
}

TEST(CountersTest, CopiesByMap) {
  const std::tuple<CounterParser, const char*, std::string_view> kCases[] = {
      {parseOnlyAlgoGenericCounters, "parseOnlyAlgoGenericCounters",
       "readStage 0-18 37 117-118 91 *10; initialReadStage 20-27 19 116 90 120 119 *10; "
       "nandStageOfLife 28-35; dspExceptionParameter 104 38-44 89 105 114-115 *26; "
       "readStage18NumOfErrorsBin 45-56; readStage9NumOfErrorsBin 57-64 *2; "
       "readStage10NumOfErrorsBin 67-76; readStage17NumOfErrorsBin 77-86; "
       "readStage19NumOfErrorsBin 92-103; algoNANDAccessesBin 106-113; "},
      {parseOnlyAlgoGenericCountersK4, "parseOnlyAlgoGenericCountersK4",
       "readStage 0-7 *1 9-18 27 105-106 79 *2 115-118 8 120-121 110; initialReadStage *8 19 "
       "104 78 108 107 122 *9; nandStageOfLife 20-22 *1 23-25 *1; dspExceptionParameter 92 "
       "28-29 *6 93 102-103 *1 30-32 77 112-114 126 123 94-98 *1 99-101 109 111 45-48 26; "
       "readStage18NumOfErrorsBin 33-44; readStage10NumOfErrorsBin 55-64; "
       "readStage17NumOfErrorsBin 65-74; readStage19NumOfErrorsBin 80-91; retentionIndication "
       "*2 75-76 *8; "},
      {parseCounters1y, "parseCounters1y",
       "readStage 256-263 265 267-276 303 390-391 372 *10; initialReadStage 278-285 277 290 371 "
       "393 392 *10; nandStageOfLife 292-299; dspExceptionParameter 21 305-306 313-317 370 15 "
       "531-532 *26; readStage18NumOfErrorsBin 318-329; readStage9NumOfErrorsBin 330-337 *2; "
       "readStage10NumOfErrorsBin 338-347; readStage17NumOfErrorsBin 348-357; "
       "readStage19NumOfErrorsBin 373-384; "},
      {parseCounters1xSandisk, "parseCounters1xSandisk",
       "readStage 256-261 *2 265 267-273 *1 275-276 301 *13; initialReadStage 278-283 *2 277 "
       "288 *13; nandStageOfLife 290-297; dspExceptionParameter 16 303-304 311-315 *1 10 *28; "},
      {parseCounters1xHynix, "parseCounters1xHynix",
       "readStage 256-259 *4 263 265-271 *1 273-274 297 *13; initialReadStage 276-279 *4 275 "
       "284 *13; nandStageOfLife 286-293; dspExceptionParameter 16 299-300 307-311 *1 10 *28; "},
  };
  std::vector<std::byte> bytes(kCounterBlockBytes);
  for (std::uint32_t word = 0; word < 1024; ++word)
    storeLittle32(bytes, std::size_t{word} * 4, word + 1);
  const CounterBlock block(bytes.data(), kCounterBlockBytes);
  TelemetryCounters counters;
  counters.elements.fill(0xFFFFFFFF);
  for (const auto& [parser, name, words] : kCases) {
    parser(block, counters);
    EXPECT_EQ(described(counters), words);
    EXPECT_EQ(counterParserName(parser), name);
  }
  parseCountersAlgoGeneric(block, counters);
  EXPECT_EQ(described(counters), std::get<2>(kCases[0]));
  parseCountersAlgoGenericK4(block, counters);
  EXPECT_EQ(described(counters), std::get<2>(kCases[1]));
}

TEST(CountersTest, SelectsParsers) {
  using Case = std::tuple<const char*, const char*, const char*>;
  FakeStreams streams;
  for (const auto& [chip, manufacturer, parser] :
       {Case("K3V", "4582603A5700", "parseCountersAlgoGeneric"),
        Case("K4V", "AD825223215F", "parseCountersAlgoGenericK4"),
        Case("K2V", "AD825223215F", "parseCounters1xHynix"),
        Case("K3", "ad82522321FF99", "parseCounters1xHynix"),
        Case("", "4582603A5700", "parseCounters1xSandisk"),
        Case("K3V1", "458260DE57EE", "parseCounters1xSandisk"),
        Case("", "4582603B5700", "parseCounters1y"), Case("", "AD82", "parseCounters1y"),
        Case("", "AD", "parseCounters1y"), Case("", "AD82522321", "parseCounters1y")}) {
    const auto id = readManufacturerId(streams, manufacturer);
    EXPECT_EQ(counterParserName(selectCounterParser(chipGeneration(chip), id.vendor, id.device)),
              parser)
        << chip << " " << manufacturer;
  }
  EXPECT_EQ(streams.output, "");
}

TEST(CountersTest, ReadsHexadecimal) {
  using Case = std::tuple<std::string_view, std::uint32_t, std::string>;
  for (const auto& [text, number, output] :
       {Case("", 0, ""), Case("7", 7, ""), Case("12345678", 0x12345678, ""),
        Case("123456789", 0x12345678, ""), Case("AD82", 0xAD82, ""), Case("abc", 0xAB0C, ""),
        Case("1G", 0x10, "unrecognized hex character: g"),
        Case("@G", 0, "unrecognized hex character: @unrecognized hex character: g"),
        Case({"\xC4\0F", 3}, 0x0F,
             {"unrecognized hex character: \xC4unrecognized hex character: \0", 58})}) {
    FakeStreams streams;
    EXPECT_EQ(hexStringToInt32(streams, text), number) << text;
    EXPECT_EQ(streams.output, output);
  }
  FakeStreams streams;
  EXPECT_EQ(hexStringToByte(streams, "fFz"), 0xFF);
  EXPECT_EQ(streams.output, "");
}

}  // namespace
}  // namespace tavrel
