#include "report/bh_report.h"

#include <gtest/gtest.h>

#include "platform/persisted_state.h"
#include "report/histogram.h"
#include "tests/fakes/fake_platform.h"
#include "tests/helpers/fingerprint.h"

namespace tavrel {
namespace {

using plist::Array;
using plist::Dictionary;
using Messages = std::vector<std::string>;

constexpr std::int32_t kDay = 19999;

struct BHReportTest : ::testing::Test {
  fakes::FakePlatform fake;

  BHReportTest() {
    fake.store.scalars = {{"raw", kDay, 1}};
    fake.setWhitelist(
        {{"Group", Dictionary{{"ScalarKeys", Dictionary{{"exact", Dictionary{{"sig_fig", 2}}},
                                                        {"raw", Dictionary::create()}}},
                              {"DistributionKeys",
                               Dictionary{{"plain", Dictionary::create()},
                                          {"bars", Dictionary{{"intervals", Array{10, 20}}}}}}}}});
  }

  Dictionary write(const Array& appInfo = {}) {
    BHReport(fake.platform).writeLogForYesterday(kDay, appInfo);
    return fake.submission.lastLog();
  }
};

TEST_F(BHReportTest, WritesALogWithExactlyItsEntries) {
  fake.store.scalars = {{"exact", kDay, 12345},
                        {"raw", kDay, -7},
                        {"private", kDay, 1},
                        {"raw", kDay - 1, 5},
                        {"raw", kDay + 1, 6}};
  const Dictionary log = write();

  EXPECT_EQ(textOf(log),
            R"({"BHCrashLogVersion": 1, "BHDistributions": {}, "BHDistributionsHistogram": {}, )"
            R"("BHLogCreationDate": "2024-10-04 00:00:00 +0000", "BHMetadata": )"
            R"({"BHPreferredUserInterfaceLanguage": "<unknown>", "BHUserInterfaceLanguage": )"
            R"("<unknown>"}, "BHScalars": {"exact": 12000, "raw": -7}, "BHStartDate": )"
            R"-("2024-10-03 00:00:00 +0000", "BHTaskDigest": "(no tasking digest)", "BHTaskID": )-"
            R"-("(no tasking id)", "BHTasking": [], "BHWhitelistDigest": )-"
            R"("000102030405060708090a0b0c0d0e0f"})");
  ASSERT_EQ(fake.submission.logs.size(), 1U);
  EXPECT_EQ(fake.submission.logs[0].type + fake.submission.logs[0].name, "193log-tallied");
  EXPECT_EQ(fake.log.messages(LogLevel::Info), Messages{"writing tallied log. yesterday=19999"});
}

// On every processor, whatever its byte order and word size.
TEST_F(BHReportTest, ALogHasTheSameBitsEverywhere) {
  fake.store.scalars = {{"exact", kDay, 9'223'372'036'854'775'807}, {"raw", kDay, -(1LL << 62)}};
  std::vector<double> values{1e300, -0.0, 5e-324, 1e-300, 1e22, 10, 20};
  for (int i = 1; i < 1000; ++i)
    values.push_back(i * 0.1 + 1.0 / i);
  fake.store.distributions = {{"bars", kDay, values},
                              {"plain", kDay, {values.begin() + 5, values.end()}}};
  write();
  EXPECT_EQ(fingerprint(fake.submission.logs.at(0).content), 0x21DD10E09375F695U);
}

TEST_F(BHReportTest, CarriesAppInfoAndTasking) {
  const Array apps{Dictionary{{"bundle", "a"}}};
  const Array settings{Dictionary{{"Domain", "d"}, {"Key", "k"}, {"Value", 1}}};
  fake.preferences.domain(kTavrelDomain) =
      Dictionary{{"TaskingID", "task-7"}, {"TaskingDigest", 99}, {"TaskingPayload", settings}};
  const Dictionary log = write(apps);
  EXPECT_EQ(log.get("BHActivatedAppInfo"), plist::Value(apps));
  EXPECT_EQ(log.get("BHTaskID"), plist::Value("task-7"));
  EXPECT_EQ(log.get("BHTaskDigest"), plist::Value(99));
  EXPECT_EQ(log.get("BHTasking"), plist::Value(settings));

  EXPECT_TRUE(write(Array::create()).array("BHActivatedAppInfo"));
}

TEST_F(BHReportTest, SummarisesDistributions) {
  fake.store.distributions = {{"bars", kDay, {5, 10, 15, 20, 25}},
                              {"plain", kDay, {1, 2, 3, 4}},
                              {"private", kDay, {1}},
                              {"bars", kDay - 1, {1}}};
  const Dictionary log = write();
  EXPECT_EQ(textOf(log.get("BHDistributions")),
            R"({"bars": [5, 25, 15, 250, 5], "plain": [1, 4, 2.5, 5, 4]})");
  EXPECT_EQ(textOf(log.get("BHDistributionsHistogram")),
            R"-({"bars": {"(-inf, 10]": 2, "(10, 20]": 2, "(20, inf)": 1}})-");
  EXPECT_EQ(fake.store.keysRead, (std::set<std::string>{"bars", "plain"}));
  EXPECT_EQ(fake.log.messages(LogLevel::Debug), Messages{"Treating key bars as a histogram"});
}

TEST_F(BHReportTest, KeepsTheLaterRowOfADistribution) {
  BHReport report(fake.platform);
  using Row = std::tuple<const char*, std::vector<double>, Array>;
  for (const auto& [key, values, intervals] :
       {Row("broken", {1, 2}, {10}), Row("replaced", {1, 2}, {10}), Row("replaced", {}, {10}),
        Row("single", {7}, {}), Row("zero", {0.0, -0.0}, {}), Row("negative", {-0.0, 0.0}, {})}) {
    fakes::FakeDistribution row(values);
    row.fails = key == std::string("broken");
    report.computeAndAddDistribution(row, key, {{"intervals", intervals}});
  }
  report.serializeWithDate(kDay, {});
  const Dictionary log = fake.submission.lastLog();
  EXPECT_EQ(textOf(log.get("BHDistributions")),
            R"({"negative": [-0, -0, 0, 0, 2], "replaced": [0, 0, 0, 0, 0], )"
            R"("single": [7, 7, 7, 0, 1], "zero": [0, 0, 0, 0, 2]})");
  EXPECT_TRUE(log.dictionary("BHDistributionsHistogram").empty());
}

TEST_F(BHReportTest, SummarisesWithoutAHistogramThatIsTooLarge) {
  Array boundaries = Array::create();
  for (std::size_t i = 0; i < limits::kHistogramBoundaries; ++i)
    boundaries.append(i);
  EXPECT_TRUE(Histogram::create(boundaries));
  boundaries.append(0);
  BHReport report(fake.platform);
  fakes::FakeDistribution values({3});
  report.computeAndAddDistribution(values, "k", {{"intervals", boundaries}});
  EXPECT_EQ(
      fake.log.messages(),
      Messages{"Couldn't allocate histCounts for key k. Will not calculate histogram values"});
  report.serializeWithDate(kDay, {});
  EXPECT_EQ(textOf(fake.submission.lastLog().get("BHDistributions")), R"({"k": [3, 3, 3, 0, 1]})");
}

TEST_F(BHReportTest, WritesNothingWhenNothingWasCollected) {
  fake.store.scalars = {{"private", kDay, 1}};
  EXPECT_FALSE(write());
  fake.files.contents.clear();
  fake.store.scalars = {{"raw", kDay, 1}};
  EXPECT_FALSE(write());
  EXPECT_EQ(fake.journal, fakes::Journal{});
}

TEST_F(BHReportTest, TellsAboutAChangedOSVersionOnce) {
  write();
  EXPECT_EQ(fake.submission.logs[0].options, (Dictionary{{"previous_os_version", "<unknown>"}}));
  EXPECT_EQ(fake.journal, (fakes::Journal{"set com.norvane.tallied.tavrel LastOSVersion",
                                          "synchronize com.norvane.tallied.tavrel", "write log"}));
  write();
  EXPECT_FALSE(fake.submission.logs[1].options);

  fake.submission.osVersion = "unknown";  // for one run, which is no change
  write();
  EXPECT_FALSE(fake.submission.logs[2].options);

  fake.submission.osVersion = "Pellio 7.2 (21B1)";
  write();
  EXPECT_EQ(fake.submission.logs[3].options,
            (Dictionary{{"previous_os_version", "Pellio 7.1 (21A5)"}}));
}

TEST_F(BHReportTest, NamesTheConfigurationOfInternalDevices) {
  fake.preferences.domain(kTavrelDomain).set("LastOSVersion", fake.submission.osVersion);
  const auto optionsFor = [this](const plist::Value& answer) {
    fake.answers.answers.set("ConfigNumber", answer);
    write();
    return fake.submission.logs.back().options;
  };
  EXPECT_FALSE(optionsFor(plist::Data(asBytes("C-17"))));
  fake.submission.internalDiagnostics.insert("com.norvane.zentrix.tallied.tavrel");
  const Dictionary named{{"ConfigNumber", "C-17"}};
  EXPECT_EQ(optionsFor(plist::Data(asBytes("C-17"))), named);
  EXPECT_EQ(optionsFor(plist::Data(asBytes({"C-17\0\xFF", 6}))), named);
  for (const plist::Value& bad : {plist::Value(plist::Data(asBytes("\xFF"))), {"C-17"}, {}})
    EXPECT_FALSE(optionsFor(bad));
}

TEST_F(BHReportTest, ReportsWhichStepFailed) {
  fake.submission.fails = true;
  write();
  EXPECT_EQ(fake.log.messages(LogLevel::Error), Messages{"Failed to write tallied log"});
  EXPECT_TRUE(fake.preferences.domain(kTavrelDomain).contains("LastOSVersion"));

  // An instant beyond the calendar cannot be encoded.
  fake.clock.instant = plist::Date::sinceEpoch(1e300);
  fake.preferences.domain(kTavrelDomain).remove("LastOSVersion");
  fake.journal.clear();
  write();
  const std::string last = fake.log.messages(LogLevel::Error).back();
  EXPECT_TRUE(last.starts_with("Could not create tallied plist: ")) << last;
  EXPECT_EQ(fake.journal, fakes::Journal{});
}

}  // namespace
}  // namespace tavrel
