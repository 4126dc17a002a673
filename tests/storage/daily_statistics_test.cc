#include "storage/daily_statistics.h"

#include <gtest/gtest.h>

#include "recorded_driver.h"

namespace tavrel {
namespace {

using namespace fakes;

using Scalars = std::vector<std::pair<std::string, std::int64_t>>;
const std::string kUnread = "error reading nand info, error 1 with message Unable to parse buffer";

Scalars scalarsOf(const FakePlatform& platform, std::string_view prefix = {}) {
  Scalars scalars;
  for (const auto& [key, day, value] : platform.store.scalars)
    if (key.starts_with(prefix)) scalars.emplace_back(key, value);
  return scalars;
}

TEST(DailyStatisticsTest, ReportsDiskUsageInMebibytes) {
  const std::tuple<Value, std::int64_t, std::int64_t> kCases[] = {
      {{}, -1, -1},
      {"text", -1, -1},
      {Dictionary{{"TotalDiskCapacity", 1048575}, {"TotalDataAvailable", 1048576}}, 0, 1},
      {Dictionary{{"TotalDiskCapacity", INT64_MAX}, {"TotalDataAvailable", "1"}}, INT64_MAX >> 20,
       -1},
      {Dictionary{{"TotalDataAvailable", -1}}, -1, -1}};
  for (const auto& [answer, capacity, available] : kCases) {
    StoragePlatform platform(Array{});
    platform.answers.answers.set("DiskUsage", answer);
    dailyStorageStatistics(platform.platform);
    EXPECT_EQ(scalarsOf(platform),
              (Scalars{{"com.norvane.lumenhall.DiskUsageUserTotalBlocks", capacity},
                       {"com.norvane.lumenhall.DiskUsageUserBlocksFree", available}}));
    EXPECT_EQ(platform.log.messages(), Journal{kUnread});
    EXPECT_TRUE(platform.crashReporting.records.empty());
  }
}

TEST(DailyStatisticsTest, SetsTheNumbersOfTheNandInformation) {
  const Bytes buffer = statistics({{53, {0x20001}}, {7, {UINT64_MAX}}, {56, {0}}, {52, {12}}});
  StoragePlatform platform({driver(answering(buffer))});
  dailyStorageStatistics(platform.platform);
  const Scalars scalars = scalarsOf(platform);
  ASSERT_EQ(scalars.size(), 2U + 15U);
  EXPECT_EQ((Scalars{scalars[2], scalars[8]}),
            (Scalars{{"com.norvane.NANDInfo.ExportVersion", 0x20001},
                     {"com.norvane.NANDInfo.NumLogicalReads", -1}}));
  EXPECT_TRUE(platform.log.messages().empty());
}

TEST(DailyStatisticsTest, LogsTenEccEventsAndReadsOneMore) {
  const auto event = [](std::uint8_t id, std::uint8_t registers) {
    Bytes bytes;
    append64(bytes, std::uint64_t{id} | std::uint64_t{registers} << 8U);
    for (std::uint64_t i = 0; i < 8; ++i)
      append64(bytes, i == 0 ? UINT64_MAX : i);
    return bytes;
  };
  // The last column is the number logged as unexpected, -1 for none.
  using Case = std::tuple<std::size_t, int, std::size_t, std::size_t, int>;
  for (const auto& [pending, errorBehind, logged, left, number] :
       {Case(0, 2, 0, 0, -1), Case(3, 16, 3, 0, -1), Case(1, 5, 1, 0, 5), Case(10, 2, 10, 0, -1),
        Case(12, 2, 10, 1, 0)}) {
    Journal messages{kUnread};
    if (number >= 0)
      messages.push_back(format("Unexpected errno (%d) reading ECC events from kernel", number));
    StoragePlatform platform(Array{});
    for (std::size_t i = 0; i < pending; ++i)
      platform.controls.eccEvents.push_back(
          event(static_cast<std::uint8_t>(i), static_cast<std::uint8_t>(i == 2 ? 200 : i)));
    platform.controls.errorBehindEvents = errorBehind;
    dailyStorageStatistics(platform.platform);
    const auto& records = platform.crashReporting.records;
    ASSERT_EQ(records.size(), logged);
    EXPECT_EQ(platform.controls.eccEvents.size(), left);
    EXPECT_EQ(platform.log.messages(), messages);
    if (logged < 3) continue;
    EXPECT_EQ(records[0].first, 172U);
    EXPECT_EQ(
        textOf(records[0].second) + textOf(records[1].second) + textOf(records[2].second),
        R"({"id": 0, "count": 0}{"id": 1, "count": 1, "reg0": -1}{"id": 2, "count": 8, )"
        R"("reg0": -1, "reg1": 1, "reg2": 2, "reg3": 3, "reg4": 4, "reg5": 5, "reg6": 6, "reg7": 7})");
  }
}

TEST(DailyStatisticsTest, SetsSimpleChannelsOfTheStorageCategory) {
  constexpr std::int64_t kSimple = 1 | 0x0100 << 16 | std::int64_t{1} << 32;
  constexpr std::int64_t kHistogram = kSimple + 2;
  constexpr std::int64_t kOtherCategory = 1 | 0x0200 << 16 | std::int64_t{1} << 32;
  const Array channels{Array{1, kSimple, "reads"}, Array{2, kHistogram, "sizes"},
                       Array{3, kOtherCategory, "other"}, Array{4, kSimple | 0x0300 << 16},
                       Array{5, kSimple, "left out"}};
  const auto elements = [](std::int64_t channel, std::int64_t type, std::int64_t value) {
    Bytes bytes;
    for (const std::int64_t word : {std::int64_t{9}, channel, type, std::int64_t{1}, value,
                                    std::int64_t{0}, std::int64_t{0}, std::int64_t{0}})
      append64(bytes, static_cast<std::uint64_t>(word));
    return Dictionary{{"DriverID", 9}, {"ChannelID", channel}, {"Elements", Data(bytes)}};
  };
  const Array legend{Dictionary{{"IOReportChannels", channels}}};
  const Dictionary properties{{"IOReportLegendPublic", true}, {"IOReportLegend", legend}};
  const Dictionary reporter{{"Class", "Reporter"}, {"EntryID", 9}, {"Properties", properties}};
  const Dictionary hub{
      {"Channels", Array{elements(1, kSimple, 77), elements(2, kHistogram, 5),
                         elements(3, kOtherCategory, 6), elements(4, kSimple | 0x0300 << 16, -8)}}};
  FakePlatform platform;
  RecordedRegistry registry({{"Services", Array{reporter}}, {"Hub", hub}}, platform.log);
  platform.drivers.behind = &registry;
  dailyStorageStatistics(platform.platform);
  EXPECT_EQ(scalarsOf(platform, "com.norvane.ioreport."),
            (Scalars{{"com.norvane.ioreport.reads", 77}, {"com.norvane.ioreport.(null)", -8}}));
  EXPECT_EQ(platform.streams.output, "");
}

}  // namespace
}  // namespace tavrel
