#include <gtest/gtest.h>

#include "base/limits.h"
#include "recorded_driver.h"
#include "storage/parse/asp_parser.h"
#include "storage/parse/statistic_keys.h"

namespace tavrel {
namespace {

using namespace fakes;

/// "name=text", after checking that the text is the value's.
std::vector<std::string> listed(const ASPContext& context) {
  std::vector<std::string> entries;
  forEachStatistic(context, [&](std::string_view name, const ASPValueEntry& entry) {
    EXPECT_EQ(asText(entry.text), std::to_string(entry.value));
    entries.push_back(format("%s=%llu", name, entry.value));
  });
  EXPECT_EQ(context.names.tail == nullptr, entries.empty());
  EXPECT_EQ(context.values.tail == nullptr, entries.empty());
  return entries;
}

TEST(ParserTest, ParsesRecords) {
  const std::vector<Record> twice{{53, {6}}, {53, {7}}};
  // `cut` bytes are removed from the end; `exportVersion` is 5 before the parse.
  using Case =
      std::tuple<std::vector<Record>, std::size_t, int, std::uint32_t, std::vector<std::string>>;
  for (const auto& [records, cut, result, exportVersion, entries] :
       {Case({}, 0, 0, 5, {}),
        Case({{53, {4295098371}}}, 0, 1, 0x20003, {"exportVersion=4295098371"}),
        Case({{0x30000000, {}}}, 0, 1, 5, {}),
        Case({{4, {7}}, {0x30000001, {}}}, 0, 0, 0, {"hostWrites=7"}),
        Case({{0, {1}}, {21, {1, 2, 3}}, {396, {9}}, {395, {5}}}, 0, 1, 5,
             {"raidFailedRMXReconstructionHost=5"}),
        Case({{184, {}}, {54, {}}}, 0, 1, 5, {}), Case({{54, {8}}}, 0, 1, 5, {"ECBins=8"}),
        Case({{185, {8, 9}}, {124, {1, 2, 3}}}, 0, 1, 5,
             {"TempSensorMin=8", "coldestCycle0=1", "coldestCycle1=2"}),
        Case({{265, {1, 2}}}, 0, 1, 5, {"readCountHisto0=1", "readCountHisto1=2"}),
        Case({{4, {1}}, {4, {~0ULL}}}, 0, 1, 5,
             {"hostWrites=1", "hostWrites=18446744073709551615"}),
        Case(twice, 0, 1, 7, {"exportVersion=6", "exportVersion=7"}),
        Case(twice, 8, 0, 0, {"exportVersion=6"}), Case(twice, 16, 1, 6, {"exportVersion=6"}),
        Case(twice, 24, 0, 0, {}), Case({{53, {6}}, {21, {1, 2}}}, 8, 0, 0, {"exportVersion=6"})}) {
    Bytes bytes = statistics(records);
    bytes.resize(bytes.size() - cut);
    bytes.resize(bytes.size() + 7, std::byte{0xFF});
    ASPContext context;
    context.exportVersion = 5;
    EXPECT_EQ(ASPParseBufferToCxt(context, bytes), result);
    EXPECT_EQ(context.exportVersion, exportVersion);
    EXPECT_EQ(listed(context), entries);
    EXPECT_EQ(context.driverVersion, 0xFFFFFFFF);
  }
  // Counts that overflow when converted to bytes.
  for (const std::uint64_t count : {0x1FFFFFFFULL, 0x20000000ULL, 0xFFFFFFFFULL}) {
    Bytes bytes;
    for (const std::uint64_t unit : {4 | count << 32, std::uint64_t{7}})
      append64(bytes, unit);
    ASPContext context;
    EXPECT_EQ(ASPParseBufferToCxt(context, bytes), 0);
  }
}

// Every statistic, with one value more than it may have.
TEST(ParserTest, KnowsAllStatistics) {
  std::vector<Record> records;
  std::vector<std::string> expected;
  std::string rows;
  for (const StatisticKey& row : kStatisticKeys) {
    appendFormat(rows, "%u %s %u\n", row.key, row.name, row.cap);
    records.push_back({row.key, {}});
    for (std::uint32_t i = 0; i <= row.cap; ++i) {
      const std::uint64_t value = row.key * 1000 + i + (7ULL << 32);
      records.back().values.push_back(value);
      if (i == row.cap) continue;
      expected.push_back(row.cap == 1 ? format("%s=%llu", row.name, value)
                                      : format("%s%u=%llu", row.name, i, value));
    }
  }
  EXPECT_EQ(fingerprint(rows), 0x763591C316AD340AU);
  EXPECT_EQ(records.size(), 349U);
  EXPECT_EQ(expected.size(), 1267U);
  const Bytes bytes = statistics(records);

  ASPContext context;
  EXPECT_EQ(ASPParseBufferToCxt(context, bytes), 1);
  EXPECT_EQ(listed(context), expected);
  EXPECT_EQ(context.readCountHisto[4], 265004 + (7ULL << 32));

  // A second parse appends; a shorter histogram leaves the other slots alone.
  EXPECT_EQ(ASPParseBufferToCxt(context, statistics({{265, {1, 2}}, {53, {9}}})), 1);
  EXPECT_EQ(listed(context).size(), 1270U);
  EXPECT_EQ(context.readCountHisto[1], 2U);
  EXPECT_EQ(context.readCountHisto[2], 265002 + (7ULL << 32));
  EXPECT_EQ(context.exportVersion, 9U);

  for (int i = 0; i < 2; ++i) {
    ASPReleaseContext(context);
    EXPECT_TRUE(listed(context).empty() && !context.names.head && !context.values.head);
    EXPECT_EQ(context.driverVersion + context.hostWrites + context.readCountHisto[0], 0U);
  }

  // Wherever the buffer is cut, the lists hold what was read before.
  std::size_t most = 0;
  for (std::size_t length = 0; length < 1000; ++length) {
    ASPContext part;
    ASPParseBufferToCxt(part, ByteSpan(bytes).first(length));
    const auto entries = listed(part);
    EXPECT_TRUE(std::equal(entries.begin(), entries.end(), expected.begin()));
    EXPECT_GE(entries.size(), most);
    most = entries.size();
  }
  EXPECT_EQ(most, 53U);
}

TEST(ParserTest, CutsNames) {
  const std::string text(98, 'a');
  ASPContext context;
  EXPECT_TRUE(ASPAppendEntry(context, text.substr(1), "12", 1));
  EXPECT_TRUE(ASPAppendEntry(context, text + "b", "12", 1));
  EXPECT_EQ(listed(context), (std::vector{text.substr(1) + "1=1", text + "=1"}));
}

TEST(ParserTest, LimitsEntries) {
  ASPContext context;
  std::size_t count = 0;
  while (count <= limits::kStatisticsEntries && ASPAppendEntry(context, "a", "", count))
    ++count;
  EXPECT_EQ(count, limits::kStatisticsEntries);
  count = 0;
  forEachStatistic(context, [&](std::string_view, const ASPValueEntry& entry) {
    ASSERT_EQ(entry.value, count++);
  });
  EXPECT_EQ(count, limits::kStatisticsEntries);
}

}  // namespace
}  // namespace tavrel
