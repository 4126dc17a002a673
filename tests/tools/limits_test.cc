// tavrelctl limits, tavrelctl tidy, and a long queue of logs

#include <time.h>

#include "base/civil_time.h"
#include "device.h"
#include "tests/helpers/killed_process.h"

namespace tavrel {
namespace {

const std::int64_t kToday = time(nullptr) / kSecondsPerDay;

void fillStore(const TemporaryDevice& device, int days) {
  std::string lines;
  for (std::int64_t day = kToday - days + 1; day <= kToday; ++day) {
    for (int i = 0; i < 40; ++i) {
      const std::string at = std::to_string(day) + "\tcom.example.key" + std::to_string(i);
      lines += "scalar\t" + at + "\t1\nvalue\t" + at + "\t1\t2.5\n";
    }
  }
  EXPECT_EQ(device.run("stat import", lines).status, 0);
}

TEST(Limits, ShowsAndEnforcesThem) {
  const TemporaryDevice device;
  device.check("tidy", prints("nothing to remove\n"));
  device.check("tidy --quiet", prints(""));
  fillStore(device, 92);
  device.run("stat import", format("scalar\t%lld\tk\t1\n", kToday + 5));
  device.fileLog("outbox/log-tallied-20260101T000000Z-00000001", "L", "{}");
  device.fileLog("outbox/log-tallied-20260102T000000Z-00000001", "L", "{}");
  device.write("/etc/tavrel/limits.plist", xmlOf(R"({"Outbox": {"Days": 1}})"));
  const auto before = device.json("limits")["limits"];
  EXPECT_EQ(before[0]["days"], 93);
  EXPECT_EQ(before[0]["days_limit"], 90);
  EXPECT_EQ(before[2], R"({"name": "Outbox", "days": 2, "days_limit": 1, "bytes": 16384,
                           "bytes_limit": 4194304, "items": 2})"_json);
  const auto dated = [](std::int64_t day) {
    return std::to_string(day) + " (" + dateText(civilFromDays(day)) + ")";
  };
  device.check("tidy", prints("statistics store: 3 days removed, " + dated(kToday - 91) + " to " +
                              dated(kToday - 90) + ", " + dated(kToday + 5) +
                              "\nlogs in the outbox: 1 log removed\n"));
  EXPECT_EQ(device.json("limits")["limits"][2]["items"], 1);
  device.write("/etc/tavrel/limits.plist", xmlOf(R"({"Outbox": 1})"));
  const std::string fault = device.path("/etc/tavrel/limits.plist") +
                            ": Outbox must be a dictionary: nothing is removed until it is "
                            "repaired";
  device.check("tidy --quiet", fails(fault));
  device.check("limits", fails(fault));
}

TEST(Limits, AKillAtAnyMomentLosesNothingThatStays) {
  std::size_t calls = 1;
  for (bool killed = true; killed; calls += 13) {
    SCOPED_TRACE(calls);
    const TemporaryDevice device;
    fillStore(device, 6);
    device.write("/etc/tavrel/limits.plist",
                 xmlOf(R"({"Store": {"Days": 3}, "Pending": {"Days": 1}})"));
    for (const char* day : {"20260101", "20260102", "20260103"})
      device.fileLog(format("pending/log-tallied-%sT000000Z-00000001", day), xmlOf("{}"),
                     R"({"LogName": "log-tallied"})");
    killed = runUntilSystemCall(calls, [&] { device.run("tidy"); });

    EXPECT_EQ(device.run("log list").error, "") << "a log without its metadata";
    EXPECT_EQ(device.run("stat export").status, 0) << "each distribution has its values";
    EXPECT_EQ(device.run("tidy").status, 0);
    EXPECT_EQ(device.json("limits")["limits"][0]["days"], 3);
    EXPECT_EQ(device.json("limits")["limits"][1]["items"], 1);
    ASSERT_LT(calls, 4000U);
  }
  EXPECT_GT(calls, 100U) << "tidy was killed in the store too";
}

TEST(Limits, AListOfLogsStaysShort) {
  const TemporaryDevice device;
  for (int i = 0; i < 103; ++i) {
    device.fileLog(format("pending/StorageStatus-20260101T00%02d%02dZ-00000001", i / 60, i % 60),
                   "L", "{}");
  }
  const Outcome list = device.run("log list");
  EXPECT_TRUE(list.out.ends_with("\n3 older logs not shown: see --all\n")) << list;
  const auto json = device.json("log list");
  EXPECT_EQ(json["logs"].size(), 100U);
  EXPECT_EQ(json["older_logs"], 3);
  EXPECT_NE(json["logs"][0].dump().find("T000003Z"), std::string::npos);
  EXPECT_EQ(device.json("log list --all")["logs"].size(), 103U);
}

}  // namespace
}  // namespace tavrel
