// Health of drives: log pages, texts from sysfs, growth, and whole readings below a device root.

#include "platform/linux/health/ata_smart.h"
#include "platform/linux/health/drives.h"
#include "platform/linux/health/flash_life.h"
#include "platform/linux/health/nvme_logs.h"
#include "platform/linux/health/reader.h"
#include "platform/linux/health/verdict.h"
#include "platform/persisted_state.h"
#include "platform/plist/binary.h"
#include "platform/plist/xml.h"
#include "tests/devices/temporary_root.h"

namespace tavrel::health {
namespace {

using Bytes = DeviceCommands::Bytes;
using Values = std::map<std::string, std::int64_t>;
constexpr std::int64_t kMost = INT64_MAX;

Values valuesOf(const Figures& figures) {
  Values values;
  for (const Figure& figure : figures)
    values.emplace(figure.kind->name, figure.value);
  return values;
}

void put(Bytes& bytes, std::size_t offset, const std::vector<unsigned>& values) {
  for (const unsigned value : values)
    bytes[offset++] = static_cast<std::byte>(value);
}

Bytes smartPage() {
  Bytes page(512);
  put(page, 0, {4, 0x43, 0x01, 90, 10, 255});  // 323 K, 255 % used
  put(page, 48, {2});
  put(page, 80, {7});
  put(page, 112, std::vector<unsigned>(16, 255));
  put(page, 128, {1, 0, 0, 0, 0, 0, 0, 0, 1});  // 2^64 + 1 hours
  put(page, 144, {0, 0, 0, 0, 0, 0, 0, 0x80});  // 2^63
  return page;
}

Bytes ocpPage() {
  Bytes page(512);
  put(page, 0, {0x00, 0xA0, 0x0F});  // 1,024,000
  put(page, 32, std::vector<unsigned>(6, 255));
  put(page, 40, {3});
  put(page, 96, {255});
  put(page, 496,
      {0xC5, 0xAF, 0x10, 0x28, 0xEA, 0xBF, 0xF2, 0xA4, 0x9C, 0x4F, 0x6F, 0x7C, 0xC9, 0x14, 0xD5,
       0xAF});
  return page;
}

TEST(HealthTest, NvmeSmartLog) {
  const auto values = valuesOf(*nvmeSmartFigures(smartPage()));
  const Values expected = {
      {"critical_warning", 4},     {"temperature", 49'850},     {"spare_pct", 90},
      {"spare_threshold_pct", 10}, {"used_pct", 255},           {"written", 1'024'000},
      {"read_commands", 0},        {"write_commands", 7},       {"busy_minutes", 0},
      {"power_on_hours", kMost},   {"unsafe_shutdowns", kMost}, {"media_errors", 0},
      {"error_log_entries", 0},    {"warning_temp_minutes", 0}, {"critical_temp_minutes", 0},
      {"throttle_light", 0},       {"throttle_heavy", 0}};
  EXPECT_EQ(values, expected);  // no "read" (0 units), no "power_cycles" (all ones)
}

TEST(HealthTest, FieldsAreWhereTheirSourcesSay) {
  for (const auto& [page, kinds] :
       {std::pair("02h", nvmeSmartKinds()), std::pair("C0h", nvmeOcpKinds())}) {
    for (const FigureKind& kind : kinds) {
      const int first = kind.place.offset, last = first + kind.place.width - 1;
      EXPECT_EQ(kind.source, first == last ? format("log %s byte %d", page, first)
                                           : format("log %s bytes %d-%d", page, first, last));
    }
  }
}

TEST(HealthTest, RefusesShortAndLyingLogs) {
  EXPECT_EQ(nvmeSmartFigures(Bytes()).error().message, "the drive has no log 02h");
  EXPECT_EQ(nvmeSmartFigures(Bytes(511)).error().message, "log 02h has 511 bytes instead of 512");
  EXPECT_EQ(nvmeSmartFigures(Bytes(512)).error().message, "log 02h is blank");
  EXPECT_EQ(nvmeSmartFigures(Bytes(512, std::byte{255})).error().message, "log 02h is blank");
  EXPECT_EQ(nvmeOcpFigures(smartPage()).error().message, "log C0h is not the one of OCP");
  Bytes page = smartPage();
  put(page, 3, {101});  // more spare than exists
  EXPECT_FALSE(valuesOf(*nvmeSmartFigures(page)).contains("spare_pct"));
  EXPECT_EQ(emmcFigures(Bytes(100)).error().message, "EXT_CSD has 100 bytes instead of 512");
  Bytes card(512);
  put(card, 192, {6});
  EXPECT_EQ(emmcFigures(card).error().message,
            "EXT_CSD revision 6, before eMMC 5.0, has no health");
}

TEST(HealthTest, OcpFieldsOfALaterVersion) {
  Bytes page = ocpPage();
  put(page, 104, {9});
  put(page, 128, {0x2C, 0x01});
  put(page, 160, {3});
  put(page, 192, {0, 1});
  const auto first = valuesOf(*nvmeOcpFigures(page));
  EXPECT_EQ(first.at("pcie_errors"), 9);
  EXPECT_EQ(first.at("capacitor_pct"), 300);
  EXPECT_FALSE(first.contains("backup_power_starts"));
  put(page, 128, {255, 255});
  put(page, 494, {2});
  const auto second = valuesOf(*nvmeOcpFigures(page));
  EXPECT_EQ(second.at("backup_power_starts"), 3);
  EXPECT_EQ(second.at("link_retrains"), 256);
  EXPECT_FALSE(second.contains("endurance"));  // not reported
  EXPECT_FALSE(second.contains("capacitor_pct"));
}

// The drive's answer in the library's form: pieces of a tag and a big-endian size.
TEST(HealthTest, AtaSmart) {
  const auto add = [](Bytes& blob, const char* tag, const Bytes& data) {
    for (int i = 0; i < 4; ++i)
      blob.push_back(static_cast<std::byte>(tag[i]));
    for (int shift = 24; shift >= 0; shift -= 8)
      blob.push_back(static_cast<std::byte>(data.size() >> shift));
    blob.insert(blob.end(), data.begin(), data.end());
  };
  Bytes identify(512), data(512), thresholds(512);
  put(identify, 164, {1});  // SMART is supported
  put(identify, 170, {1});  // and enabled
  const struct {
    unsigned id, flags, current, threshold, raw;
  } attributes[] = {{5, 1, 10, 36, 7},    {9, 0, 90, 0, 50},   {12, 0, 99, 0, 3},
                    {194, 0, 60, 0, 40},  {197, 0, 100, 0, 2}, {199, 0, 200, 0, 4},
                    {1, 1, 100, 6, 1000}, {10, 0, 1, 97, 0}};
  std::size_t at = 2;
  for (const auto& each : attributes) {
    put(data, at,
        {each.id, each.flags, 0, each.current, each.current, each.raw % 256, each.raw / 256});
    put(thresholds, at, {each.id, each.threshold});
    at += 12;
  }
  Bytes blob;
  add(blob, "IDFY", identify);
  add(blob, "SMST", {{}, {}, {}, std::byte{1}});
  add(blob, "SMDT", data);
  EXPECT_FALSE(valuesOf(*ataFigures(blob)).contains("failing_attributes")) << "no thresholds";
  add(blob, "SMTH", thresholds);
  const auto figures = ataFigures(blob);
  ASSERT_TRUE(figures) << figures.error().message;
  const Values expected = {
      {"smart_good", 1},      {"temperature", 40'000}, {"power_on_hours", 50},
      {"power_cycles", 3},    {"bad_sectors", 9},      {"reallocated_sectors", 7},
      {"pending_sectors", 2}, {"crc_errors", 4},       {"failing_attributes", 1}};
  EXPECT_EQ(valuesOf(*figures), expected);
  blob.pop_back();
  EXPECT_EQ(ataFigures(blob).error().message, "SMART data is malformed");
}

TEST(HealthTest, FlashLife) {
  Bytes card(512);
  put(card, 192, {8});
  put(card, 267, {2, 11, 0});
  EXPECT_EQ(valuesOf(*emmcFigures(card)), (Values{{"life_a_pct", 110}, {"pre_eol", 2}}));
  struct Case {
    std::optional<std::string_view> life, preEol;
    Values values;
  };
  const Case cases[] = {
      {"0x01 0x02", "0x01", {{"life_a_pct", 10}, {"life_b_pct", 20}, {"pre_eol", 1}}},
      {"0x0b 0x00", "03", {{"life_a_pct", 110}, {"pre_eol", 3}}},
      {"0x0C", "0x04", {}},
      {"zz 0x02", "", {}},
      {"0x01x 0x02", std::nullopt, {}},
      {std::nullopt, "0xFFFFFFFFFF", {}}};
  for (const Case& each : cases)
    EXPECT_EQ(valuesOf(emmcFigures(each.life, each.preEol)), each.values);
  EXPECT_EQ(valuesOf(ufsFigures("0x03", "0x0A", "0x01")),
            (Values{{"life_a_pct", 30}, {"life_b_pct", 100}, {"pre_eol", 1}}));
}

TEST(HealthTest, Growth) {
  struct Step {
    std::string boot;
    std::optional<std::int64_t> runDay;
    std::int64_t written, ecc;  // bytes, failures since attach
    Values growth;
  };
  const std::vector<std::pair<std::string, std::vector<Step>>> cases = {
      {"counts from the reading that the run saw",
       {{"a", 1, 10, 0, {}},
        {"a", 1, 15, 1, {}},
        {"a", 2, 18, 1, {{"written", 3}, {"ecc_failures", 0}}},
        {"a", 2, 20, 4, {{"written", 5}, {"ecc_failures", 3}}},
        {"a", 3, 21, 4, {{"written", 1}, {"ecc_failures", 0}}}}},
      {"the first run of a device counts as well",
       {{"a", std::nullopt, 10, 0, {}},
        {"a", std::nullopt, 15, 0, {}},
        {"a", 1, 18, 1, {{"written", 3}, {"ecc_failures", 1}}}}},
      {"a new boot begins the kernel's counter at 0, not the drive's",
       {{"a", 1, 10, 5, {}},
        {"b", 2, 12, 7, {{"written", 2}, {"ecc_failures", 7}}},
        {"b", 2, 12, 2, {{"written", 2}, {"ecc_failures", 9}}}}},
      {"a counter that went back is unknown until the next run",
       {{"a", 1, 10, 0, {}},
        {"a", 2, 4, 0, {{"ecc_failures", 0}}},
        {"a", 2, 9, 0, {{"ecc_failures", 0}}},
        {"a", 3, 11, 0, {{"written", 2}, {"ecc_failures", 0}}}}},
      {"in an unknown boot only the drive's counters grow",
       {{"a", 1, 10, 5, {}},
        {"a", 2, 12, 7, {{"written", 2}, {"ecc_failures", 2}}},
        {"", 2, 13, 8, {{"written", 3}}},
        {"a", 2, 13, 9, {{"written", 3}, {"ecc_failures", 4}}}}},
      {"growth saturates",
       {{"a", 1, 0, kMost, {}},
        {"b", 2, kMost, kMost, {{"written", kMost}, {"ecc_failures", kMost}}},
        {"c", 2, kMost, 1, {{"written", kMost}, {"ecc_failures", kMost}}}}}};
  const FigureKind* const written = figureKind(DriveKind::Nvme, "written");
  const FigureKind* const ecc = figureKind(DriveKind::Mtd, "ecc_failures");
  for (const auto& [what, steps] : cases) {
    Memory memory;
    for (const Step& step : steps) {
      const Figures growth =
          takeGrowth(memory.drives["d"], {{written, step.written}, {ecc, step.ecc}},
                     {1000, step.boot, step.runDay});
      EXPECT_EQ(valuesOf(growth), step.growth) << what << ", written " << step.written;
      memory = *decodeMemory(asBytes(*encodeMemory(memory)));
    }
  }
  Memory damaged;
  damaged.drives["d"].isCounting = true;
  damaged.drives["d"].last["written"] = INT64_MIN;
  damaged = *decodeMemory(asBytes(*encodeMemory(damaged)));
  EXPECT_EQ(valuesOf(takeGrowth(damaged.drives["d"], {{written, 5}}, {1000, "a", 1})), Values{});
}

class Answers final : public DeviceCommands {
 public:
  Expected<Bytes> nvmeLog(const std::string& path, std::uint8_t page) override {
    asked.push_back(path.substr(path.rfind('/') + 1) + (page == kNvmeSmartLog ? " 02" : " C0"));
    if (const auto now = std::exchange(whileAsked, nullptr)) now();
    const auto& answer = page == kNvmeSmartLog ? smart : ocp;
    if (!answer) return Error{"NVMe status 0x4002"};
    if (path.find(killer) != path.npos) throw std::bad_alloc();
    return *answer;
  }
  Expected<Bytes> extCsd(const std::string&) override {
    return card ? Expected<Bytes>(*card) : Error{"not permitted"};
  }
  Expected<Bytes> ataSmart(const std::string&) override { return Bytes{}; }

  std::optional<Bytes> smart = smartPage(), ocp = Bytes{}, card;
  std::string killer = "none";  // the drive that kills the reader
  std::vector<std::string> asked;
  std::function<void()> whileAsked;
};

// Counts how often each file is put in place, and lets a test interfere.
class WatchedFiles final : public MeddlingFiles {
 public:
  std::map<std::string, int> written;
  int refusals = 0;  // of remembered counters to come, while the flash is full

 private:
  int renameFile(const char* from, const char* to) override {
    ++written[to];
    errno = ENOSPC;
    const bool fails = std::string_view(to).ends_with(kMemoryFile) && refusals-- > 0;
    return fails ? -1 : FileSystem::renameFile(from, to);
  }
};

class HealthReaderTest : public testing::Test, protected TemporaryRoot {
 protected:
  void addNvme(const std::string& name, const std::string& serial) const {
    const std::string folder = "/sys/devices/pci/" + name;
    write(folder + "/model", "Disk\n");
    write(folder + "/firmware_rev", "1.0\n");
    write(folder + "/serial", serial);
    write(folder + "/" + name + "n1/size", "2000\n");
    write(folder + "/" + name + "n2/size", "48\n");
    std::filesystem::create_directories(root.path("/sys/class/nvme"));
    std::filesystem::create_directory_symlink(root.path(folder),
                                              root.path("/sys/class/nvme/" + name));
  }
  bool readAll(std::int64_t now) { return HealthReader(root, files, answers, log).readAll(now); }
  std::map<std::string, Reading> readings() {
    std::map<std::string, Reading> byName;
    for (Reading& reading : loadReadings(root, files).readings)
      byName.emplace(reading.name, reading);
    return byName;
  }

  /// Leaves the state that the daily run of a day leaves.
  void run(std::int64_t day) const {
    write("/var/mobile/Library/Preferences/com.norvane.tallied.tavrel.plist",
          *plist::writeXml(plist::Dictionary{{std::string(kLastRunDayKey), day}}));
  }

  /// Reads drives on one day, and leaves the state of the next day's run.
  void startWith(const Lines& names) {
    for (const std::string& name : names)
      addNvme(name, name);
    run(1);
    ASSERT_TRUE(readAll(1000));
    run(2);
  }
  /// The growth of a drive's written bytes in its last reading.
  std::int64_t grown(const char* name) { return valuesOf(readings()[name].growth)["written"]; }

  WatchedFiles files;
  KeptLog log;
  Answers answers;
};

TEST_F(HealthReaderTest, LeavesReadingsOfAllDrives) {
  addNvme("nvme0", "S1");
  write("/sys/block/mmcblk0/device/type", "MMC\n");
  write("/sys/block/mmcblk0/device/life_time", "0x02 0x01\n");
  for (const char* idle : {"/sys/block/mmcblk0/device", "/sys/class/mtd/mtd0"})
    write(std::string(idle) + "/power/runtime_status", "suspended\n");
  write("/sys/class/mtd/mtd0/ecc_failures", "2\n");
  write("/sys/class/mtd/mtd0/corrected_bits", "-\n");
  write("/sys/class/ubi/ubi0/max_ec", "9\n");
  write("/sys/class/ubi/ubi0/mtd_num", "7\n");
  write("/sys/class/ubi/ubi1/mtd_num",
        "a text as long as labels may be, which is 64 bytes and no more..");
  const std::string host = "/sys/devices/ufs/host/";
  write("/sys/devices/ufs/health_descriptor/life_time_estimation_a", "0x03\n");
  for (const std::string unit : {"sdb", "sdc"}) {
    write(host + unit + "/vendor", "MAKER\n");
    std::filesystem::create_directories(root.path("/sys/block/" + unit));
    std::filesystem::create_directory_symlink(root.path(host + unit),
                                              root.path("/sys/block/" + unit + "/device"));
  }
  write("/sys/block/sda/device/vendor", "ATA\n");  // asleep: `answers` has no data of it
  write("/sys/block/sda/device/vpd_pg80", std::string("\0\x80\0\4S123", 8));
  EXPECT_EQ(findDrives(Machine(root))->at(3).serial, "S123");
  ASSERT_TRUE(readAll(1000));
  EXPECT_EQ(log.lines, (Lines{"cannot read the health of ubi1: it reports no health figures"}));
  auto all = readings();
  ASSERT_EQ(all.size(), 6U);
  EXPECT_EQ(valuesOf(all["ufs0"].figures), (Values{{"life_a_pct", 30}}));
  EXPECT_EQ(all["ubi0"].model, "mtd7");
  EXPECT_EQ(all["ubi1"].model, "mtd");
  EXPECT_EQ(all["nvme0"].capacity, 2048 * 512);
  EXPECT_EQ(all["nvme0"].time, 1000);
  EXPECT_EQ(valuesOf(all["nvme0"].figures)["written"], 1'024'000);
  EXPECT_EQ(valuesOf(all["mmcblk0"].figures), (Values{{"life_a_pct", 20}, {"life_b_pct", 10}}));
  EXPECT_EQ(all["mmcblk0"].from, "sysfs, as at the card's initialisation");
  EXPECT_EQ(valuesOf(all["mtd0"].figures), (Values{{"ecc_failures", 2}}));
  const auto named = figuresOf({all["ubi0"]});
  ASSERT_EQ(named.size(), 1U);
  EXPECT_EQ(named[0].name, "ubi0.erases_max");
  EXPECT_EQ(named[0].value, 9);
  EXPECT_EQ(contentOf(root.path("/run/tavrel/health/nvme0.plist")).find("S1"), std::string::npos);
  answers.card = Bytes(512);
  put(*answers.card, 192, {8});
  ASSERT_TRUE(readAll(900));
  all = readings();
  EXPECT_EQ(all["mmcblk0"].error, "it reports no health figures") << "all are not defined";
  for (const char* drive : {"nvme0", "mtd0"})
    EXPECT_EQ(all[drive].time, 900) << "the clock was set back";
}

TEST_F(HealthReaderTest, AsksForTheOcpLogOncePerFirmware) {
  addNvme("nvme0", "S1");
  addNvme("nvme1", "S1");
  answers.ocp.reset();
  ASSERT_TRUE(readAll(900));
  answers.ocp = Bytes{};
  ASSERT_TRUE(readAll(1000) && readAll(2000));
  const std::vector<std::string> expected = {"nvme0 02", "nvme0 C0", "nvme1 02",
                                             "nvme1 C0", "nvme0 02", "nvme0 C0",
                                             "nvme1 02", "nvme0 02", "nvme1 02"};
  EXPECT_EQ(answers.asked, expected);
  write("/sys/devices/pci/nvme1/firmware_rev", "1.1");
  answers.ocp = ocpPage();
  ASSERT_TRUE(readAll(3000));
  auto figures = valuesOf(readings()["nvme1"].figures);
  EXPECT_EQ(figures["media_written"], 1'024'000);
  EXPECT_EQ(figures["waf_milli"], 1000);
  EXPECT_EQ(figures["throttle_events"], 255);
  EXPECT_FALSE(figures.contains("bad_user_blocks"));
  EXPECT_FALSE(valuesOf(readings()["nvme0"].figures).contains("media_written"));
  const std::string memory = contentOf(root.path(kMemoryFile));
  EXPECT_EQ(decodeMemory(asBytes(memory))->drives.size(), 2U) << "drives of one serial number";
}

TEST_F(HealthReaderTest, FlashThatNeedsNoCommandCostsOneWriting) {
  addNvme("nvme0", "S1");
  for (const char* name : {"mtd0", "mtd1", "mtd2"})
    write(std::string("/sys/class/mtd/") + name + "/ecc_failures", "2\n");
  ASSERT_TRUE(readAll(1000));
  EXPECT_EQ(files.written[root.path(kMemoryFile)], 2);
  EXPECT_EQ(files.written.size(), 5U);
}

TEST_F(HealthReaderTest, ADriveThatIsBeingReadKeepsNoOtherWaiting) {
  addNvme("nvme0", "S1");
  addNvme("nvme1", "S2");
  const auto stuck = files.lockFile(root.path("/run/tavrel/health/.nvme0.lock"));
  EXPECT_FALSE(readAll(1000));
  EXPECT_EQ(readings().size(), 1U);
  EXPECT_EQ(readings()["nvme1"].time, 1000);
  EXPECT_EQ(log.lines, (Lines{"cannot read the health of nvme0: cannot lock " +
                              root.path("/run/tavrel/health/.nvme0.lock") +
                              ": another process has it locked; it is reading the drive, which is "
                              "defective if that never ends"}));
}

TEST_F(HealthReaderTest, ALateAnswerSpoilsNoLaterReading) {
  startWith({"nvme0", "nvme1", "nvme2"});
  answers.whileAsked = [this] {
    run(3);
    put(*answers.smart, 48, {4});
    write("/sys/class/mtd/mtd0/ecc_failures", "2\n");
    answers.killer = "nvme2";
    EXPECT_THROW(readAll(3000), std::bad_alloc);
    answers.killer = "none";
  };
  ASSERT_TRUE(readAll(2000));
  EXPECT_EQ(readings()["nvme0"].time, 2000) << "the later run has left it out";
  EXPECT_EQ(readings()["nvme1"].time, 3000);
  EXPECT_EQ(readings()["nvme2"].time, 2000) << "the later run has not read it";
  EXPECT_EQ(readings()["mtd0"].time, 3000) << "the drive came after the beginning of this run";
  EXPECT_EQ(grown("nvme0"), 2 * 512'000);
  EXPECT_EQ(grown("nvme1"), 2 * 512'000);
}

TEST_F(HealthReaderTest, NoEarlierFiguresReplaceThoseOfAnotherRun) {
  const std::string counter = "/sys/class/mtd/mtd0/corrected_bits";
  for (const std::int64_t other : {1900, 2100}) {
    run(other);
    write(counter, "1000000\n");
    ASSERT_TRUE(readAll(1000));
    run(2000);
    files.part = "/health/.lock";
    files.meddle = [&] {
      write(counter, "1000001\n");
      EXPECT_TRUE(readAll(other));
    };
    ASSERT_TRUE(readAll(2000));
    Reading reading = readings()["mtd0"];
    EXPECT_EQ(reading.time, std::max<std::int64_t>(other, 2000));
    EXPECT_EQ(valuesOf(reading.figures), (Values{{"corrected_bits", 1'000'001}}));
    EXPECT_EQ(valuesOf(reading.growth), (Values{{"corrected_bits", 1}}));
  }
}

TEST_F(HealthReaderTest, ADriveIsLockedUntilItsReadingIsStored) {
  startWith({"nvme0"});
  put(*answers.smart, 48, {3});
  files.part = "/health/.lock";
  files.meddle = [this] {
    put(*answers.smart, 48, {4});
    EXPECT_FALSE(readAll(3000)) << "nvme0 is being read";
  };
  ASSERT_TRUE(readAll(2000));
  EXPECT_EQ(grown("nvme0"), 512'000);
}

TEST_F(HealthReaderTest, SleepsFailuresAndReplacement) {
  startWith({"nvme0"});
  put(*answers.smart, 48, {5});
  ASSERT_TRUE(readAll(2000));
  EXPECT_EQ(grown("nvme0"), 3 * 512'000);

  write("/sys/devices/pci/power/runtime_status", "suspended\n");  // the drive's parent device
  answers.asked.clear();
  ASSERT_TRUE(readAll(3000));
  EXPECT_TRUE(answers.asked.empty());
  EXPECT_EQ(readings()["nvme0"].time, 2000);

  write("/sys/devices/pci/power/runtime_status", "active\n");
  write("/sys/devices/pci/nvme0/serial", "S9");
  ASSERT_TRUE(readAll(4000));
  EXPECT_TRUE(readings()["nvme0"].growth.empty());  // another drive
  write("/sys/devices/pci/nvme0/serial", "");
  ASSERT_TRUE(readAll(4100));
  write("/sys/devices/pci/nvme0/model", "another");
  put(*answers.smart, 48, {9});
  ASSERT_TRUE(readAll(4200));
  EXPECT_TRUE(readings()["nvme0"].growth.empty()) << "its model tells it apart";

  answers.smart.reset();
  ASSERT_TRUE(readAll(5000));
  EXPECT_EQ(readings()["nvme0"].error, "NVMe status 0x4002");
  EXPECT_TRUE(readings()["nvme0"].figures.empty());
  std::filesystem::remove(root.path("/sys/class/nvme/nvme0"));
  ASSERT_TRUE(readAll(6000));
  EXPECT_TRUE(readings().empty());
  ASSERT_TRUE(readAll(6000 + 401 * 86'400));
  EXPECT_TRUE(decodeMemory(asBytes(contentOf(root.path(kMemoryFile))))->drives.empty());
}

TEST_F(HealthReaderTest, AKilledReaderTellsNoGrowthTwice) {
  startWith({"nvme0", "nvme1"});
  answers.killer = "nvme1";
  for (const unsigned day : {2U, 3U, 4U}) {
    run(day);
    put(*answers.smart, 48, {day + 1});
    EXPECT_THROW(readAll(1000 + day), std::bad_alloc);
    EXPECT_EQ(grown("nvme0"), 512'000) << day;
  }
  answers.killer = "none";
  run(5);
  put(*answers.smart, 48, {6});
  files.refusals = 1;
  EXPECT_FALSE(readAll(5000));
  EXPECT_EQ(readings()["nvme0"].time, 5000);
  EXPECT_TRUE(readings()["nvme0"].growth.empty()) << "it could not be remembered";
  EXPECT_EQ(grown("nvme1"), 4 * 512'000);
  run(6);
  ASSERT_TRUE(readAll(6000));
  EXPECT_EQ(grown("nvme0"), 512'000);
}

TEST_F(HealthReaderTest, KeepsReadingsAndGrowthThroughFailures) {
  startWith({"nvme0"});
  put(*answers.smart, 48, {3});
  const std::string state =
      root.path("/var/mobile/Library/Preferences/com.norvane.tallied.tavrel.plist");
  std::filesystem::rename(state, state + ".aside");
  std::filesystem::create_directory(state);
  EXPECT_FALSE(readAll(2000));
  EXPECT_EQ(readings()["nvme0"].time, 2000);
  EXPECT_TRUE(readings()["nvme0"].growth.empty());
  std::filesystem::remove(state);
  std::filesystem::rename(state + ".aside", state);

  write("/sys/class/mtd", "no folder");
  EXPECT_FALSE(readAll(3000));
  const std::string vendor = root.path("/sys/block/sda/device/vendor");
  write("/sys/block/sda/device/model", "DISK");
  std::filesystem::create_symlink(vendor, vendor);
  EXPECT_FALSE(readAll(3000));
  std::filesystem::remove(vendor);
  EXPECT_EQ(readings()["nvme0"].time, 2000);
  EXPECT_EQ(log.lines, (Lines{"readings have no growth: cannot use " + state +
                                  ": it is a folder; move it away",
                              "cannot look for drives: cannot list " + root.path("/sys/class/mtd") +
                                  ": Not a directory",
                              "cannot look for drives: cannot read " + vendor +
                                  ": Too many levels of symbolic links"}));
  std::filesystem::remove(root.path("/sys/class/mtd"));
  ASSERT_TRUE(readAll(4000));
  EXPECT_EQ(grown("nvme0"), 512'000);
}

TEST(HealthTest, Verdicts) {
  constexpr DriveKind kNvme = DriveKind::Nvme;
  const struct {
    DriveKind kind;
    Values figures;
    const char* word;
    int problems;
    std::string error{};
  } cases[] = {
      {kNvme, {{"used_pct", 99}, {"spare_pct", 10}, {"spare_threshold_pct", 10}}, "good", 0},
      {kNvme, {{"used_pct", 255}}, "worn", kWorn},
      {kNvme, {{"spare_pct", 9}, {"spare_threshold_pct", 10}}, "worn", kWorn},
      {kNvme, {{"critical_warning", 4}, {"media_errors", 1}}, "failing", kFailing | kErrors},
      {DriveKind::Ata, {{"smart_good", 0}}, "failing", kFailing},
      {DriveKind::Ata,
       {{"failing_attributes", 1}, {"bad_sectors", 1}},
       "failing",
       kFailing | kErrors},
      {DriveKind::Emmc, {{"life_a_pct", 100}, {"life_b_pct", 100}}, "good", 0},
      {kNvme, {{"uncorrectable_reads", 1}}, "errors", kErrors},
      {DriveKind::Emmc, {{"pre_eol", 3}}, "failing", kFailing | kWorn},
      {kNvme, {}, "unknown", kUnread, "no"}};
  for (const auto& each : cases) {
    Reading reading;
    reading.kind = each.kind;
    reading.error = each.error;
    reading.time = 1000;
    reading.boot = "a";
    for (const auto& [name, value] : each.figures)
      reading.figures.push_back({figureKind(each.kind, name), value});
    const Verdict verdict = judge(reading, 1000, "a");
    EXPECT_STREQ(verdict.word(), each.word);
    EXPECT_EQ(int{verdict.problems}, each.problems);
    EXPECT_EQ(judge(reading, 1000, "b").problems, each.problems | kOld);
    EXPECT_EQ(judge(reading, 1001 + 2 * 86'400, "a").problems, each.problems | kOld);
  }
  const auto document =
      plist::writeBinary(plist::Dictionary{{"version", 1},
                                           {"name", "d"},
                                           {"kind", nameOf(DriveKind::Nvme)},
                                           {"time", plist::Date::since1970(-1e300)}});
  EXPECT_EQ(judge(*decodeReading(asBytes(*document)), 1'800'000'000, "").problems, kOld);
}

}  // namespace
}  // namespace tavrel::health
