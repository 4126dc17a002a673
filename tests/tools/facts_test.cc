// A command's text and JSON state the same facts: each figure of the text is in the JSON.
#include <cmath>
#include <map>
#include <regex>
#include <set>

#include "help.h"

namespace tavrel {
namespace {

// Units in the text, and how many units of the JSON make one of them.
const std::map<std::string, double> kUnits = {{"", 1},         {"%", 0.01},     {"KiB", 0x1p10},
                                              {"MiB", 0x1p20}, {"GiB", 0x1p30}, {"TiB", 0x1p40},
                                              {"PiB", 0x1p50}, {"EiB", 0x1p60}, {"ns", 1e-9},
                                              {"µs", 1e-6},    {"ms", 1e-3}};

struct Figure {
  std::string digits;
  double value = 0;
  double tolerance = 0;  // what rounding may have removed; 0 for whole numbers

  bool isOneOf(const std::set<std::string>& texts, const std::vector<double>& values) const {
    if (texts.contains(digits)) return true;
    return std::any_of(values.begin(), values.end(), [this](double candidate) {
      return std::abs(std::abs(candidate) - value) <= tolerance * 1.000001;
    });
  }
};

std::vector<Figure> figuresOf(const std::string& text) {
  static const std::regex kFigure(
      "0x([0-9a-f]+)|([0-9]+(?:\\.([0-9]+))?(?:e[-+]?[0-9]+)?)(?: ?(%|[KMGTPE]iB|ns|µs|ms))?");
  std::vector<Figure> figures;
  for (std::sregex_iterator at(text.begin(), text.end(), kFigure), end; at != end; ++at) {
    const std::smatch& match = *at;
    const double unit = kUnits.at(match[4]);
    Figure figure{match[1].matched ? std::to_string(std::stoull(match[1], nullptr, 16)) : match[2]};
    figure.value = std::strtod(figure.digits.c_str(), nullptr) * unit;
    if (match[3].matched || unit != 1) {
      figure.tolerance = 0.5 * std::pow(10.0, -static_cast<double>(match[3].length())) * unit;
    }
    figures.push_back(std::move(figure));
  }
  return figures;
}

// The figures of a document: its numbers, the numbers in its texts, and the sizes of its lists.
void collect(const nlohmann::json& json, std::set<std::string>& texts,
             std::vector<double>& values) {
  if (json.is_number()) {
    texts.insert(json.dump());
    values.push_back(json.get<double>());
  } else if (json.is_string()) {
    for (const Figure& figure : figuresOf(json.get<std::string>()))
      texts.insert(figure.digits);
  } else if (json.is_structured()) {
    texts.insert(std::to_string(json.size()));
    for (const auto& [key, value] : json.items()) {
      if (json.is_object() || value.is_number() || value.is_null()) collect(key, texts, values);
      collect(value, texts, values);
    }
  }
}

// Figures of the text that the JSON lacks.
std::string missingFigures(const std::string& text, const std::string& document) {
  const auto json = nlohmann::json::parse(document, nullptr, false);
  if (json.is_discarded()) return "no JSON";
  std::set<std::string> texts;
  std::vector<double> values;
  collect(json, texts, values);
  std::string missing;
  // Data is base64 in JSON, and zones of instants are Z there.
  const std::regex otherForms("<[0-9a-f]*>| \\+0000");
  for (const Figure& figure : figuresOf(std::regex_replace(text, otherForms, ""))) {
    if (!figure.isOneOf(texts, values)) missing += figure.digits + ' ';
  }
  return missing;
}

// Adds the commands that accept --json: "log list", "status".
void addCommandsWithJson(const TemporaryDevice& device, const std::string& path, Words& found) {
  const Help help(device, path);
  if (help.options.contains("--json")) found.insert(path);
  for (const std::string& command : help.commands)
    addCommandsWithJson(device, path.empty() ? command : path + " " + command, found);
}

// A device on which every command has something to print.
void fill(const TemporaryDevice& device) {
  for (const std::string name : {"registry/report.plist", "registry/storage.plist"}) {
    device.write("/var/lib/tavrel/" + name, contentOf(TAVREL_EXAMPLES "/" + name));
  }
  device.write(kWhitelistFile, xmlOf(R"({"G": {"ScalarKeys": {"app.starts": {"sig_fig": 2, "x": 7}},
      "DistributionKeys": {"app.load": {"intervals": [20, 30]}}}})"));
  device.write("/coarser.plist", xmlOf(R"({"G": {"ScalarKeys": {"app.starts": {"sig_fig": 2}}}})"));
  device.write("/finer.plist", xmlOf(R"({"G": {"ScalarKeys": {"app.starts": {"sig_fig": 3}}}})"));
  device.run("stat import",
             "scalar\t20000\tapp.starts\t12345\nvalue\t20000\tapp.load\t1\t21.5\n"
             "value\t20000\tapp.load\t2\t35.25\n");
  device.fileLog("pending/log-tallied-1", xmlOf(R"json({
      "BHCrashLogVersion": 1, "BHStartDate": {"$date": "2026-11-15T00:00:00Z"},
      "BHScalars": {"a": 12345678, "b": -9},
      "BHDistributions": {"d": [1.25, 400.5, 20.123456789, 5, 44]},
      "BHDistributionsHistogram": {"d": {"(-inf, 20]": 41, "(20, inf)": 3}},
      "BHTasking": [{"Key": "k", "Value": 77}]})json"),
                 R"({"LogType": "193", "LogName": "log-tallied", "OSVersion": "A 4",
                     "Time": {"$date": "2026-11-16T18:02:18Z"}})");
  device.fileLog("pending/StorageStatus-2",
                 "System ID: 1-2\n\n2026-11-16 18:02:18 +0000 a b[211]: UserWamp:2.05;"
                 "com.norvane.NANDInfo.x:7;ValidityList[0]:12,99\n",
                 R"({"LogType": "165", "LogName": "StorageStatus", "OSVersion": "A 4",
                     "Time": {"$date": "2026-11-16T18:02:18Z"}})");
  device.write("/var/mobile/Library/Logs/CrashReporter/StructuredData/172-2026-11-27.jsonl",
               R"({"time":"2026-11-27T18:02:18.250Z","type":172,"record":{"id":4,"reg0":17}})"
               "\n");
  device.write("/sys/class/ubi/ubi0/max_ec", "91\n");
  device.write("/sys/class/ubi/ubi0/total_eraseblocks", "2048\n");
  device.write("/sys/class/ubi/ubi0/eraseblock_size", "126976\n");
  device.run("prefs set com.example.a n 5125 --int");
  device.run("tasking schedule -",
             R"({"TaskingID": "t9", "TaskingDigest": "d8", "TaskingPayload": [
                 {"Domain": "com.example.a", "Key": "m", "Value": 61}]})");
}

