#include <bit>
#include <csignal>

#include "device.h"
#include "tools/stat/import_lines.h"
#include "tools/stat/import_number.h"

namespace tavrel {
namespace {

constexpr const char* kStore = "/var/mobile/Library/Brimhold/BHDataStore.sqlitedb";

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

TEST(StatImport, RefusesABadLineAndKeepsNothing) {
  const std::pair<std::string, const char*> cases[] = {
      {"", "the line is empty"},
      {"gauge\t1\tk\t1",
       "a line begins with \"scalar\" or \"value\" and a tab, not with: gauge\\t1\\tk\\t1"},
      {"scalar\t1\tk", "a scalar has four fields, separated by tabs: scalar, day, key, integer"},
      {"scalar\t1\tk\t1\t",
       "a scalar has four fields, separated by tabs: scalar, day, key, integer"},
      {"value\t1\tk\t1",
       "a value has five fields, separated by tabs: value, day, key, seconds, number"},
      {"scalar\t2147483648\tk\t1", "not a day: 2147483648: give a 32-bit day number or YYYY-MM-DD"},
      {"scalar\t2026-02-29\tk\t1", "not a day: 2026-02-29: give a 32-bit day number or YYYY-MM-DD"},
      {"scalar\t1\tk\xFF\t1", "a key is not UTF-8: k\\xff"},
      {"scalar\t1\tk\t9223372036854775808", "not a 64-bit integer: 9223372036854775808"},
      {"scalar\t1\tk\t1\r", "not a 64-bit integer: 1\\x0d"},
      {"value\t1\tk\t-1\t1", "seconds within the day are 0 to 4294967295, not: -1"},
      {"value\t1\tk\t1\tone", "not a number: one"}};
  const TemporaryDevice device;
  ASSERT_EQ(device.run({"stat", "set", "before", "1"}).status, 0);
  const auto before = device.run({"stat", "export"});
  for (const auto& [line, reason] : cases) {
    const std::string good = "scalar\t1\tk\t1\nvalue\t1\tk\t1\t1\n";
    const Outcome outcome = device.run({"stat", "import"}, good + line + "\n" + good);
    EXPECT_EQ(outcome, (Outcome{1, "",
                                std::string("tavrelctl: standard input:3: ") + reason +
                                    "; nothing of the file was kept\n"}));
  }
  const std::string endless(3U << 20, 'x');
  EXPECT_EQ(device.run({"stat", "import", "-"}, "scalar\t1\tk\t1\n" + endless).error,
            "tavrelctl: standard input:2: a line has more than 1052672 bytes; nothing of the file "
            "was kept\n");
  EXPECT_EQ(device.run({"stat", "import", "/nonexistent"}),
            fails("cannot open /nonexistent: No such file or directory"));
  EXPECT_EQ(device.run({"stat", "import", "/"}),
            fails("cannot read /: Is a directory; nothing of the file was kept"));
  EXPECT_EQ(device.run({"stat", "export"}), before);
}

TEST(StatImport, ExportGivesBackWhatWasImported) {
  std::string longKey(100'000, 'k');
  std::string lines =
      "scalar\t-2147483648\tfirst\t-9223372036854775808\n"
      "scalar\t1\t\t0\n"
      "scalar\t1\tk\xC3\xA9\t1\n"
      "scalar\t2147483647\t" +
      longKey + "\t9223372036854775807\n";
  for (int i = 0; i < 3000; ++i)
    lines += "value\t1\td\t" + std::to_string(i) + "\t" + std::to_string(i) + ".25\n";
  lines +=
      "value\t1\te\t4294967295\tnan(0x7ff0000000000001)\n"
      "value\t1\te\t0\t-0\n"
      "value\t2\td\t0\t-inf\n";
  const TemporaryDevice device;
  EXPECT_EQ(device.run({"stat", "import"}, lines.substr(0, lines.size() - 1)),
            prints("standard input: 4 scalars, 3003 values\n"));
  EXPECT_EQ(device.run({"stat", "export"}), prints(lines));
  EXPECT_EQ(device.run({"stat", "export", "d", "--day", "1970-01-03"}),
            prints("value\t2\td\t0\t-inf\n"));

  const TemporaryDevice other;
  other.write("/lines", "scalar\t1970-01-02\tk\t1\nscalar\t1\tk\t2\n");
  EXPECT_EQ(other.run({"stat", "import", other.path("/lines"), "--json"}),
            prints("{\n  \"format_version\": 1,\n  \"file\": \"" + other.path("/lines") +
                   "\",\n  \"scalars\": 2,\n  \"values\": 0\n}\n"));
  EXPECT_EQ(other.run({"stat", "import", "-"}, "value\t1\td\t7\t0x1p1\n").status, 0);
  EXPECT_EQ(other.run({"stat", "list"}), prints("DAY             KIND          KEY    VALUE\n"
                                                "1 (1970-01-02)  scalar        k          2\n"
                                                "1 (1970-01-02)  distribution  d    1 value\n"));
  EXPECT_EQ(other.run({"stat", "list", "d", "--json"}).out,
            "{\n  \"format_version\": 1,\n  \"scalars\": [],\n  \"distributions\": [\n    {\n"
            "      \"key\": \"d\",\n      \"day\": 1,\n      \"date\": \"1970-01-02\",\n"
            "      \"count\": 1\n    }\n  ]\n}\n");
  EXPECT_EQ(other.run({"stat", "list", "--day", "2"}), prints(""));
}

TEST(StatCommands, SetAddAndRecordWriteToToday) {
  const TemporaryDevice device;
  EXPECT_EQ(device.run({"stat", "export"}), prints(""));
  EXPECT_FALSE(std::filesystem::exists(device.path(kStore)));
  EXPECT_EQ(device.run({"stat", "set", "k", "-5"}), prints(""));
  EXPECT_EQ(device.run({"stat", "add", "k", "9223372036854775807"}), prints(""));
  EXPECT_EQ(device.run({"stat", "add", "k", "9"}),
            fails("adding 9 to 9223372036854775802 goes beyond 64 bits: set the "
                  "value instead"));
  EXPECT_EQ(device.run({"stat", "add", "k", "010"}).status, 1) << "decimal, not octal";
  EXPECT_EQ(device.run({"stat", "set", "k", "0x10"}), fails("not a 64-bit integer: 0x10", 2));
  EXPECT_EQ(device.run({"stat", "record", "d", "--", "-1.5", "0x1p-1", "-inf"}), prints(""));
  EXPECT_EQ(device.run({"stat", "record", "d", "2", "x"}).status, 2);

  for (const char* key : {"a\tb", "a\nb", "a\xff"}) {
    for (const char* command : {"set", "add", "record"}) {
      const Outcome refused = device.run({"stat", command, key, "1"});
      EXPECT_EQ(refused.status, 2) << refused;
      EXPECT_TRUE(refused.error.starts_with("tavrelctl: not a key: a\\")) << refused;
    }
  }

  EXPECT_EQ(device.run({"stat", "export", "--day", "yesterday"}), prints(""));
  std::istringstream lines(device.run({"stat", "export", "--day", "today"}).out);
  std::string kind, day, key, number;
  lines >> kind >> day >> key >> number;
  EXPECT_EQ(kind + key + number, "scalark9223372036854775802");
  for (const char* value : {"-1.5", "0.5", "-inf"}) {
    std::string valueDay, seconds;
    lines >> kind >> valueDay >> key >> seconds >> number;
    EXPECT_EQ(kind + key + number, std::string("valued") + value);
    EXPECT_EQ(valueDay, day);
    EXPECT_LT(std::stol(seconds), 86400);
  }
}

TEST(StatCommands, CollectsWhatTheMachineTells) {
  const TemporaryDevice device;
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
               "8 0 sda 1 1 200 1 1 1 400 1\n7 0 loop0 1 1 9 1 1 1 9 1\nshort\n");
  device.write("/sys/block/sda/device/x", "");
  device.write("/sys/class/thermal/thermal_zone0/temp", "41500\n");
  device.write("/sys/class/thermal/thermal_zone1/temp", "30000\n");
  const Outcome collected = device.run({"stat", "collect", "--seconds", "1"});
  EXPECT_EQ(collected.status, 0);
  EXPECT_EQ(collected.out, "kept 2 samples of this machine, taken over 1 second\n");
  EXPECT_EQ(collected.error.substr(0, 60),
            "tavrelctl: not recorded, as the machine did not tell in this");

  // Without the day, and without what the machine itself answers.
  std::istringstream lines(device.run({"stat", "export"}).out);
  std::string all;
  for (std::string line; std::getline(lines, line);) {
    std::istringstream fields(line);
    std::string kind, day, key, seconds, number;
    fields >> kind >> day >> key;
    if (kind == "value") fields >> seconds;
    fields >> number;
    key.erase(0, std::string("com.norvane.usage.").size());
    if (key != "disk.total_mib" && key != "disk.free_mib" && key != "processes") {
      all += key + "=" + number + " ";
    }
  }
  EXPECT_EQ(all,
            "cpu.busy_milliseconds=0 cpu.count=2 disk.read_kib=0 disk.written_kib=0 "
            "memory.available_mib=1 memory.total_mib=4 network.received_kib=0 network.sent_kib=0 "
            "samples=2 swap.used_mib=1 uptime.seconds=1234 "
            "disk.read_kib_per_second=0 disk.written_kib_per_second=0 "
            "load.one_minute=0.25 load.one_minute=0.25 memory.used_percent=75 "
            "memory.used_percent=75 network.received_kib_per_second=0 "
            "network.sent_kib_per_second=0 temperature.celsius=41.5 temperature.celsius=41.5 ");
}

TEST(StatCommands, CollectEndsEarlyBySignalAndKeepsItsSamples) {
  const TemporaryDevice device;
  sigset_t term, before;
  sigemptyset(&term);
  sigaddset(&term, SIGTERM);
  pthread_sigmask(SIG_BLOCK, &term, &before);
  raise(SIGTERM);
  EXPECT_EQ(device.run({"stat", "collect", "--seconds", "3600"}),
            (Outcome{0, "kept 1 sample of this machine, taken over 0 seconds\n",
                     "tavrelctl: ended by a signal before 3600 seconds were over\n"}));
  pthread_sigmask(SIG_SETMASK, &before, nullptr);
  EXPECT_TRUE(
      device.run({"stat", "export", "com.norvane.usage.samples"}).out.ends_with("samples\t1\n"));
}

}  // namespace
}  // namespace tavrel
