#include "storage/structured_log.h"

#include <gtest/gtest.h>

#include "recorded_driver.h"
#include "storage/structured_lists.h"

namespace tavrel {
namespace {

using namespace fakes;

struct Driver {
  Array methods = Array::create();

  void answer(std::uint8_t selector, const Bytes& list) {
    query(selector, 0, {{"Output", Data(little32(list.size()))}});
    row(selector, 0, {{"Output", Data(list)}});
  }
  void query(std::uint8_t selector, std::uint8_t flags, const Dictionary& answer) {
    row(selector, flags | 1, answer);
  }
  void row(std::uint8_t selector, std::uint8_t flags, const Dictionary& answer) {
    Dictionary method = plist::mutableCopy(answer);
    method.set("Method", 8);
    method.set("Request", request(selector, flags));
    methods.append(method);
  }
  /// The driver's service, and its parent, which has the device's characteristics.
  Array services(const Value& characteristics) const {
    Dictionary service = driver(methods);
    if (characteristics) service.set("Parents", Dictionary{{"IOService", 7}});
    const Dictionary properties{{"Device Characteristics", characteristics}};
    return {service, Dictionary{{"Class", "Bus"}, {"EntryID", 7}, {"Properties", properties}}};
  }
};

constexpr std::uint8_t kStatistics = 13, kBands = 11, kDefects = 15, kTelemetry = 17;

// 2.5 block writes per host write, 0.75 in the intermediate bands.
const Bytes kStatisticsBuffer = statistics(
    {{49, {4096}}, {50, {1}}, {20, {5}}, {4, {2}}, {129, {3}}, {84, {9}}, {129, {1}}, {84, {1}}});

TEST(StructuredLogTest, LogsTheValidityListAboveTheThreshold) {
  const Bytes list = words({5, 1, 0, 0, 0, 3, ~0U, 0, 0, 0, 16, 8, 0, 0, 0,
                            0, 7, 0, 0, 0, 3, 4,   0, 0, 0, 15, 1, 0, 0, 0});
  const std::string kText =
      " tavrel[211]: IntermediateWamp:0.50;UserWamp:2.50;ValidityList[0]:7;ValidityList[3]:-1,4;"
      "ValidityList[15]:1\n";
  const std::tuple<Value, bool, bool> kCases[] = {
      {{}, false, true},   {3.0, false, false}, {2.5F, false, false}, {2.25, false, true},
      {12.0, false, true}, {0.0, false, true},  {3, false, true},     {3.0, true, true}};
  for (const auto& [preference, forced, logged] : kCases) {
    Driver driver;
    driver.answer(kStatistics, kStatisticsBuffer);
    driver.answer(kBands, list);
    StoragePlatform platform(driver.services(1));
    platform.preferences.domain("com.norvane.NANDInfo").set("userWAmp", preference);
    gForceCollectionSet = forced;
    DumpStorageStructuredLog(platform.platform, false);
    gForceCollectionSet = false;
    EXPECT_EQ(gNeedValidityList, logged) << textOf(preference);
    EXPECT_EQ(gCurrentUserWamp, 2.5);
    EXPECT_EQ(gCurrentSysWamp, 0.5);
    ASSERT_EQ(platform.submission.logs.size(), logged ? 1U : 0U);
    if (!logged) continue;
    EXPECT_EQ(platform.submission.logs[0].type, "165");
    EXPECT_TRUE(platform.submission.logs[0].content.ends_with(kText));
  }
  // One byte less than the records need, counts that would overflow, no records, no header.
  StoragePlatform platform(Array::create());
  gNeedValidityList = true;
  for (const Bytes& bad : {Bytes(list.begin(), list.end() - 1), words({1, ~0U, 0, 0, 0}),
                           words({~0U, 0, 0}), words({0, 0, 0}), words({1})}) {
    platform.streams.error.clear();
    EXPECT_FALSE(logValidityList(platform.platform, bad, {}));
    EXPECT_EQ(platform.streams.error, "data cannot be parsed");
  }
  gNeedValidityList = false;
}

TEST(StructuredLogTest, HasInfiniteAmplificationWithoutHostWrites) {
  Driver driver;
  driver.answer(kStatistics, statistics({{49, {4096}}, {50, {1}}, {20, {5}}, {84, {1}}}));
  StoragePlatform platform(driver.services(1));
  platform.preferences.domain("com.norvane.NANDInfo").set("userWAmp", 9.5);
  DumpStorageStructuredLog(platform.platform, false);
  EXPECT_TRUE(gNeedValidityList);
  EXPECT_EQ(gCurrentSysWamp, 0);  // no size of the intermediate bands
  // 1 is greater than 0, but 0 is not a threshold.
  StoragePlatform one(
      {fakes::driver(answering(statistics({{49, {4096}}, {50, {1}}, {20, {5}}, {4, {5}}})))});
  one.preferences.domain("com.norvane.NANDInfo").set("userWAmp", 0.0);
  DumpStorageStructuredLog(one.platform, false);
  EXPECT_EQ(gCurrentUserWamp, 1);
  EXPECT_FALSE(gNeedValidityList);
  StoragePlatform without(Array{});
  EXPECT_FALSE(DumpStorageStructuredLog(without.platform, false));
  const std::string none = "Could not get matching Kernkit service for exporting classes\n";
  EXPECT_EQ(without.streams.error, none + none);
  EXPECT_FALSE(gNeedValidityList);
  EXPECT_EQ(gCurrentUserWamp, 0);
}

TEST(StructuredLogTest, SaysWhatFails) {
  const std::string kStatisticsFailed = "IOConnectCallStructMethod: -536870206";
  const auto failedQueries = [](std::initializer_list<int> indexes) {
    std::string text;
    for (const int index : indexes)
      text += "IOConnectCallStructMethod failed with status 0xe00002c2 on selector index " +
              std::to_string(index) + "\n";
    return text;
  };
  const Dictionary characteristics{
      {"chip-id", "K3V"}, {"manufacturer-id", "AD825223215F"}, {"num-bus", 0}};
  const auto run = [&](const Driver& driver, const Value& under, bool result, const auto& error) {
    StoragePlatform platform(driver.services(under));
    EXPECT_EQ(DumpStorageStructuredLog(platform.platform, false), result) << error;
    EXPECT_EQ(platform.streams.error, error);
  };
  run({}, {}, false, kStatisticsFailed + "failed to create dictionary");
  // Neither failed queries nor fetches count.
  run({}, characteristics, true, kStatisticsFailed + failedQueries({0, 1, 2, 3, 4}));
  Driver driver;
  driver.query(kBands, 0, {{"Output", Data(little32(0))}});
  driver.query(kTelemetry, 0, {{"Output", Data(little32(~0U))}});
  driver.query(kTelemetry, 4, {{"Output", Data(little32(8))}});
  driver.answer(kDefects, words({0, 1, 0}));
  run(driver, characteristics, false,
      kStatisticsFailed + "Could not malloc 4294967295 bytes" +
          "Could not retrieve data from driver for selector 17\n" + failedQueries({3}));
  // Lists for which a driver's row has no getter are not requested.
  {
    StoragePlatform platform(driver.services(characteristics));
    EXPECT_TRUE(logStorageLists(platform.platform, *platform.drivers.firstService("ASPStorage"),
                                {.characteristicsProperty = "Device Characteristics"}, false));
    EXPECT_EQ(platform.streams.error,
              "Validity list retrieval is not supported\n"
              "Telemetry list retrieval is not supported\n"
              "Defects list retrieval is not supported\n");
    EXPECT_FALSE(logStorageLists(platform.platform, *platform.drivers.firstService("ASPStorage"),
                                 {.characteristicsProperty = "Device Characteristics",
                                  .defectsList = []() -> const SelectorTable* { return nullptr; }},
                                 false));
  }
  // The caller's flag is passed in both steps.
  Driver flagged;
  flagged.answer(kStatistics, kStatisticsBuffer);
  flagged.query(kDefects, 2, {{"Output", Data(little32(12))}});
  flagged.row(kDefects, 2, {{"Output", Data(words({0, 9, 0}))}});
  StoragePlatform platform(flagged.services(1));
  EXPECT_TRUE(DumpStorageStructuredLog(platform.platform, true));
  ASSERT_EQ(platform.crashReporting.records.size(), 1U);
  EXPECT_EQ(platform.crashReporting.records[0].second, (Dictionary{{"Factory Count", 9}}));
}

TEST(StructuredLogTest, GoesOnWithTheNextListWhenMemoryRunsOut) {
  struct Reporting : FakeCrashReporting {
    using FakeCrashReporting::FakeCrashReporting;
    void FLLogStructuredData(std::uint32_t type, const Dictionary& record) override {
      if (record.contains("RD")) throw std::bad_alloc();
      FakeCrashReporting::FLLogStructuredData(type, record);
    }
  };
  Driver driver;
  driver.answer(kTelemetry, Bytes(4128));
  driver.answer(kDefects, words({0, 9, 0}));
  StoragePlatform platform(driver.services(
      Dictionary{{"chip-id", "K3V"}, {"manufacturer-id", "AD825223215F"}, {"num-bus", 1}}));
  Reporting reporting(platform.journal);
  platform.platform.crashReporting = reporting;
  EXPECT_FALSE(DumpStorageStructuredLog(platform.platform, false));
  EXPECT_EQ(platform.log.messages(),
            Journal{"cannot log a list of the storage driver: std::bad_alloc"});
  ASSERT_EQ(reporting.records.size(), 1U);
  EXPECT_EQ(reporting.records[0].second, (Dictionary{{"Factory Count", 9}}));
}

TEST(StructuredLogTest, RefusesTelemetryThatItCannotPlace) {
  const Dictionary good{{"chip-id", "K3V"}, {"manufacturer-id", "AD825223215F"}, {"num-bus", 1}};
  const auto with = [&](const char* key, const Value& value) {
    Dictionary changed = plist::mutableCopy(good);
    changed.set(key, value);
    return Value(changed);
  };
  const auto log = [](const Value& characteristics, std::size_t size, const std::string& error,
                      const std::string& output = {}) {
    StoragePlatform platform(Array{});
    EXPECT_EQ(logTelemetryList(platform.platform, Bytes(size), characteristics), error.empty());
    EXPECT_EQ(platform.streams.error, error.empty() ? "" : "ERROR: " + error + "\n");
    EXPECT_EQ(platform.streams.output, output);
    EXPECT_EQ(platform.crashReporting.records.size(), error.empty() && size != 0 ? 1U : 0U);
  };
  const std::string bounds = "Attempting to parse beyond the bounds of the buffer";
  const std::string noChannels = "could not determine the number of channels";
  log("text", 4128, "Could not parse the Device Characteristics dictionary");
  log(with("chip-id", {}), 4128, "Could not determine the chip-id");
  log(with("chip-id", 5), 4128, "chip-id is not stored as a CFStringTypeID");
  log(with("chip-id", std::string(64, 'K')), 4128,
      "Unable to obtain chip-id as conversion from the UniChar contents of CFString failed, or the "
      "buffer of 64 bytes is too small");
  log(with("manufacturer-id", {}), 4128, "Could not determine the manufacturer-id");
  log(with("manufacturer-id", true), 4128, "manufacturer-id is not stored as a CFStringTypeID");
  log(with("num-bus", {}), 4128, noChannels);
  log(with("num-bus", "1"), 4128, noChannels);
  log(Dictionary{{"chip-id", ""}, {"manufacturer-id", "1Z"}}, 0, noChannels,
      "unrecognized hex character: z");
  log(good, 4127, bounds);
  log(with("num-bus", INT32_MAX), 4128, bounds);
  log(good, 4128, "");
  log(with("chip-id", std::string(63, 'K')), 4128, "");
  log(with("num-bus", -1), 0, "");
  log(with("num-bus", 0), 0, "");
}

TEST(StructuredLogTest, FilesOneRecordPerChannel) {
  // Word n of channel c's block is 1000 c + n; field n of its record is 100 c + n.
  constexpr std::uint32_t kChannels = 2;
  std::vector<std::uint32_t> values;
  for (std::uint32_t word = 0; word < kChannels * 1024; ++word)
    values.push_back(1000 * (word / 1024) + word % 1024);
  for (std::uint32_t field = 0; field < kChannels * 8; ++field)
    values.push_back(100 * (field / 8) + field % 8);
  const Bytes list = words(values);
  // The number of entries in the second channel's record, and some of them.
  const auto filed = [&](const char* chip, std::initializer_list<const char*> keys) {
    StoragePlatform platform(Array{});
    const Dictionary characteristics{
        {"chip-id", chip}, {"manufacturer-id", "AD825223215F"}, {"num-bus", kChannels}};
    EXPECT_TRUE(logTelemetryList(platform.platform, list, characteristics));
    const auto& records = platform.crashReporting.records;
    if (records.size() != kChannels || records[1].first != 176) return std::string("none");
    std::string text = format("%zu:", records[1].second.size());
    for (const char* key : keys)
      text += " " + textOf(records[1].second.get(key));
    return text;
  };
  EXPECT_EQ(filed("K3V", {"RD", "num_pages", "readStage[22]", "algoNANDAccessesBin[7]"}),
            "135: 100 106 1091 1113");
  EXPECT_EQ(filed("K4V", {"block_type", "readStage[32]", "dspExceptionParameter[37]",
                          "retentionIndication[3]", "retentionIndication[11]"}),
            "175: 105 1110 1026 1076 0");
  EXPECT_EQ(filed("other", {"Max_PE_rate", "readStage[0]", "readStage19NumOfErrorsBin[11]"}),
            "127: 102 1256 0");
}

TEST(StructuredLogTest, FilesDefectsThatLieInTheBuffer) {
  Bytes list = words({0, 3, 2, 0xFFFF'0001, 2, 0xFFFF'FFFF, 4, 5, 6, 0xFFFF'FFFB,  //
                      0xFFFF'0001, 2, 0xFFFF'FFFF, 4, 5, 6, 0xFFFF'FFFB});
  list.pop_back();  // all but one byte of the second is in the buffer
  StoragePlatform platform(Array{});
  EXPECT_TRUE(logDefectsList(platform.platform, list, {}));
  EXPECT_TRUE(logDefectsList(platform.platform, words({0}), {}));
  EXPECT_TRUE(logDefectsList(platform.platform, words({0, 4}), {}));
  const auto& records = platform.crashReporting.records;
  ASSERT_EQ(records.size(), 3U);
  EXPECT_EQ(records[2].second, (Dictionary{{"Factory Count", 4}}));
  EXPECT_EQ(records[0].second, (Dictionary{{"Factory Count", 3}}));
  EXPECT_EQ(textOf(records[1].second),
            R"({"Bus": 1, "CE": 65535, "CAU": 2, "Block": -1, "Cycle": 4, "Reason": 5, )"
            R"("Page": 6, "Temperature": -5})");
}

}  // namespace
}  // namespace tavrel
