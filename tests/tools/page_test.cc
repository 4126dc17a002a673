// tavrelctl page
#include <regex>

#include "device.h"
#include "tools/console/day_argument.h"

namespace tavrel {
namespace {

std::ptrdiff_t countOf(const std::string& text, const std::string& expression) {
  const std::regex pattern(expression);
  return std::distance(std::sregex_iterator(text.begin(), text.end(), pattern), {});
}

struct PageTest : DeviceTest {
  void import(const std::string& lines) const {
    ASSERT_EQ(device.run("stat import -", lines).status, 0);
  }

  /// The page without its style sheet, and with each tag replaced by a blank.
  std::string textOf(const std::string& options = {}, int status = 0) const {
    const Outcome outcome = device.run("page -o - " + options);
    EXPECT_EQ(outcome.status, status) << outcome.error;
    for (const char* element : {"table", "section", "svg"})
      EXPECT_EQ(countOf(outcome.out, std::string("<") + element + "[ >]"),
                countOf(outcome.out, std::string("</") + element + ">"));
    const std::string body = outcome.out.substr(outcome.out.find("</head>") + 7);
    return std::regex_replace(std::regex_replace(body, std::regex("<wbr>"), ""),
                              std::regex("(<[^>]*>|\\s)+"), " ");
  }
};

TEST_F(PageTest, TellsOfADeviceThatHasNothing) {
  const std::string yesterday = dayDateText(today() - 1);
  expectIn(textOf(), {"Device on " + yesterday, "Logs may leave the device Not allowed",
                      "Logs that wait All empty", "recorded no scalar on " + yesterday,
                      "recorded nothing on these days", "No driver of this device reports",
                      "No drive of this device reports"});
  EXPECT_EQ(device.run("page -o -").error,
            "tavrelctl: cannot read " + device.path(kWhitelistFile) +
                ": No such file or directory: write a whitelist, as tavrel(8) describes it\n");
  EXPECT_EQ(device.files(), TemporaryDevice().files());
}

TEST_F(PageTest, ShowsTheLastWholeDayWithStatistics) {
  // How many days ago statistics were recorded, and how many days ago the shown day is.
  const std::pair<int, int> kDays[] = {{100, 100}, {0, 0}, {3, 3}, {1, 1}};
  for (const auto& [recorded, shown] : kDays) {
    import("scalar\t" + std::to_string(today() - recorded) + "\tk\t1\n");
    expectIn(textOf(), {"Device on " + dayDateText(today() - shown), "k 1 not in it"});
  }
  device.write("/proc/uptime", "5\n");
  for (const char* line : {"0/name POLL", "0/time 25", "1/name C1", "1/time 75"})
    device.write("/sys/devices/system/cpu/cpu0/cpuidle/state" + std::string(line, 6), line + 7);
  expectIn(textOf("--day 20000 --days 400"),
           {"Device on 2024-10-04", "Trends over 400 days",
            "since the drivers began to count. cpu0.idle_states Residency of",
            "POLL 25.0 % 25 µs C1 75.0 % 75 µs"});
}

TEST_F(PageTest, TellsWhatLeaves) {
  const std::string near = "1\u202F000\u202F000\u202F000";
  const std::string most = "9\u202F223\u202F372\u202F036\u202F854\u202F775\u202F80";
  import(
      format("scalar\t%d\tcom.example.t\t9223372036854775806\n", today() - 2) +
      "scalar\tyesterday\tcom.example.t\t9223372036854775807\n"
      "scalar\tyesterday\tcom.example.s\t1234\nvalue\tyesterday\tcom.example.e\t1\t1000000000.2\n"
      "value\tyesterday\tcom.example.e\t2\t1000000000.4\n"
      "value\tyesterday\tcom.example.d\t1\t3\nvalue\tyesterday\tcom.example.d\t2\tinf\n"
      "value\tyesterday\tcom.example.d\t3\tnan\n");
  expectIn(textOf(), {"2 scalars. None leaves the device, because there is no log of this day: "});
  device.write(kWhitelistFile, xmlOf(R"({"Usage": {
      "ScalarKeys": {"com.example.s": {"sig_fig": 1}},
      "DistributionKeys": {"com.example.d": {"intervals": [2, 4]}}}})"));
  expectIn(textOf(),
           {"2 scalars, of which the log of this day has 1. That log stays here: the owner "
            "has not allowed it",
            "com.example.s 1234 1000 com.example.t " + most + "7 not in it",
            "Values 3 Range 3 to inf Median 3 Mean inf Not a number 1",
            "Range " + near + ".2 to " + near + ".4", "com.example.t " + most + "7 " + most + "6",
            "and how many values are in (2, 4] 1 (4, inf) 2"});
  const std::string page = device.run("page -o -").out;
  expectIn(page,
           {"M28 100l1 -100\"", format("lowest %s, highest %s, last mean %s", near, near, near),
            "com.example.d: no finite data"});
  ASSERT_EQ(device.run("allow --from yesterday").status, 0);
  expectIn(textOf(), {"The owner lets that log leave the device",
                      "Logs may leave the device From " + dayDateText(today() - 1) + " on"});
}

TEST_F(PageTest, SaysWhatItLeavesOut) {
  std::string lines;
  for (int i = 0; i < 1300; ++i)
    lines += "scalar\tyesterday\tcom.example." + std::string(60, '"') + std::to_string(i) + "\t1\n";
  for (int i = 0; i < 150; ++i)
    lines += "value\tyesterday\tcom.example.d" + std::to_string(i) + "\t1\t2\n";
  for (const char* value : {"1\t1", "2\t1", "3\t1000000"})
    lines += "value\tyesterday\tcom.example." + std::string(60, '"') + "1200d\t" + value + "\n";
  std::string bounds;
  for (int i = 1; i <= 70; ++i) {
    bounds += format("%d, ", i);
    for (int n = 0; n < (i > 7 ? 2 : 1); ++n)
      lines += format("value\tyesterday\tcom.example.d0\t%d\t%d\n", i + 100 * n, i);
  }
  import(lines);
  device.write(kWhitelistFile, xmlOf(R"({"Usage": {"DistributionKeys": {"com.example.d0": {
      "intervals": [)" + bounds + "71]}}}}"));
  const std::string size = device.run("page --days 400 -o -").out;
  EXPECT_LT(size.size(), 2'000'000U);
  const std::string day = "tavrelctl stat list --day " + dayDateText(today() - 1);
  const std::string text = textOf("--days 400");
  expectIn(text, {"(1, 2] 2 (7, 8] 2", "(69, 70] 2 6 more intervals with 6 values together ",
                  "Not shown for lack of space: 51 distributions; " + day + " has them all",
                  "1331 more statistics without a chart",
                  "1200d 1 1 1\u202F000\u202F000 mean 333\u202F334"});
  EXPECT_EQ(countOf(text, "lack of space: (\\d+) (scalars|statistics);"), 2);
}

