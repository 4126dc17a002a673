#include "storage/nand_info.h"

#include <algorithm>
#include <gtest/gtest.h>

#include "recorded_driver.h"
#include "storage/key_map.h"
#include "storage/nand_info_keys.h"
#include "storage/parse/asp_parser.h"
#include "storage/parse/statistic_keys.h"

namespace tavrel {
namespace {

using fakes::answering;
using fakes::driver;
using fakes::Record;
using fakes::statistics;
using fakes::StoragePlatform;
using plist::Dictionary;

/// What a driver with such statistics is told to be.
Dictionary infoOf(const std::vector<Record>& records) {
  StoragePlatform platform({driver(answering(statistics(records)))});
  return CopyNANDInfo(platform.platform);
}

/// "suffix=number " for every entry, in their order.
std::string listed(const Dictionary& info) {
  std::string text;
  for (const auto& [key, value] : info) {
    EXPECT_TRUE(key.view().starts_with(kNANDInfoKeyPrefix));
    appendFormat(text, "%s=%lld ", key.view().substr(kNANDInfoKeyPrefix.size()),
                 value.number().value().int64());
  }
  return text;
}

TEST(NandInfoTest, SetsFixedFiguresInTheirOrder) {
  std::vector<Record> records{{53, {0x20001}}, {52, {0xFFFFFFFF}}, {50, {(1ULL << 32) + 2}},
                              {49, {3}},       {7, {4}},           {4, {~0ULL}},
                              {48, {6}},       {17, {7}},          {19, {8}},
                              {18, {9}},       {20, {10}},         {12, {11}},
                              {13, {12}},      {51, {13}},         {56, {946684800 + 604800}},
                              {28, {14}},      {45, {15}},         {265, {16, 17, 18, 19, 20}}};
  const std::string versions = "DriverVersion=-1 DemoMode=0 ";
  const std::string basics =
      "NumVirtualBlocks=-1 PagesPerVirtualBlock=2 BytesPerPage=3 NumLogicalReads=4 "
      "NumLogicalWrites=-1 NumFreeVirtualBlocks=6 NumWearLevelOps=7 NumPhysicalReads=8 "
      "NumPhysicalWrites=9 NumPhysicalErases=10 NodesFree=11 NodesTotal=12 ";
  EXPECT_EQ(listed(infoOf(records)), "ExportVersion=131073 " + versions + basics);
  records[0].values = {0x20002};
  EXPECT_EQ(listed(infoOf(records)),
            "ExportVersion=131074 " + versions + basics +
                "formatDaysSince2000=1 NumSleepOps=14 HighEnduranceBlockEraseCount=15 "
                "BlocksPerVirtualBlock=13 ReadsBeforeErasure0=16 ReadsBeforeErasure50000=17 "
                "ReadsBeforeErasure100000=18 ReadsBeforeErasure150000=19 "
                "ReadsBeforeErasure200000=20 NumMaintenanceRequests=0 "
                "MaintenanceRequestsFailedRead=0 MaintenanceRequestsFailedProg=0 "
                "MaintenanceRequestsFailedErase=0 ");
}

TEST(NandInfoTest, ReadsStatistics) {
  const std::uint64_t kEpoch = 946684800;
  const std::tuple<std::vector<Record>, const char*, std::optional<std::int64_t>> kCases[] = {
      {{{56, {kEpoch}}}, "formatDaysSince2000", 0},
      {{{56, {kEpoch + 604799}}}, "formatDaysSince2000", 0},
      {{{56, {1}}}, "formatDaysSince2000", 0},
      {{{56, {~0ULL}}}, "formatDaysSince2000", 30500568903377},
      {{{86, {500}}}, "IntermediatePartitionSize", std::nullopt},
      {{{86, {500}}, {85, {0xFFFFFFFF}}}, "IntermediatePartitionSize", std::nullopt},
      {{{86, {500}}, {85, {501}}}, "IntermediatePartitionSize", -1},
      {{{86, {5}}, {85, {1}}, {86, {~0ULL}}}, "IntermediatePartitionSize", -2},
      {{{269, {5, 100}}, {270, {~0ULL, 1}}, {269, {9}}}, "NumMaintenanceRequests", 4},
      {{{289, {1, 7, 0, 9}}}, "MaintenanceRequestsFailedRead", 2},
      {{{290, {1, 7, 1, 9}}}, "MaintenanceRequestsFailedProg", 3},
      {{{291, {0, 0, 8, 9}}}, "MaintenanceRequestsFailedErase", 1},
      {{{187, {~0ULL}}}, "numMemExtreme", -1},
      {{{144, {5}}}, "numMemExtreme", std::nullopt},
      {{{188, {1ULL << 32}}}, "maxMemExtremeDuration", 0},
      {{{142, {12345}}}, "maxMemChokeDuration", 12300},
      {{{145, {12345}}}, "maxMemExtremeDuration", std::nullopt},
      {{{143, {12345}}}, "memChokeDuration", 12345},
      {{{121, {1, 2, 3, 4}}}, "PadSize1", 1},
      {{{114, {1, 2, 3, 4, 5}}}, "BandsPerInternalFlow3", 5},
      {{{77, {1}}, {77, {2}}}, "StaticDataSizeInMB", 2}};
  for (const auto& [own, suffix, value] : kCases) {
    auto records = own;
    records.push_back({53, {0x20002}});
    const auto found = infoOf(records).number(std::string(kNANDInfoKeyPrefix) + suffix);
    EXPECT_EQ(found ? std::optional(found->int64()) : std::nullopt, value) << suffix;
  }
}

TEST(NandInfoTest, RoundsMaximumDurations) {
  const std::uint64_t values[] = {
      0, 99, 100, 999, 1000, 1004, 1005, 12345, 12350, 99949, 99950, 4294967295, (5ULL << 32) + 12};
  const std::vector<std::int64_t> expected{0,     99,    101,   1000,   1000,       1000, 1010,
                                           12300, 12400, 99900, 100000, 4290000000, 12};
  std::vector<std::int64_t> rounded;
  for (const std::uint64_t value : values)
    rounded.push_back(roundMaximumDuration(value));
  EXPECT_EQ(rounded, expected);
}

TEST(NandInfoTest, MapsAllKeys) {
  std::string rows;
  for (const KeyMapRow& row : keyMap) {
    appendFormat(rows, "%s %s\n", row.name, row.suffix);
    // The look-up finds what a walk from the front finds, also for a name that is cut.
    for (const auto name :
         {row.name, row.name.substr(1), row.name.substr(0, row.name.size() - 1)}) {
      const auto first = std::ranges::find(keyMap, name, &KeyMapRow::name);
      EXPECT_EQ(findKeyMapRow(name), first == keyMap.end() ? nullptr : &*first) << name;
    }
  }
  EXPECT_EQ(fakes::fingerprint(rows), 0xB6F60D219004B5EBU);
  EXPECT_EQ(findKeyMapRow(""), nullptr);

  // All statistics at once: all rows but the two of fragments, which no statistic has.
  std::vector<Record> records;
  for (const StatisticKey& row : kStatisticKeys)
    records.push_back({row.key, std::vector<std::uint64_t>(row.cap, 0x20002)});
  EXPECT_EQ(infoOf(records).size(), 24U + 302 + 5);
}

TEST(NandInfoTest, TellsErrors) {
  const auto error = [](const char* message) {
    return Dictionary{{"com.norvane.NANDInfo.Error", "1"},
                      {"com.norvane.NANDInfo.ErrorMessage", message}};
  };
  const Dictionary before{{"com.norvane.NANDInfo.NodesFree", "x"}, {"other", 1}};
  const std::pair<std::vector<Record>, Dictionary> kCases[] = {
      {{{4, {1}}}, error("Unsupported export version")},
      {{{53, {0x20003}}, {0x30000001, {}}}, error("Unable to parse buffer")}};
  for (const auto& [records, info] : kCases) {
    StoragePlatform platform({driver(answering(statistics(records)))});
    EXPECT_EQ(plist::Value(CopyNANDInfo(platform.platform)), info);
    auto target = plist::mutableCopy(before);
    DumpNANDInfo(platform.platform, target);
    EXPECT_EQ(plist::Value(target), before);
  }
}

TEST(NandInfoTest, AddsToADictionary) {
  StoragePlatform platform({driver(answering(statistics({{53, {0x20001}}, {12, {6}}})))});
  Dictionary target{{"com.norvane.NANDInfo.NodesFree", "x"}, {"other", 1}};
  DumpNANDInfo(platform.platform, target);
  EXPECT_EQ(target.size(), 12U + 1);
  EXPECT_EQ(target.number(kNANDInfoNumNodesFreeKey), plist::Number(6));
  EXPECT_FALSE(target.contains(kNANDInfoDriverVersionKey));

  const auto demoMode = [&](const plist::Value& preference) {
    platform.preferences.domain("com.norvane.demo-settings").set("StoreDemoMode", preference);
    return CopyNANDInfo(platform.platform).number(kNANDInfoDemoModeKey)->int64();
  };
  EXPECT_EQ(demoMode(true), 1);
  EXPECT_EQ(demoMode(false), 0);
}

}  // namespace
}  // namespace tavrel
