// The catalogue: look-ups, its completeness, and documents that the build rejects.

#include "catalogue/catalogue.h"

#include <regex>
#include <set>
#include <sys/wait.h>

#include "device.h"
#include "platform/linux/health/ata_smart.h"
#include "platform/linux/health/flash_life.h"
#include "platform/linux/health/mtd_ubi.h"
#include "platform/linux/health/nvme_logs.h"
#include "platform/linux/live/device_tables.h"
#include "storage/key_map_table.h"
#include "storage/parse/statistic_keys.h"

namespace tavrel {
namespace {

using catalogue::Entry;
using catalogue::Since;

std::string keyOf(const Entry* entry) {
  return entry ? std::string(entry->key) : "none";
}

TEST(CatalogueTest, FindsRows) {
  const Entry* const processes = catalogue::findStatistic("com.norvane.usage.processes");
  ASSERT_TRUE(processes);
  EXPECT_EQ(processes->unit, "count");
  EXPECT_EQ(processes->meaning, "Processes");
  EXPECT_EQ(processes->since, Since::Now);

  const std::string thousandDots(1000, '.');
  const std::pair<std::string, std::string> statistics[] = {
      {"com.norvane.usage.processe", "none"},
      {"com.norvane.usage.processes2", "none"},
      {"com.norvane.usage.processes#", "none"},
      {"", "none"},
      {"#2", "none"},
      {"zzz", "none"},
      {"com.norvane.ioreport.nvme0.spare_pct", "com.norvane.ioreport.<drive>.spare_pct"},
      {"com.norvane.ioreport.nvme0.spare_pct#2", "com.norvane.ioreport.<drive>.spare_pct"},
      {"com.norvane.ioreport..spare_pct", "com.norvane.ioreport.*"},
      {"com.norvane.ioreport.fs.errors", "com.norvane.ioreport.fs.errors"},
      {"com.norvane.ioreport.fs.errorsX", "com.norvane.ioreport.*"},
      {"com.norvane.ioreport.", "com.norvane.ioreport.*"},
      {"com.norvane.ioreport", "none"},
      {"statsd.tavrel-statsd.too_long", "statsd.tavrel-statsd.too_long"},
      {"com.norvane.NANDInfo.PadSize4", "com.norvane.NANDInfo.PadSize<n>"},
      {"com.norvane.NANDInfo.PadSize4x", "none"},
  };
  for (const auto& [key, row] : statistics)
    EXPECT_EQ(keyOf(catalogue::findStatistic(key)), row) << key;

  const std::array<std::string, 4> channels[] = {
      {"block <id 0x12>", "Block", "sda.reads", "<disk>.reads"},
      {"block", "Daily", "sda.reads", "none"},
      {"cpu-time", "CPU Time", "cpu.user", "cpu.user"},
      {"cpu-time", "CPU Time", "cpu2.user", "<cpu>.user"},
      {"memory-errors", "Memory", "mc0.corrected", "<controller>.corrected"},
      {"memory-errors", "Memory", "mc0.dimm1.corrected", "<controller>.<module>.corrected"},
      {"sensors", "Sensors", "a@b.temp12_highest#3", "<chip>.temp<n>_highest"},
      {"sensors", "Sensors", "a@b.tempX_highest", "none"},
      {"sensors", "Sensors", thousandDots + "temp1", "<chip>.temp<n>"},
      {"memory-errors", "Memory", thousandDots, "none"},
  };
  for (const auto& [driver, group, name, row] : channels)
    EXPECT_EQ(keyOf(catalogue::findChannel(driver, group, name)), row) << name;

  EXPECT_EQ(keyOf(catalogue::findController("ECBins10")), "ECBins<n>");
  EXPECT_EQ(keyOf(catalogue::findController("ECBins")), "ECBins<n>");
  EXPECT_EQ(keyOf(catalogue::findController("boots1")), "none");
}

TEST(CatalogueTest, FindsEachOfItsRows) {
  using catalogue::Kind;
  for (const Kind kind : {Kind::Statistic, Kind::Channel, Kind::Controller}) {
    for (const Entry& row : catalogue::entries(kind)) {
      const std::string name =
          std::regex_replace(std::string(row.key), std::regex("<[a-z]+>"), "7");
      const Entry* const found = kind == Kind::Statistic ? catalogue::findStatistic(name)
                                 : kind == Kind::Channel
                                     ? catalogue::findChannel(row.driver, row.group, name)
                                     : catalogue::findController(name);
      EXPECT_EQ(found, &row) << name;
    }
  }
}

TEST(CatalogueTest, HasWhatTheControllerReports) {
  for (const StatisticKey& row : kStatisticKeys) {
    const std::string name(row.name);
    const std::string key = row.cap > 1 ? name + "<n>" : name;
    EXPECT_EQ(keyOf(catalogue::findController(row.cap > 1 ? name + "0" : name)), key);
  }
  EXPECT_EQ(catalogue::entries(catalogue::Kind::Controller).size(), kStatisticKeys.size());
  for (const KeyMapRow& row : keyMap) {
    const std::string key = "com.norvane.NANDInfo." + std::string(row.suffix);
    EXPECT_TRUE(catalogue::findStatistic(key)) << key;
  }
}

// In these folders, keys of statistics are literals, as are preference domains.
TEST(CatalogueTest, HasWhatIsRecorded) {
  const std::set<std::string> others = {"com.norvane.NANDInfo",
                                        "com.norvane.NANDInfo.Error",
                                        "com.norvane.NANDInfo.ErrorMessage",
                                        "com.norvane.NANDInfo.VMFreezer.Error",
                                        "com.norvane.NANDInfo.VMFreezer.ErrorMessage",
                                        "com.norvane.demo-settings",
                                        "com.norvane.zentrix.tavrel",
                                        "com.norvane.zentrix.tallied.tavrel"};
  const std::regex literal("\"(com\\.norvane\\.[^\" ]*[^\" .])\"");
  std::size_t count = 0;
  for (const char* const room :
       {"report", "storage", "platform/linux/folding", "platform/linux/limits", "tools/stat"}) {
    for (const auto& file :
         std::filesystem::recursive_directory_iterator(TAVREL_SOURCE "/" + std::string(room))) {
      if (!file.is_regular_file()) continue;
      const std::string text = contentOf(file.path());
      for (std::sregex_iterator at(text.begin(), text.end(), literal), end; at != end; ++at) {
        const std::string key = (*at)[1];
        if (others.contains(key)) continue;
        EXPECT_TRUE(catalogue::findStatistic(key)) << file.path() << ": " << key;
        ++count;
      }
    }
  }
  EXPECT_GT(count, 70U);
}

TEST(CatalogueTest, HasTheFiguresOfDevices) {
  using namespace health;
  const auto unitOf = [](const std::string& name) {
    const Entry* const entry = catalogue::findChannel("drive-health", "Health", "nvme0." + name);
    return entry ? std::string(entry->unit) : "none";
  };
  for (const auto kinds : {nvmeSmartKinds(), nvmeOcpKinds(), nvmeDerivedKinds(), emmcKinds(),
                           ufsKinds(), ataKinds(), mtdKinds(), ubiKinds()}) {
    for (const FigureKind& kind : kinds) {
      const std::string name(kind.name);
      const std::string unit = unitOf(name);
      EXPECT_NE(unit, "none") << name;
      EXPECT_EQ(unit == "bytes", kind.unit == health::kBytes) << name;
      EXPECT_EQ(unit == "count", kind.unit == health::kEvents) << name;
      if (kind.resets == Resets::NotACounter) continue;
      EXPECT_EQ(unitOf(name + "_growth"), unit) << name;
    }
  }
  const auto find = [](const live::DeviceClass& devices, const live::Attribute& attribute) {
    std::string name = "x." + std::string(attribute.channel);
    if (const auto star = name.find('*'); star != std::string::npos) name.replace(star, 1, "12");
    EXPECT_TRUE(catalogue::findChannel(devices.name, devices.group, name)) << name;
    if (attribute.daily.fold.empty()) return;
    EXPECT_TRUE(catalogue::findChannel(devices.name, "Daily", attribute.daily.fold)) << name;
  };
  for (const live::DeviceClass& devices : live::deviceClasses()) {
    for (const live::Attribute& attribute : devices.attributes)
      find(devices, attribute);
    for (const live::Attribute& attribute : devices.partAttributes)
      find(devices, attribute);
  }
  for (const live::Attribute& attribute : live::suspendAttributes()) {
    EXPECT_TRUE(catalogue::findChannel("suspend", "Suspend", attribute.channel))
        << attribute.channel;
  }
}

TEST(CatalogueTest, RefusesBrokenDocuments) {
  const TemporaryDevice folder;
  const std::filesystem::path documents(folder.path("/documents"));
  std::filesystem::create_directory(documents);
  std::filesystem::copy_file(TAVREL_SOURCE "/docs/catalogue/README.md", documents / "README.md");
  const std::string head = "# [x]; \\\n\n| key | unit | since | meaning |\n|---|---|---|---|\n";
  const std::string row = "| `a.b` | count | now | Things; others |\n";
  const std::pair<std::string, std::string> cases[] = {
      {head + row + "| `a<x>` | count | | not known |\n", ""},
      {head + row + "| `a.<x>` | count | now |\n", "6: 3 cells, where the table has 4 columns"},
      {head + row + row, "6: 'a.b' is already at t.md:5"},
      {head + "| `a.b` | pounds | now | X |\n", "5: unit 'pounds' is not in the table of units"},
      {head + "| `a.b` | count | then | X |\n",
       "5: since 'then' is not in the table of that column"},
      {head + "| `a.b` | count | now | |\n", "5: the meaning is empty or ends with a full stop"},
      {head + "| `a.b` | count | now | X. |\n", "5: the meaning is empty or ends with a full stop"},
      {head + "| `a.b` | count | now | [X] |\n",
       "5: meaning: no backtick, quotation mark, backslash or bracket inside a cell"},
      {head + "| `a*b` | count | now | X |\n",
       "5: 'a*b' is not a key with at most two placeholders"},
      {head + "| `<a>.<b>.<c>` | count | now | X |\n",
       "5: '<a>.<b>.<c>' is not a key with at most two placeholders"},
      {"| key | meaning |\n", "1: no table of the catalogue has these columns"},
  };
  for (const auto& [document, fault] : cases) {
    folder.write("/documents/t.md", document);
    const std::string rows = folder.path("/rows");
    const std::string log = folder.path("/log");
    const int status =
        std::system(format(TAVREL_CMAKE " -DDOCUMENTS=%s -DOUTPUT=%s -P " TAVREL_SOURCE
                                        "/catalogue/rows.cmake 2> %s",
                           documents.string(), rows, log)
                        .c_str());
    // CMake wraps long lines.
    const std::string said = std::regex_replace(contentOf(log), std::regex("\\s+"), " ");
    EXPECT_EQ(WEXITSTATUS(status), fault.empty() ? 0 : 1) << said;
    const std::string where = fault.empty() ? "" : (documents / "t.md:").string() + fault + " ";
    EXPECT_NE(said.find(where), std::string::npos) << said << "\nlacks\n" << where;
    if (!fault.empty()) continue;
    EXPECT_NE(
        contentOf(rows).find("{\"a<x>\", \"count\", \"\", Since::Unknown, \"\", \"\"},\n    "
                             "{\"a.b\", \"count\", \"Things; others\", Since::Now, \"\", \"\"},"),
        std::string::npos);
  }
}

TEST(CatalogueTest, TheToolShowsEntries) {
  const TemporaryDevice device;
  device.check(
      "catalogue com.norvane.usage.processes eth0.100.rx_bytes ECBins3",
      prints("com.norvane.usage.processes\n"
             "  kind     statistic\n  unit     count\n  since    now\n  meaning  Processes\n"
             "eth0.100.rx_bytes\n"
             "  kind     channel\n  driver   network\n  group    Network\n  row      "
             "<interface>.rx_bytes\n"
             "  unit     bytes\n  since    attach\n  meaning  Data received\n"
             "ECBins3\n  kind     controller\n  row      ECBins<n>\n"
             "  unit     not known\n  since    not known\n  meaning  not known\n"));
  device.check("catalogue x", fails("no entry for x: see 'tavrelctl catalogue'"));
  const auto boots = device.json("catalogue boots")["entries"];
  EXPECT_EQ(boots, R"([{"key": "boots", "kind": "controller", "row": "boots", "driver": null,
      "group": null, "unit": "count", "since": null, "meaning": "Boots"}])"_json);
  std::size_t rows = 0;
  for (const auto kind :
       {catalogue::Kind::Statistic, catalogue::Kind::Channel, catalogue::Kind::Controller}) {
    rows += catalogue::entries(kind).size();
  }
  EXPECT_EQ(device.json("catalogue")["entries"].size(), rows);
  device.write("/in", "scalar\t20700\tcom.norvane.usage.swap.used_mib\t7\n");
  device.run("stat import " + device.path("/in"));
  device.check("stat show com.norvane.usage.swap.used_mib",
               prints("Scalar com.norvane.usage.swap.used_mib, 1 day\nSwap space in use (MiB)\n\n"
                      "  DAY                 VALUE\n  20700 (2026-09-04)      7\n"));
  const auto json = device.json("stat show com.norvane.usage.swap.used_mib");
  EXPECT_EQ(json["meaning"], "Swap space in use");
  EXPECT_EQ(json["unit"], "MiB");
}

}  // namespace
}  // namespace tavrel
