#include <bit>
#include <csignal>
#include <regex>
#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>

#include "base/limits.h"
#include "device.h"
#include "tools/shared/tool_context.h"
#include "tools/stat/collect.h"
#include "tools/stat/collect_state.h"
#include "tools/stat/import_lines.h"
#include "tools/stat/import_number.h"
#include "tools/stat/machine_statistics.h"
#include "tools/stat/value_summary.h"

namespace tavrel {
namespace {

TEST(ExactDouble, ReadsWhatStrtodReadsAndWritesEveryBit) {
  using Case = std::tuple<const char*, std::uint64_t, const char*>;
  for (const auto& [text, bits, shown] :
       {Case("0", 0, "0"), Case("-0", 0x8000000000000000, "-0"),
        Case("+1.5", 0x3FF8000000000000, "1.5"), Case(" 1", 0x3FF0000000000000, "1"),
        Case(".5e1", 0x4014000000000000, "5"), Case("0x1.8p-3", 0x3FC8000000000000, "0.1875"),
        Case("-0X.8P+1", 0xBFF0000000000000, "-1"), Case("0.1", 0x3FB999999999999A, "0.1"),
        Case("9007199254740993", 0x4340000000000000, "9007199254740992"),
        Case("4.9406564584124654e-324", 1, "5e-324"), Case("1e-400", 0, "0"),
        Case("1.7976931348623157e308", 0x7FEFFFFFFFFFFFFF, "1.7976931348623157e+308"),
        Case("inf", 0x7FF0000000000000, "inf"), Case("-Infinity", 0xFFF0000000000000, "-inf"),
        Case("+NaN()", 0x7FF8000000000000, "nan"), Case("-nan", 0xFFF8000000000000, "-nan"),
        Case("nan(0x123)", 0x7FF8000000000123, "nan(0x123)"),
        Case("nan(text)", 0x7FF8000000000000, "nan"),
        Case("-nan(9218868437227405313)", 0xFFF0000000000001, "-nan(0x7ff0000000000001)")}) {
    const auto value = parseExactDouble(text);
    ASSERT_TRUE(value) << text << value.error().message;
    EXPECT_EQ(std::bit_cast<std::uint64_t>(*value), bits) << text;
    std::string written;
    appendExactDouble(written, *value);
    EXPECT_EQ(written, shown);
    EXPECT_EQ(std::bit_cast<std::uint64_t>(*parseExactDouble(written)), bits) << written;
  }
  for (const char* text : {"", " ", "x", "1x", "1 ", "--1", "0x", "nan(", "nan(-1)", "infinit"})
    EXPECT_FALSE(parseExactDouble(text)) << text;
  EXPECT_EQ(parseExactDouble("-1e309").error().message, "beyond the range of a double: -1e309");
}

using StatImport = DeviceTest;

TEST_F(StatImport, RefusesABadLineAndKeepsNothing) {
  const std::string kScalar =
      "a scalar has four fields, separated by tabs: scalar, day, key, integer";
  const std::string kDay = ": give today, yesterday, a 32-bit day number or YYYY-MM-DD";
  const std::pair<std::string, std::string> cases[] = {
      {"", "the line is empty"},
      {"gauge\t1\tk\t1",
       "a line begins with \"scalar\" or \"value\" and a tab, not with: gauge\\t1\\tk\\t1"},
      {"scalar\t1\tk", kScalar},
      {"scalar\t1\tk\t1\t", kScalar},
      {"value\t1\tk\t1",
       "a value has five fields, separated by tabs: value, day, key, seconds, number"},
      {"scalar\t2147483648\tk\t1", "not a day: 2147483648" + kDay},
      {"scalar\t2026-02-29\tk\t1", "not a day: 2026-02-29" + kDay},
      {"scalar\t1\tk\xFF\t1", "a key is not UTF-8: k\\xff"},
      {"scalar\t1\t\t1", "the key is empty"},
      {"scalar\t1\tk\t9223372036854775808", "not a 64-bit integer: 9223372036854775808"},
      {"scalar\t1\tk\t1\r", "not a 64-bit integer: 1\\x0d"},
      {"value\t1\tk\t-1\t1", "seconds within the day are 0 to 86399, not: -1"},
      {"value\t1\tk\t86400\t1", "seconds within the day are 0 to 86399, not: 86400"},
      {"value\t1\tk\t1\tone", "not a number: one"},
      {std::string(3U << 20, 'x'), "a line has more than 1052672 bytes"}};
  device.check("stat set before 1", prints(""));
  const auto before = device.run("stat export");
  for (const auto& [line, reason] : cases) {
    const std::string good = "scalar\t1\tk\t1\nvalue\t1\tk\t1\t1\n";
    device.check("stat import",
                 fails("standard input:3: " + reason + "; nothing of the file was kept"),
                 good + line + "\n" + good);
  }
  device.check("stat import /nonexistent",
               fails("cannot open /nonexistent: No such file or directory"));
  device.check("stat import /",
               fails("cannot read /: Is a directory; nothing of the file was kept"));
  device.check("stat export", before);
}

TEST_F(StatImport, ExportGivesBackWhatWasImported) {
  std::string lines =
      "scalar\t-2147483648\tfirst\t-9223372036854775808\nscalar\t1\ta\t0\n"
      "scalar\t1\tk\xC3\xA9\t1\nscalar\t2147483647\t" +
      std::string(100'000, 'k') + "\t9223372036854775807\n";
  for (int i = 0; i < 3000; ++i)
    lines += format("value\t1\td\t%d\t%d.25\n", i, i);
  lines += "value\t1\te\t86399\tnan(0x7ff0000000000001)\nvalue\t1\te\t0\t-0\nvalue\t2\td\t0\t-inf";
  device.check("stat import", prints("standard input: 4 scalars, 3003 values\n"), lines);
  device.check("stat export", prints(lines + "\n"));
  device.check("stat export d --day 1970-01-03", prints("value\t2\td\t0\t-inf\n"));

  const TemporaryDevice other;
  const std::string file = other.path("/lines");
  other.write("/lines", "scalar\t1970-01-02\tk\t1\nscalar\t1\tk\t2\n");
  EXPECT_EQ(other.json("stat import " + file),
            nlohmann::json({{"format_version", 1}, {"file", file}, {"scalars", 2}, {"values", 0}}));
  other.check("stat import -", prints("standard input: 0 scalars, 1 value\n"),
              "value\t1\td\t7\t0x1p1\n");
  other.check("stat list", prints("DAY             KIND            VALUE  KEY\n"
                                  "1 (1970-01-02)  scalar              2  k\n"
                                  "1 (1970-01-02)  distribution  1 value  d\n"));
  EXPECT_EQ(other.json("stat list d"), R"({"format_version": 1, "scalars": [], "distributions": [
      {"key": "d", "day": 1, "date": "1970-01-02", "count": 1}]})"_json);
  other.check("stat list --day 2", prints("no statistics\n"));
  other.run("stat import", "scalar\t3\ta key that is cut\t5\n");
  other.check("stat list a",
              prints("DAY             KIND    VALUE  KEY\n"
                     "3 (1970-01-04)  scalar      5  a key that is…\n"),
              "", 45);
  other.run("stat import", "scalar\ttoday\tt\t1\nscalar\tyesterday\tt\t2\n");
  EXPECT_TRUE(other.run("stat export t --day yesterday").out.ends_with("\tt\t2\n"));
  EXPECT_TRUE(other.run("stat export t --day today").out.ends_with("\tt\t1\n"));
}

TEST(StatList, KeepsColumnsOverAnyNumberOfRowsAndStopsAtThePrefix) {
  const TemporaryDevice device;
  const std::string odd = "k\"\x1b\xC3\xA9";
  std::string lines =
      "scalar\t-2\tk1026\t-9223372036854775808\nscalar\t9\t" + odd + "\t1\nscalar\t9\tl\t3\n";
  for (int i = 0; i < 1025; ++i)
    lines += format("scalar\t-1\tk%04d\t%d\n", i, i);
  device.check("stat import", prints("standard input: 1028 scalars, 0 values\n"), lines);
  for (const std::optional<std::size_t> columns : {std::optional<std::size_t>(), {38}}) {
    device.check("stat list k --day 9",
                 prints("DAY             KIND    VALUE  KEY\n"
                        "9 (1970-01-10)  scalar      1  k\"\\x1b\xC3\xA9\n"),
                 "", columns);
  }
  device.check("stat list k1 --day -2",
               prints("DAY              KIND                   VALUE  KEY\n"
                      "-2 (1969-12-30)  scalar  -9223372036854775808  k1026\n"),
               "", 49);
  const std::string all = device.run("stat list").out;
  std::istringstream stream(all);
  std::size_t rows = 0;
  for (std::string line; std::getline(stream, line); ++rows)
    EXPECT_EQ(line.rfind("  "), 51U) << line;
  EXPECT_EQ(rows, 1029U);
  EXPECT_TRUE(all.ends_with(
      " 1  k\"\\x1b\xC3\xA9\n9 (1970-01-10)   scalar                           3  l\n"))
      << all.substr(all.size() - 200);
  EXPECT_EQ(device.json({"stat", "list", odd})["scalars"][0]["key"], odd);
}

TEST(StatShow, SaysWhatAStatisticComesTo) {
  const TemporaryDevice device;
  std::string lines =
      "scalar\t3\tv\t1\nscalar\t19999\tk\t-5\nscalar\t20001\tk\t7\nscalar\ttoday\tl\t1\n";
  for (int i = 1; i <= 200; ++i)
    lines += format("value\t%d\tk\t1\t%d\n", i <= 100 ? 20000 : 20001, 101 - i);
  device.run("stat import", lines +
                                "value\t20001\tk\t2\tnan\nvalue\t3\tw\t0\t-inf\n"
                                "value\t3\tw\t0\t0.5\nvalue\t3\tw\t0\t0.5\n");
  device.check("stat show k", prints(R"(Scalar k, 2 days

  DAY                 VALUE
  19999 (2024-10-03)     -5
  20001 (2024-10-05)      7

Distribution k, 2 days

  Count                      201
  Not a number                 1
  Minimum                    -99
  Percentile 1               -98
  Percentile 5               -90
  Percentile 25              -50
  Percentile 50                0
  Percentile 75               50
  Percentile 95               90
  Percentile 99               98
  Maximum                    100
  Mean                       0.5
  Standard deviation  57.7343052

Histogram
  (-100, -80]  20  #############################################################
  (-80, -60]   20  #############################################################
  (-60, -40]   20  #############################################################
  (-40, -20]   20  #############################################################
  (-20, 0]     20  #############################################################
  (0, 20]      20  #############################################################
  (20, 40]     20  #############################################################
  (40, 60]     20  #############################################################
  (60, 80]     20  #############################################################
  (80, 100]    20  #############################################################

  DAY                 COUNT  MINIMUM  MAXIMUM   MEAN
  20000 (2024-10-04)    100        1      100   50.5
  20001 (2024-10-05)    101      -99        0  -49.5
)"));
  const auto json = device.json("stat show w");
  EXPECT_EQ(json["scalar"], nullptr);
  EXPECT_EQ(json["distribution"]["standard_deviation"], R"({"$real": "nan"})"_json);
  EXPECT_EQ(json["distribution"]["percentiles"]["25"], R"({"$real": "-inf"})"_json);
  EXPECT_EQ(json["distribution"]["percentiles"]["50"], 0.5);
  EXPECT_EQ(json["distribution"]["histogram"],
            R"([{"bucket": "-inf", "count": 1}, {"bucket": "[0.5, 0.5]", "count": 2}])"_json);
  EXPECT_EQ(device.run("stat show l --days 1").status, 0);
  device.check("stat show v",
               prints("Scalar v, 1 day\n\n  DAY             VALUE\n  3 (1970-01-04)      1\n"));
  device.check("stat show k --days 7",
               fails("no statistic k in the last 7 days: see 'tavrelctl stat list'"));
  device.check("stat show x", fails("no statistic x: see 'tavrelctl stat list'"));
  EXPECT_EQ(device.run("stat show k --days 0").status, 2);
}

TEST(StatShow, FindsPercentilesAndBucketsOfAnyNumbers) {
  using Case = std::tuple<std::vector<double>, std::vector<double>, std::string>;
  constexpr int kPercents[] = {1, 50, 99};
  for (const auto& [values, percentiles, buckets] :
       {Case({7}, {7, 7, 7}, "[7, 7]=1 1"),
        {{1, 2, 3, 4}, {1, 2, 4}, "(0, 1]=1 (1, 2]=1 (2, 3]=1 (3, 4]=1 4"},
        {{-1.7e308, 0, 1.7e308},
         {-1.7e308, 0, 1.7e308},
         "(-inf, -1.5e+308]=1 (-5e+307, 0]=1 (1.5e+308, inf]=1 8"},
        {{0.1, 0.2, 0.3}, {0.1, 0.2, 0.3}, "(0.08, 0.1]=1 (0.18, 0.2]=1 (0.28, 0.3]=1 11"},
        {{5e-324, 1e-323},
         {5e-324, 5e-324, 1e-323},
         "[4.94065645841247e-324, 9.88131291682493e-324]=2 1"}}) {
    Summary summary;
    for (const double value : values)
      summary.add(value);
    PercentileSearch search(summary.numbers(), kPercents);
    for (; search.needsPass(); search.endPass()) {
      for (const double value : values)
        search.add(value);
    }
    EXPECT_EQ(search.values(), percentiles);
    RoundHistogram histogram(summary);
    for (const double value : values)
      histogram.add(value);
    std::string text;
    for (const auto& bucket : histogram.buckets())
      text += bucket.count == 0 ? "" : bucket.label + "=" + std::to_string(bucket.count) + " ";
    EXPECT_EQ(text + std::to_string(histogram.buckets().size()), buckets);
  }
}

// The keys and numbers of the statistics, which are all from one day.
std::string exported(const TemporaryDevice& device, const std::string& options = {}) {
  std::istringstream lines(device.run("stat export " + options).out);
  std::string all, first;
  for (std::string kind, day, key, number; lines >> kind >> day >> key >> number;) {
    if (kind == "value") {
      EXPECT_LT(std::stol(number), 86400);
      lines >> number;
    }
    EXPECT_EQ(day, first.empty() ? first = day : first);
    all += key + "=" + number + " ";
  }
  return all;
}

using StatCommands = DeviceTest;

TEST_F(StatCommands, SetAddAndRecordWriteToToday) {
  device.check("stat export", prints(""));
  EXPECT_FALSE(std::filesystem::exists(device.path(kStore)));
  device.check("stat set k -5", prints(""));
  device.check("stat add k 9223372036854775807", prints(""));
  device.check("stat add k 9", fails("adding 9 to 9223372036854775802 goes beyond 64 bits: set the "
                                     "value instead"));
  EXPECT_EQ(device.run("stat add k 010").status, 1) << "decimal, not octal";
  device.check("stat set k 0x10", fails("not a 64-bit integer: 0x10", 2));
  device.check("stat record d -- -1.5 0x1p-1 -inf", prints(""));
  EXPECT_EQ(device.run("stat record d 2 x").status, 2);

  const std::string kControl = ": give text without control characters";
  for (const auto& [key, fault] :
       {std::pair(std::string(), std::string("the key is empty: name a statistic, such as "
                                             "com.example.starts")),
        {"a\tb", "not a key: a\\tb" + kControl},
        {"a\nb", "not a key: a\\nb" + kControl},
        {"a\x7f", "not a key: a\\x7f" + kControl},
        {"a\xff", "not a key: a\\xff: give UTF-8 text"},
        {std::string(1025, 'k'), "a key of 1025 bytes: give at most 1024"}}) {
    for (const char* command : {"set", "add", "record"})
      device.check({"stat", command, key, "1"}, fails(fault, 2));
  }

  EXPECT_EQ(exported(device, "--day yesterday"), "");
  EXPECT_EQ(exported(device, "--day today"), "k=9223372036854775802 d=-1.5 d=0.5 d=-inf ");
}

// Waits as long as requested or somewhat longer, and ends a run after some readings. The machine
// starts at midnight.
struct PeriodicPace final : CollectPace {
  Ticks now() override { return time; }
  std::chrono::system_clock::time_point wallTime() override {
    return std::chrono::sys_days(std::chrono::days(20000)) + time.time_since_epoch();
  }
  bool endsBefore(Ticks end) override {
    time = end + late;
    between();
    return left-- == 0;
  }

  std::function<void()> between = [] {};
  int left = 0;
  std::chrono::seconds late{0};
  Ticks time{std::chrono::hours(1)};
};

// A device, and a sampler of it whose readings a test counts.
struct SamplerTest : DeviceTest {
  SamplerTest() { device.write("/proc/sys/kernel/random/boot_id", "boot-1\n"); }

  // Ends another reading, before which 30 KiB were received.
  void receive() {
    ++readings;
    device.write("/proc/net/dev", format("\n\neth0: %d 0 0 0 0 0 0 0 0 0\n", 30720 * readings));
  }
  // What a sampler prints that ends after some readings.
  std::string sample(int count, const std::string& state = {}) {
    pace.left = count;
    return sample(pace, state);
  }
  std::string sample(PeriodicPace& paceOfSampler, const std::string& state = {}) const {
    std::istringstream in;
    std::ostringstream out, error;
    ToolContext context({.in = in, .out = out, .error = error});
    context.setRoot(device.path(""));
    collectEvery(context, std::chrono::seconds(60), state, paceOfSampler);
    return out.str() + error.str() + (context.exitStatus() == 0 ? "" : "failed");
  }

  const std::string storeNote =
      "tavrelctl: " + device.path("/run/tavrel/stat") +
      ": samples go into the store, on flash, once an hour: no such folder; start "
      "tavrel-folders.service\n";
  PeriodicPace pace;
  int readings = 0;
};

TEST_F(SamplerTest, WaitsUntilThereIsAFolder) {
  pace.between = [&] {
    if (pace.left != 3 && pace.left != 2) return;
    const bool isKept = exported(device).find("usage.samples=60 ") != std::string::npos;
    EXPECT_EQ(isKept, pace.left == 2);
    if (pace.left == 2) std::filesystem::create_directories(device.path("/run/tavrel/stat"));
  };
  EXPECT_EQ(sample(62), storeNote + "tavrelctl: " + device.path("/run/tavrel/stat") +
                            " is there now: start again to record in memory\nfailed");
  expectIn(exported(device), {"usage.samples=61 "});
}

TEST_F(SamplerTest, KeepsSamplesWhenTheirStateIsOnAReadOnlyFileSystem) {
  const std::string run = device.path("/run");
  std::filesystem::create_directories(run + "/tavrel");
  // A confined service sees what is made in /run after its start, but cannot write there.
  const int status = inChild([&] {
    const char* const from = run.c_str();
    if (unshare(CLONE_NEWNS) != 0 ||
        mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0 ||
        mount(from, from, nullptr, MS_BIND, nullptr) != 0 ||
        mount("none", from, nullptr, MS_BIND | MS_REMOUNT | MS_RDONLY, nullptr) != 0) {
      return 77;
    }
    EXPECT_EQ(sample(2),
              storeNote + "tavrelctl: cannot write " + run +
                  "/tavrel/collect.state: Read-only file system; make the file system writable; "
                  "the samples are kept, but the next process has no rates at first\n");
    expectIn(exported(device), {"usage.samples=2 "});
    return HasFailure() ? 1 : 0;
  });
  if (status == 77) GTEST_SKIP() << "may not mount";
  EXPECT_EQ(status, 0);
}

TEST_F(SamplerTest, KeepsOtherSamplersAwayWhileSamplesWait) {
  const auto sampleElsewhere = [&] {
    PeriodicPace other;
    other.time = pace.time;
    other.left = 1;
    return sample(other);
  };
  pace.between = [&] {
    receive();
    if (readings == 1) {
      EXPECT_EQ(sampleElsewhere(), storeNote);
    }
    if (readings != 3) return;
    EXPECT_EQ(sampleElsewhere(),
              storeNote + "tavrelctl: cannot lock " +
                  device.path("/run/tavrel/collect.state.lock") +
                  ": another process has had it locked for 2 seconds; it may be a sampler whose "
                  "samples wait for the store: stop it first\nfailed");
  };
  EXPECT_EQ(sample(3), storeNote);
  EXPECT_EQ(sampleElsewhere(), storeNote);
  expectIn(exported(device), {"received_kib=90 ", "samples=5 "});
}

TEST_F(SamplerTest, GoesOnWithoutItsStateAndWithoutASensorThatBlocks) {
  device.write("/sys/class/thermal/thermal_zone0/temp", "41500\n");
  device.write("/sys/class/thermal/thermal_zone1/x", "");
  const std::string blocked = device.path("/sys/class/thermal/thermal_zone1/temp");
  ASSERT_EQ(mkfifo(blocked.c_str(), 0600), 0);
  device.write("/run/full", "");
  const std::string state = device.path("/run/full/state");
  EXPECT_EQ(sample(61, state),  // an hour, and one
            storeNote + "tavrelctl: " + blocked +
                " does not answer within 1000 ms: left out until it does\n"
                "tavrelctl: cannot write " +
                state +
                ": Not a directory; sampling goes on, but after a restart the first sample has no "
                "rates\n");
  expectIn(exported(device),
           {"usage.samples=61 ", "celsius=41.5 com.norvane.usage.temperature.celsius=41.5 "});
}

TEST_F(SamplerTest, CollectsInEachPeriodAndGoesOnAfterAnEnd) {
  pace.between = [&] { receive(); };
  for (int run = 0; run < 2; ++run) {
    EXPECT_EQ(sample(2), storeNote);
    EXPECT_TRUE(std::filesystem::exists(device.path("/run/tavrel/collect.state")));
  }
  // The second run counts what happened between the last reading of the first run and its own.
  expectIn(exported(device), {"usage.network.received_kib=120 ", "usage.samples=4 ",
                              "received_kib_per_second=0.5 ", "received_kib_per_second=1 "});
}

TEST_F(SamplerTest, DoesNotKeepSamplesWaitingIntoTheNextDay) {
  pace.time = PeriodicPace::Ticks(std::chrono::minutes(24 * 60 - 2));
  std::string kept;
  pace.between = [&] {
    kept += std::to_string(exported(device).find("usage.samples=2 ") != std::string::npos);
  };
  EXPECT_EQ(sample(3), storeNote);
  EXPECT_EQ(kept, "0011") << "the sample of 23:59, before that of 24:00";
}

struct SamplerWithoutStore : SamplerTest, testing::WithParamInterface<bool> {};
INSTANTIATE_TEST_SUITE_P(, SamplerWithoutStore, testing::Bool());

TEST_P(SamplerWithoutStore, WaitsUntilItCanBeWrittenForTwoHours) {
  const bool recovers = GetParam();
  const std::string store = device.path("/var/mobile/Library/Brimhold");
  const auto mendStore = [&] {
    std::filesystem::remove(store);
    std::filesystem::rename(store + "-x", store);
  };
  pace.between = [&] {
    receive();
    if (readings == 62 && recovers) mendStore();
  };
  EXPECT_EQ(sample(1), storeNote);
  readings = 1;
  std::filesystem::rename(store, store + "-x");
  std::ofstream(store) << "";
  const std::string why =
      "tavrelctl: statistics store " + device.path(kStore) +
      ": its folder cannot be made: Not a directory: check owner and permissions of " +
      device.path("/var/mobile/Library");
  EXPECT_EQ(sample(recovers ? 62 : 200), storeNote + why +
                                             "; the samples wait, and the next one tries again\n" +
                                             (recovers ? "" : why + "\nfailed"));
  EXPECT_EQ(readings, recovers ? 64 : 122) << "gives up after two hours";
  if (!recovers) {
    mendStore();
    EXPECT_EQ(sample(1), storeNote);
  }
  // A process that gives up leaves its sums to the next one.
  expectIn(exported(device), {format("received_kib=%d ", 30 * (readings - 2)),
                              format("samples=%d ", recovers ? 63 : 2)});
}

TEST(CollectState, IsOfThisStartAndNoOlderThanADay) {
  using namespace std::chrono_literals;
  const TemporaryDevice device;
  const std::string path = device.path("/state");
  ASSERT_TRUE(writeCollectState(path, "boot", {.at = 5ns, .machine = {}, .remainders = {}}));
  const std::tuple<const char*, std::chrono::nanoseconds, bool> cases[] = {
      {"boot", 5ns, true},        {"boot", 24h + 5ns, true}, {"boot", 4ns, false},
      {"boot", 24h + 6ns, false}, {"other", 5ns, false},     {"", 5ns, false}};
  for (const auto& [boot, now, isUsable] : cases)
    EXPECT_EQ(readCollectState(path, boot, now)->has_value(), isUsable) << boot << now.count();
}

TEST_F(SamplerTest, CollectsWhatTheMachineTells) {
  device.write("/proc/uptime", "1234.56 99.00\n");
  device.write("/proc/loadavg", "0.25 0.10 0.05 1/100 4242\n");
  device.write("/proc/stat",
               "cpu  10 20 30 400 50 6 7 8 0 0\ncpu0 1 1 1 1 1 1 1 1 0 0\ncpu1 9\nintr 1\n");
  device.write("/proc/meminfo",
               "MemTotal: 4096 kB\nMemAvailable: 1024 kB\nSwapTotal: 2048 kB\nSwapFree: 1024 kB\n");
  device.write("/proc/net/dev",
               "titles\ntitles\n    lo: 9 0 0 0 0 0 0 0 9 0\n  eth0: 2048 0 0 0 0 0 0 0 4096 0\n"
               " eth1: garbage\n");
  device.write("/proc/diskstats",
               "8 0 cciss/sda 1 1 200 1 1 1 400 1\n7 0 loop0 1 1 9 1 1 1 9 1\nshort\n"
               "259 0 nvme0n1 1 1 1 1 1 1 1 1\n");
  device.write("/sys/block/cciss!sda/device/x", "");
  device.write("/sys/block/nvme0n1/nvme-subsys0/x", "");
  std::filesystem::create_symlink("nvme-subsys0", device.path("/sys/block/nvme0n1/device"));
  device.write("/sys/class/thermal/thermal_zone0/temp", "41500\n");
  device.write("/sys/class/thermal/thermal_zone1/temp", "30000\n");
  pace.late = std::chrono::seconds(1);
  pace.left = 1;
  pace.between = [&] {
    // 100 ticks, 30 of them idle and 10 waiting; 3 and 5 KiB on the network, 7 and 9 on the disk.
    device.write("/proc/stat", "cpu  30 40 50 430 60 6 7 8 0 0\ncpu0 1\ncpu1 9\nintr 1\n");
    device.write("/proc/net/dev",
                 "titles\ntitles\n    lo: 99 0 0 0 0 0 0 0 99 0\n"
                 "  eth0: 5120 0 0 0 0 0 0 0 9216 0\n eth1: garbage\n");
    device.write("/proc/diskstats",
                 "8 0 cciss/sda 1 1 214 1 1 1 418 1\n7 0 loop0 1 1 99 1 1 1 99 1\n"
                 "259 0 nvme0n1 1 1 99 1 1 1 99 1\n");
  };
  std::istringstream in;
  std::ostringstream out, error;
  {
    ToolContext context({.in = in, .out = out, .error = error});
    context.setRoot(device.path(""));
    collectStatistics(context, 1, pace);
  }
  EXPECT_EQ(out.str(), "kept 2 samples of this machine, taken over 1 second\n");
  EXPECT_EQ(error.str(),
            "tavrelctl: not recorded, no reading available: "
            "com.norvane.usage.processes\n");

  std::string all = exported(device);
  // Removes figures of the machine itself.
  all = std::regex_replace(all, std::regex("(disk.(total|free)_mib|processes)=\\S+ "), "");
  all = std::regex_replace(all, std::regex("com.norvane.usage."), "");
  EXPECT_EQ(all,
            "cpu.busy_milliseconds=600 cpu.count=2 disk.read_kib=7 disk.written_kib=9 "
            "memory.available_mib=1 memory.total_mib=4 network.received_kib=3 network.sent_kib=5 "
            "samples=2 swap.used_mib=1 uptime.seconds=1234 cpu.busy_percent=60 "
            "disk.read_kib_per_second=3.5 disk.written_kib_per_second=4.5 load.one_minute=0.25 "
            "load.one_minute=0.25 memory.used_percent=75 memory.used_percent=75 "
            "network.received_kib_per_second=1.5 network.sent_kib_per_second=2.5 "
            "temperature.celsius=41.5 temperature.celsius=41.5 ");
}

TEST(MachineSources, LeaveOutWhatCannotBe) {
  const TemporaryDevice device;
  const std::string most = "18446744073709551615";
  device.write("/proc/stat", "cpu  1 0 0 " + most + " 0\n");
  device.write("/proc/meminfo", "MemAvailable: 5 kB\nMemTotal: 4 kB\n");
  device.write("/proc/loadavg", "1 " + std::string(limits::kLiveFileBytes, '\n'));
  device.write("/proc/net/dev", "\n\na: " + most + " 0 0 0 0 0 0 0 7 0\nb: 1 0 0 0 0 0 0 0 9 0\n");
  device.write("/proc/diskstats", "8 0 sda 1 1 36028797018963968 1 1 1 2 1\n");
  device.write("/sys/block/sda/device/x", "");
  KeptLog log;
  MachineReading reading = MachineSources(device.root, log).read(Processes::LeftOut);
  EXPECT_FALSE(reading.cpu || reading.memoryAvailableKib || reading.disk ||
               reading.loadOfOneMinute);
  ASSERT_TRUE(reading.network);
  EXPECT_EQ(std::pair(std::to_string(reading.network->in), reading.network->out),
            std::pair(most, std::uint64_t{7}));

  // The kernel may take back waiting time, so that busy time grows by more than the total.
  MachineReading before;
  before.cpu = {0, 0};
  reading.cpu = {100, 98};
  for (const MachineStatistic& statistic : machineStatistics()) {
    if (std::string_view(statistic.key).ends_with("busy_percent")) {
      EXPECT_EQ(statistic.measure(reading, &before, 1), 100);
    }
  }
}

TEST_F(StatCommands, CollectEndsEarlyBySignalAndKeepsItsSamples) {
  const PendingSignal term(SIGTERM);
  device.check("stat collect --seconds 3600",
               (Outcome{0, "kept 1 sample of this machine, taken over 0 seconds\n",
                        "tavrelctl: ended by a signal before 3600 seconds were over\n"}));
  EXPECT_TRUE(device.run("stat export com.norvane.usage.samples").out.ends_with("samples\t1\n"));
}

}  // namespace
}  // namespace tavrel
