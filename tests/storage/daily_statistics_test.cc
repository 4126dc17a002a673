#include "storage/daily_statistics.h"

#include <gtest/gtest.h>

#include "recorded_driver.h"

namespace tavrel {
namespace {

using fakes::Bytes;
using fakes::StoragePlatform;
using plist::Array;
using plist::Dictionary;
using plist::Value;

using Scalars = std::vector<std::pair<std::string, std::int64_t>>;

Scalars scalarsOf(const StoragePlatform& platform) {
  Scalars scalars;
  for (const auto& [key, day, value] : platform.store.scalars)
    scalars.emplace_back(key, value);
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
    EXPECT_EQ(platform.log.messages(),
              (std::vector<std::string>{
                  "error reading nand info, error 1 with message Unable to parse buffer"}));
    EXPECT_TRUE(platform.crashReporting.records.empty());
  }
}

TEST(DailyStatisticsTest, SetsTheNumbersOfTheNandInformation) {
  const Bytes buffer =
      fakes::statistics({{53, {0x20001}}, {7, {~std::uint64_t{0}}}, {56, {0}}, {52, {12}}});
  StoragePlatform platform({fakes::driver(fakes::answering(buffer))});
  dailyStorageStatistics(platform.platform);
  const Scalars scalars = scalarsOf(platform);
  ASSERT_EQ(scalars.size(), 2U + 15U);
  EXPECT_EQ(scalars[2],
            std::pair(std::string("com.norvane.NANDInfo.ExportVersion"), std::int64_t{0x20001}));
  EXPECT_EQ(scalars[8],
            std::pair(std::string("com.norvane.NANDInfo.NumLogicalReads"), std::int64_t{-1}));
  EXPECT_TRUE(platform.log.messages().empty());
}

TEST(DailyStatisticsTest, LogsTenEccEventsAndReadsOneMore) {
  const auto event = [](std::uint8_t id, std::uint8_t registers) {
    Bytes bytes(8);
    bytes[0] = std::byte{id};
    bytes[1] = std::byte{registers};
    for (std::uint64_t i = 0; i < 8; ++i)
      fakes::append64(bytes, i == 0 ? ~std::uint64_t{0} : i);
    return bytes;
  };
  const auto unexpected = [](int number) {
    return std::vector<std::string>{
        "error reading nand info, error 1 with message Unable to parse buffer",
        format("Unexpected errno (%d) reading ECC events from kernel", number)};
  };
  const std::tuple<std::size_t, int, std::size_t, std::size_t, std::vector<std::string>> kCases[] =
      {{0, 2, 0, 0, {unexpected(0)[0]}},
       {3, 16, 3, 0, {unexpected(0)[0]}},
       {1, 5, 1, 0, unexpected(5)},
       {10, 2, 10, 0, {unexpected(0)[0]}},
       {12, 2, 10, 1, unexpected(0)}};
  for (const auto& [pending, errorBehind, logged, left, messages] : kCases) {
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
    EXPECT_EQ(records[0].second, (Dictionary{{"id", 0}, {"count", 0}}));
    EXPECT_EQ(records[1].second, (Dictionary{{"id", 1}, {"count", 1}, {"reg0", -1}}));
    EXPECT_EQ(records[2].second.size(), 2U + 8U);
    EXPECT_EQ(records[2].second.get("count"), Value(8));
    EXPECT_EQ(records[2].second.get("reg7"), Value(7));
  }
}

TEST(DailyStatisticsTest, SetsSimpleChannelsOfTheStorageCategory) {
  constexpr std::int64_t kSimple = 1 | 0x0100 << 16 | std::int64_t{1} << 32;
  constexpr std::int64_t kHistogram = kSimple + 2;
  constexpr std::int64_t kOtherCategory = 1 | 0x0200 << 16 | std::int64_t{1} << 32;
  const Array channels{Array{1, kSimple, "reads"}, Array{2, kHistogram, "sizes"},
                       Array{3, kOtherCategory, "other"}, Array{4, kSimple | 0x0300 << 16},
                       Array{5, kSimple, "left out"}};
  const auto elements = [](std::uint64_t channel, std::int64_t type, std::int64_t value) {
    Bytes bytes;
    for (const std::uint64_t word :
         {std::uint64_t{9}, channel, static_cast<std::uint64_t>(type), std::uint64_t{1},
          static_cast<std::uint64_t>(value), std::uint64_t{0}, std::uint64_t{0}, std::uint64_t{0}})
      fakes::append64(bytes, word);
    const auto id = static_cast<std::int64_t>(channel);
    return Dictionary{{"DriverID", 9}, {"ChannelID", id}, {"Elements", plist::Data(bytes)}};
  };
  const Dictionary reporter{
      {"Class", "Reporter"},
      {"EntryID", 9},
      {"Properties",
       Dictionary{{"IOReportLegendPublic", true},
                  {"IOReportLegend", Array{Dictionary{{"IOReportChannels", channels}}}}}}};
  const Dictionary hub{
      {"Channels", Array{elements(1, kSimple, 77), elements(2, kHistogram, 5),
                         elements(3, kOtherCategory, 6), elements(4, kSimple | 0x0300 << 16, -8)}}};
  fakes::FakePlatform platform;
  RecordedRegistry registry({{"Services", Array{reporter}}, {"Hub", hub}}, platform.log);
  platform.drivers.behind = &registry;
  dailyStorageStatistics(platform.platform);
  Scalars scalars;
  for (const auto& [key, day, value] : platform.store.scalars)
    if (key.starts_with("com.norvane.ioreport.")) scalars.emplace_back(key, value);
  EXPECT_EQ(scalars,
            (Scalars{{"com.norvane.ioreport.reads", 77}, {"com.norvane.ioreport.(null)", -8}}));
  EXPECT_EQ(platform.streams.output, "");
}

}  // namespace
}  // namespace tavrel
