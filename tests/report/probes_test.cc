#include <gtest/gtest.h>

#include "report/bh_report.h"
#include "tests/fakes/fake_platform.h"

namespace tavrel {
namespace {

using plist::Dictionary;
using Messages = std::vector<std::string>;

constexpr const char* kDatabase = "/var/mobile/Library/Brimhold/BHDataStore.sqlitedb";

struct ProbesTest : ::testing::Test {
  fakes::FakePlatform fake;

  /// The log of a report with one scalar and those probes whose keys are whitelisted.
  Dictionary logWith(const Dictionary& probeKeys) {
    Dictionary keys = mutableCopy(probeKeys);
    keys.set("collected", Dictionary::create());
    fake.setWhitelist({{"g", Dictionary{{"ScalarKeys", keys}}}});
    fake.store.scalars = {{"collected", 19999, 1}};
    BHReport(fake.platform).writeLogForYesterday(19999, {});
    return fake.submission.lastLog();
  }
  plist::Value probe(std::string_view key, const Dictionary& options = Dictionary::create()) {
    return logWith({{key, options}}).dictionary("BHScalars").get(key);
  }
};

TEST_F(ProbesTest, MeasureOnlyWhatIsWhitelisted) {
  fake.preferences.domain("com.norvane.tallied") = {{"DatabaseCorruptionCount", 3}};
  const Dictionary log = logWith(Dictionary::create());
  EXPECT_EQ(log.get("BHScalars"), plist::Value(Dictionary{{"collected", 1}}));
  EXPECT_EQ(fake.applications.enumerations, 0);
  EXPECT_EQ(fake.loader.loads, 0);
  EXPECT_EQ(fake.preferences.domain("com.norvane.tallied").get("DatabaseCorruptionCount"),
            plist::Value(3));
}

TEST_F(ProbesTest, CountApplications) {
  fake.applications.bundles = {{"a", "System"}, {"b", "User"}, {"c", "User"}};
  constexpr const char* kAll = "com.norvane.lumenhall.numAllInstalledApps";
  constexpr const char* kUser = "com.norvane.lumenhall.numThirdPartyApps";
  EXPECT_EQ(logWith({{kAll, Dictionary::create()}, {kUser, Dictionary::create()}}).get("BHScalars"),
            plist::Value(Dictionary{{"collected", 1}, {kAll, 3}, {kUser, 2}}));
  EXPECT_EQ(fake.applications.enumerations, 1);
  EXPECT_EQ(probe(kUser), plist::Value(2));
}

TEST_F(ProbesTest, TellLanguagesAndRegion) {
  fake.locale.preferred = {"de-AT", "en"};
  fake.locale.matched = {"de", "en"};
  fake.locale.country = "AT";
  EXPECT_EQ(textOf(logWith(Dictionary::create()).get("BHMetadata")),
            R"({"BHPreferredUserInterfaceLanguage": "de-AT", )"
            R"("BHUserInterfaceLanguage": "de", "BHUserSetRegionFormat": "AT"})");
}

TEST_F(ProbesTest, ReportTheDatabase) {
  constexpr const char* kSize = "com.norvane.zentrix.bhd.database.size";
  EXPECT_EQ(probe(kSize), plist::Value(-1));
  fake.files.contents[kDatabase] = std::string(1048575, 'x');
  EXPECT_EQ(probe(kSize), plist::Value(0));
  fake.files.contents[kDatabase] += 'x';
  EXPECT_EQ(probe(kSize), plist::Value(1));
  fake.files.contents[kDatabase] = std::string(std::size_t{17} << 20, 'x');
  EXPECT_EQ(probe(kSize, {{"sig_fig", 1}}), plist::Value(20));
}

TEST_F(ProbesTest, TakeTheCorruptionCount) {
  constexpr const char* kCorruptions = "com.norvane.zentrix.bhd.database.corruptions";
  Dictionary& preferences = fake.preferences.domain("com.norvane.tallied");
  const plist::Value three(3);
  preferences = {{"DatabaseCorruptionCount", 3}};

  // Whatever part of the library is missing, the count is left alone.
  const std::tuple<bool, std::set<std::string, std::less<>>, Messages> kCases[] = {
      {false, {}, {"Failed to dynamically load the FaultlineSupport framework"}},
      {true,
       {"ZTXPreferencesGetIntegerValue", "ZTXPreferencesSetValue"},
       {"Failed to dyanmically link ZTXPreferencesGetIntegerValue",
        "Failed to dynamically link ZTXPreferencesSetValue"}},
      {true, {"ZTXPreferencesSetValue"}, {"Failed to dynamically link ZTXPreferencesSetValue"}}};
  for (const auto& [isPresent, missing, messages] : kCases) {
    fake.loader.isPresent = isPresent;
    fake.loader.missing = missing;
    fake.log.entries.clear();
    EXPECT_EQ(probe(kCorruptions), plist::Value(0));
    EXPECT_EQ(fake.log.messages(LogLevel::Error), messages);
    EXPECT_EQ(preferences.get("DatabaseCorruptionCount"), three);
  }

  fake.loader.missing.clear();
  fake.journal.clear();
  EXPECT_EQ(probe(kCorruptions), three);
  EXPECT_EQ(preferences.get("DatabaseCorruptionCount"), plist::Value(0));
  EXPECT_EQ(fake.journal,
            (fakes::Journal{"set com.norvane.tallied DatabaseCorruptionCount", "write log"}));
  // Functions that were found are not looked up again.
  const int loads = fake.loader.loads;
  EXPECT_EQ(probe(kCorruptions), plist::Value(0));
  EXPECT_EQ(fake.loader.loads, loads);
}

TEST_F(ProbesTest, CountMinutesOfUptime) {
  constexpr const char* kUptime = "com.norvane.usage.cur_boot_session_cpu_uptime";
  using Case = std::tuple<std::uint64_t, std::optional<Clock::TimeBase>, std::int64_t>;
  for (const auto& [ticks, base, minutes] :
       {Case(0, {{1, 1}}, 0), Case(59'999'999'999, {{1, 1}}, 0),
        Case(7'260'000'000'000, {{1, 1}}, 121), Case(24'000'000ULL * 600, {{125, 3}}, 10),
        Case(UINT64_MAX, {{4294967295, 1}},
             static_cast<std::int64_t>(4294967295 * 1e-9 / 1 / 60 * 18446744073709551616.0)),
        Case(1, {{1, 0}}, -1), Case(1, std::nullopt, -1)}) {
    fake.clock.tickCount = ticks;
    fake.clock.base = base;
    fake.log.entries.clear();
    EXPECT_EQ(probe(kUptime), plist::Value(minutes)) << ticks;
    EXPECT_EQ(fake.log.messages(LogLevel::Error),
              minutes < 0 ? Messages{"Couldn't retrieve mach_timebase_info"} : Messages{});
  }
}

TEST_F(ProbesTest, ReadSystemControls) {
  using Case = std::tuple<std::string, std::string, std::size_t>;
  for (const auto& [prefix, name, length] :
       {Case("kern.", "memorystatus_freeze_count", 4),
        Case("kern.", "memorystatus_freeze_pageouts", 8),
        Case("kern.", "memorystatus_freeze_budget_pages_remaining", 8),
        Case("kern.", "memorystatus_thaw_count", 4), Case("vm.", "swapusage", 32)}) {
    const std::string key = "com.norvane.kernel." + name;
    const plist::Value failure = length == 4 ? 4294967295 : -1;
    EXPECT_EQ(probe(key), failure) << key;
    auto& value = fake.controls.values[prefix + name];
    value.assign(length, std::byte{0xFF});
    EXPECT_EQ(probe(key), failure) << key;
    value.assign(length, std::byte{0});
    value[1] = std::byte{2};
    EXPECT_EQ(probe(key), plist::Value(512)) << key;
    value.push_back(std::byte{0});  // longer than the buffer
    EXPECT_EQ(probe(key), failure) << key;
  }
}

}  // namespace
}  // namespace tavrel
