#include <gtest/gtest.h>
#include <stdexcept>

#include "platform/platform_exception.h"
#include "storage/parse/nand_log_writer.h"
#include "tests/fakes/fake_platform.h"

namespace tavrel {
namespace {

using namespace fakes;
using plist::Array;
using plist::Data;
using plist::Dictionary;
using plist::Value;

class NandLog : public testing::Test {
 protected:
  NandLog() { fake.clock.instant = start; }

  // Returns the number of logs afterwards.
  std::size_t write(const Dictionary& statistics) {
    NLW_WriteLog(fake.platform, "165", statistics);
    return fake.submission.logs.size();
  }

  const plist::Date start = plist::Date::since1970(1794852138);
  const Dictionary none = Dictionary::create();
  FakePlatform fake;
  Dictionary preferences = fake.preferences.domain("com.norvane.zentrix.tavrel");
};

TEST_F(NandLog, WritesEveryFigureUnderAHeader) {
  fake.answers.answers.set("InverseDeviceID", "faultline");
  using Case = std::pair<const char*, Value>;
  auto figures = Dictionary::create();
  for (const auto& [key, value] :
       {Case("UserWamp", 2.5), Case("single", 0.125F), Case("hostWrites", 42),
        Case("most", UINT64_MAX), Case("yes", true), Case("name", "text"), Case("when", start),
        Case("bytes", Data(ByteSpan{})), Case("inner", Dictionary{{"a", 1}}),
        Case("ValidityList[0]", Array{12, 40, 7}), Case("mixed", Array{"a", 0.5, false, Array{1}}),
        Case("flags", Array{true}), Case("texts", Array{"1", Array{1}}),
        Case("empty", Array::create()), Case("bad \xff utf-8", -0.001)})
    figures.set(key, value);
  ASSERT_EQ(write(figures), 1U);
  const auto& log = fake.submission.logs[0];
  EXPECT_EQ(log.type + log.name, "165StorageStatus");
  EXPECT_FALSE(log.options);
  EXPECT_EQ(log.content,
            "System ID: system-id\nHardware Model: Model1,1\nOS Version: Pellio 7.1 (21A5)\n"
            "Date: 2026-11-16 18:02:18 +0000\nIncident ID: incident-id\nFaultline Key: faultline\n"
            "\n2026-11-16 18:02:18 +0000 tavrel[211]: UserWamp:2.50;single:0.12;hostWrites:42;"
            "most:18446744073709551615;yes:1;ValidityList[0]:12,40,7;mixed:a,0.5,0,[1];flags:1;"
            "bad \xEF\xBF\xBD utf-8:-0.00\n");
  EXPECT_EQ(fake.journal, (Journal{"write log", "set com.norvane.zentrix.tavrel SSLastLoggedAt",
                                   "synchronize com.norvane.zentrix.tavrel"}));
}

TEST_F(NandLog, WaitsAWeekWhateverTheSubmissionSaid) {
  EXPECT_EQ(write({}), 0U);
  EXPECT_TRUE(fake.journal.empty());
  preferences.set("SSLastLoggedAt", "2026-11-16");  // not a date
  fake.submission.fails = true;
  write(none);
  EXPECT_EQ(preferences.date("SSLastLoggedAt"), start);
  EXPECT_TRUE(fake.log.entries.empty());
  fake.submission.fails = false;
  for (const double seconds : {604799.0, -1.0}) {
    fake.clock.instant = plist::Date::since1970(start.secondsSince1970() + seconds);
    EXPECT_EQ(write(none), 0U);
    EXPECT_EQ(fake.log.messages().back(),
              format("NANDLogWriter:Last written at 2026-11-16 18:02:18 +0000 current %@ :skipped",
                     fake.clock.instant));
  }
  fake.clock.instant = plist::Date::since1970(start.secondsSince1970() + 604800);
  fake.answers.answers.set("InverseDeviceID", 5);
  ASSERT_EQ(write(none), 1U);
  EXPECT_TRUE(fake.submission.logs[0].content.ends_with(
      "Faultline Key: error\n\n2026-11-23 18:02:18 +0000 tavrel[211]: \n"));
}

TEST_F(NandLog, CatchesTheExceptionsOfThePlatformOnly) {
  fake.dateFormatting.raises = std::make_exception_ptr(PlatformException("RangeException"));
  write(none);
  EXPECT_EQ(fake.log.messages(), Journal{"An exception occurred: RangeException"});
  fake.dateFormatting.raises = std::make_exception_ptr(std::runtime_error("of another kind"));
  EXPECT_THROW(write(none), std::runtime_error);
  EXPECT_TRUE(fake.journal.empty());
}

}  // namespace
}  // namespace tavrel
