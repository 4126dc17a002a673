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

using namespace fakes;

Dictionary infoOf(const std::vector<Record>& records) {
  StoragePlatform platform({driver(answering(statistics(records)))});
  return CopyNANDInfo(platform.platform);
}

/// "suffix=number " for every entry, in order.
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
  constexpr const char* kFormat = "formatDaysSince2000";
  constexpr const char* kIntermediate = "IntermediatePartitionSize";
  const std::optional<std::int64_t> none;
  using Case = std::tuple<std::vector<Record>, const char*, std::optional<std::int64_t>>;
  for (const auto& [own, suffix, value] :
       {Case({{56, {kEpoch}}}, kFormat, 0), Case({{56, {kEpoch + 604799}}}, kFormat, 0),
        Case({{56, {1}}}, kFormat, 0), Case({{56, {~0ULL}}}, kFormat, 30500568903377),
        // No value unless both figures are there.
        Case({{86, {500}}}, kIntermediate, none),
        Case({{86, {500}}, {85, {0xFFFFFFFF}}}, kIntermediate, none),
        Case({{86, {500}}, {85, {501}}}, kIntermediate, -1),
        Case({{86, {5}}, {85, {1}}, {86, {~0ULL}}}, kIntermediate, -2),
        Case({{269, {5, 100}}, {270, {~0ULL, 1}}, {269, {9}}}, "NumMaintenanceRequests", 4),
        Case({{289, {1, 7, 0, 9}}}, "MaintenanceRequestsFailedRead", 2),
        Case({{290, {1, 7, 1, 9}}}, "MaintenanceRequestsFailedProg", 3),
        Case({{291, {0, 0, 8, 9}}}, "MaintenanceRequestsFailedErase", 1),
        Case({{187, {~0ULL}}}, "numMemExtreme", -1), Case({{144, {5}}}, "numMemExtreme", none),
        Case({{188, {1ULL << 32}}}, "maxMemExtremeDuration", 0),
        Case({{142, {12345}}}, "maxMemChokeDuration", 12300),
        Case({{145, {12345}}}, "maxMemExtremeDuration", none),
        Case({{143, {12345}}}, "memChokeDuration", 12345),
        Case({{121, {1, 2, 3, 4}}}, "PadSize1", 1),
        Case({{114, {1, 2, 3, 4, 5}}}, "BandsPerInternalFlow3", 5),
        Case({{77, {1}}, {77, {2}}}, "StaticDataSizeInMB", 2)}) {
    auto records = own;
    records.push_back({53, {0x20002}});
    const auto found = infoOf(records).number(std::string(kNANDInfoKeyPrefix) + suffix);
    EXPECT_EQ(found ? std::optional(found->int64()) : std::nullopt, value) << suffix;
  }
}

TEST(NandInfoTest, RoundsMaximumDurations) {
  using Case = std::pair<std::uint64_t, std::int64_t>;
  for (const auto& [value, rounded] :
       {Case(0, 0), Case(99, 99), Case(100, 101), Case(999, 1000), Case(1000, 1000),
        Case(1004, 1000), Case(1005, 1010), Case(12345, 12300), Case(12350, 12400),
        Case(99949, 99900), Case(99950, 100000), Case(4294967295, 4290000000),
        Case((5ULL << 32) + 12, 12)})
    EXPECT_EQ(roundMaximumDuration(value), rounded) << value;
}

TEST(NandInfoTest, MapsAllKeys) {
  std::string rows;
  for (const KeyMapRow& row : keyMap) {
    appendFormat(rows, "%s %s\n", row.name, row.suffix);
    // The look-up finds what a walk from the front finds, even for a truncated name.
    for (const auto name :
         {row.name, row.name.substr(1), row.name.substr(0, row.name.size() - 1)}) {
      const auto first = std::ranges::find(keyMap, name, &KeyMapRow::name);
      EXPECT_EQ(findKeyMapRow(name), first == keyMap.end() ? nullptr : &*first) << name;
    }
  }
  EXPECT_EQ(fingerprint(rows), 0xB6F60D219004B5EBU);
  EXPECT_EQ(findKeyMapRow(""), nullptr);

  // All statistics at once: all rows except the two of fragments, which no statistic has.
  std::vector<Record> records;
  records.reserve(std::size(kStatisticKeys));
  for (const StatisticKey& row : kStatisticKeys)
    records.push_back({row.key, std::vector<std::uint64_t>(row.cap, 0x20002)});
  EXPECT_EQ(infoOf(records).size(), 24U + 302 + 5);
}

TEST(NandInfoTest, AddsToADictionaryUnlessItFails) {
  const Dictionary before{{"com.norvane.NANDInfo.NodesFree", "x"}, {"other", 1}};
  auto target = plist::mutableCopy(before);
  using Case = std::pair<std::vector<Record>, const char*>;
  for (const auto& [records, message] :
       {Case({{4, {1}}}, "Unsupported export version"),
        Case({{53, {0x20003}}, {0x30000001, {}}}, "Unable to parse buffer")}) {
    StoragePlatform failing({driver(answering(statistics(records)))});
    EXPECT_EQ(CopyNANDInfo(failing.platform),
              (Dictionary{{"com.norvane.NANDInfo.Error", "1"},
                          {"com.norvane.NANDInfo.ErrorMessage", message}}));
    DumpNANDInfo(failing.platform, target);
    EXPECT_EQ(target, before);
  }
  StoragePlatform platform({driver(answering(statistics({{53, {0x20001}}, {12, {6}}})))});
  DumpNANDInfo(platform.platform, target);
  EXPECT_EQ(target.size(), 12U + 1);
  EXPECT_EQ(target.get(kNANDInfoNumNodesFreeKey), Value(6));
  EXPECT_FALSE(target.contains(kNANDInfoDriverVersionKey));

  for (const bool preference : {true, false}) {
    platform.preferences.domain("com.norvane.demo-settings").set("StoreDemoMode", preference);
    EXPECT_EQ(CopyNANDInfo(platform.platform).get(kNANDInfoDemoModeKey), Value(preference ? 1 : 0));
  }
}

}  // namespace
}  // namespace tavrel