TEST(Facts, EveryFigureOfTextIsInJson) {
  const TemporaryDevice device;
  fill(device);
  const std::string buffers = TAVREL_EXAMPLES "/nand/";
  std::istringstream commands(
      "status|log list|log show log-tallied|log show StorageStatus-2|whitelist check|limits|"
      "whitelist diff " +
      device.path("/coarser.plist") + " " + device.path("/finer.plist") +
      "|"
      "whitelist explain app.starts app.load --value 123|stat list|stat show app.starts|"
      "stat show app.load|tasking show|nand info|nand info --all|nand parse " +
      buffers + "statistics.bin|nand parse " + buffers + "statistics.bin --diff " + buffers +
      "statistics-later.bin|nand counters " + buffers +
      "counters.bin --chip-id K4V --manufacturer-id 4582603A5700|nand freezer " + buffers +
      "stack-snapshot.bin|nandlog show|records list|records show|prefs list|"
      "prefs list com.example.a|prefs get com.example.a n|plist show " +
      device.path("/var/mobile/Library/Preferences/com.example.a.plist") +
      "|registry list|registry show 4294967809|report list|report list --flat|report sample|"
      "report sample --delta --interval 0|disks|disks --all|catalogue");
  // Commands whose two outputs cannot be compared: each run differs (disk space, identifiers), a
  // run changes what the next one prints, or the text is a separate document.
  std::set<std::string> covered{"allow",       "deny",        "erase",    "log preview",
                                "notify post", "notify wait", "rehearse", "stat fold",
                                "stat import", "tidy"};
  for (std::string line; std::getline(commands, line, '|');) {
    const CommandLine command(line);
    const Outcome text = device.run(command);
    const Outcome json = device.run(command.with("--json"));
    EXPECT_EQ(json.status, text.status) << text;
    EXPECT_NE(text.out, "") << text;
    EXPECT_EQ(missingFigures(text.out, json.out), "") << line;
    covered.insert(command.size() == 1 ? command[0] : command[0] + ' ' + command[1]);
  }
  Words commandsWithJson;
  addCommandsWithJson(device, "", commandsWithJson);
  EXPECT_GT(commandsWithJson.size(), 30U);
  for (const std::string& command : commandsWithJson)
    EXPECT_TRUE(covered.contains(command)) << command;
}

TEST(Facts, AreMissedWhereTheyAreMissing) {
  EXPECT_EQ(missingFigures("a 7 of 1.5 KiB at 0x10, 41.3 °C, 9.1 %",
                           R"({"a7": 1, "b": [16, 1500, 41.25, 0.0908]})"),
            "");
  EXPECT_EQ(missingFigures("8 of 1.5 KiB at 0x11, 41.3, 9.1 %, 16.5",
                           R"({"a7": 1, "b": [16, 1400, 41.36, 0.0902]})"),
            "8 1.5 17 41.3 9.1 16.5 ");
}

}  // namespace
}  // namespace tavrel