TEST_F(PageTest, EstimatesHowLongDrivesLast) {
  // The last four had a predecessor of the same name.
  const std::tuple<const char*, int, int> wear[] = {
      {"mmcblk1.life_a_pct", 11, 10}, {"mmcblk1.life_a_pct", 1, 30}, {"mmcblk2.life_b_pct", 11, 10},
      {"mmcblk2.life_b_pct", 1, 40},  {"nvme8.used_pct", 11, 89},    {"nvme8.used_pct", 1, 99},
      {"nvme3.used_pct", 11, 40},     {"nvme3.used_pct", 1, 50},     {"nvme4.used_pct", 11, 10},
      {"nvme4.used_pct", 10, 59},     {"nvme4.used_pct", 1, 60},     {"nvme5.used_pct", 11, 20},
      {"nvme5.used_pct", 10, 2},      {"nvme5.used_pct", 1, 24},     {"nvme6.used_pct", 11, 40},
      {"nvme6.used_pct", 1, 50},      {"nvme7.used_pct", 11, 40}};
  std::string rows;
  for (const auto& [figure, ago, percent] : wear)
    rows += format("scalar\t%d\tcom.norvane.ioreport.%s\t%d\n", today() - ago, figure, percent);
  import(rows);
  device.writeDrive("nvme0", "nvme", R"("used_pct": 10, "power_on_hours": 2400)");
  device.writeDrive("nvme1", "nvme", R"("used_pct": 100)");
  device.writeDrive("nvme2", "nvme", R"("used_pct": 0, "power_on_hours": 9)");
  device.writeDrive("nvme3", "nvme", R"("used_pct": 50, "power_on_hours": 9)");
  device.writeDrive("nvme4", "nvme", R"("used_pct": 60, "power_on_hours": 2304)");
  device.writeDrive("nvme5", "nvme", R"("used_pct": 24, "power_on_hours": 720)");
  device.writeDrive("nvme6", "nvme", R"("used_pct": 3, "power_on_hours": 720)");
  device.writeDrive("nvme7", "nvme", R"("used_pct": 3)");
  device.writeDrive("mmcblk0", "emmc", R"("life_a_pct": 10, "life_b_pct": 20)");
  device.writeDrive("mmcblk1", "emmc", R"("life_a_pct": 30)");
  device.writeDrive("mmcblk2", "emmc", R"("life_b_pct": 40)");
  device.writeDrive("mmcblk3", "emmc", R"("life_a_pct": 100)");
  device.writeDrive("mmcblk4", "emmc", R"("life_a_pct": 110)");
  device.writeDrive("nvme8", "nvme", R"("used_pct": 99)");
  device.writeDrive("sda", "ata", R"("smart_good": 0)");
  expectIn(textOf(),
           {"About 2.5 years of operation at the pace of its life so far",
            "Its rated life is used up used 100.0 % left 0.0 % Figure Value Meaning nvme1",
            "Its rated life is used up used 100.0 % left 0.0 % Figure Value Meaning mmcblk4",
            "At most a tenth of its rated life used at most 100.0 % left at least 0.0 %",
            "Not known yet: its wear has grown by fewer than three steps on these days",
            "About 20 days at the pace of the days on this page used at most 40.0 %",
            "About 1 day at the pace", "Not known yet: no wear so far",
            "About 50 days at the pace of the days on this page",
            "About 64 days of operation at the pace of its life so far",
            "About 31 days at the pace of the days on this page",
            "About 2.7 years of operation at the pace of its life so far",
            "Not known yet: it has replaced another drive on these days",
            "Not known yet: its wear has not changed on these days",
            "Not known: the drive reports no wear", "failing, SMART status is failing"});
}

TEST_F(PageTest, RefusesWhatItCannotDo) {
  device.check("page", fails("--output is required: see 'tavrelctl page --help'", 2));
  for (const char* days : {"0", "401", "x"}) {
    const Outcome outcome = device.run("page -o - --days " + std::string(days));
    EXPECT_EQ(outcome.status, 2) << outcome;
  }
  EXPECT_EQ(device.run("page -o - --day tomorrow").status, 2);
  const std::string nowhere = device.path("/nowhere/x.html");
  const Outcome outcome = device.run("page -o " + nowhere);
  EXPECT_EQ(outcome.status, 1);
  expectIn(outcome.error, {"cannot write " + nowhere});
  device.write(kStore, "no database");
  expectIn(textOf("", 1), {"Something is missing: ", "Critical"});
}

}  // namespace
}  // namespace tavrel
