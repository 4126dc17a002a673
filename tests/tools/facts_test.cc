// Text and JSON of a command have the same facts: each figure of the text is in the JSON.
#include <array>
#include <charconv>
#include <cmath>
#include <gtest/gtest.h>
#include <map>
#include <nlohmann/json.hpp>
#include <set>

#include "base/format.h"
#include "device.h"

namespace tavrel {
namespace {

// Units in the text, with how many of the JSON's units make one of them.
constexpr std::pair<std::string_view, double> kUnits[] = {
    {"%", 0.01},     {"KiB", 0x1p10}, {"MiB", 0x1p20}, {"GiB", 0x1p30}, {"TiB", 0x1p40},
    {"PiB", 0x1p50}, {"EiB", 0x1p60}, {"ns", 1e-9},    {"µs", 1e-6},    {"ms", 1e-3},
};

struct Figure {
  std::string digits;
  double value = 0;
  double tolerance = 0;  // what rounding may have taken away; none of whole numbers

  bool isOneOf(const std::set<std::string>& texts, const std::vector<double>& values) const {
    if (texts.contains(digits)) return true;
    return std::any_of(values.begin(), values.end(), [this](double candidate) {
      return std::abs(std::abs(candidate) - value) <= tolerance * 1.000001;
    });
  }
};

std::vector<Figure> figuresOf(std::string_view text) {
  constexpr std::string_view kDigits = "0123456789";
  std::vector<Figure> figures;
  for (std::size_t at; (at = text.find_first_of(kDigits)) != std::string_view::npos;) {
    text.remove_prefix(at);
    Figure figure;
    std::uint64_t word = 0;
    const bool isHexadecimal = text.starts_with("0x");
    const char* const end = text.data() + text.size();
    const char* const stop = isHexadecimal ? std::from_chars(text.data() + 2, end, word, 16).ptr
                                           : std::from_chars(text.data(), end, figure.value).ptr;
    figure.digits.assign(text.data(), stop);
    if (isHexadecimal) figure.digits = std::to_string(word);
    text.remove_prefix(static_cast<std::size_t>(stop - text.data()));
    const std::size_t point = figure.digits.find('.');
    double unit = 1;
    for (const auto& [name, factor] : kUnits) {
      if (text.substr(text.starts_with(' ') ? 1 : 0).starts_with(name)) unit = factor;
    }
    if (point != std::string::npos || unit != 1) {
      const auto decimals =
          point == std::string::npos ? 0.0 : static_cast<double>(figure.digits.size() - point - 1);
      figure.value *= unit;
      figure.tolerance = 0.5 * std::pow(10.0, -decimals) * unit;
    }
    figures.push_back(std::move(figure));
  }
  return figures;
}

// The figures of a document: its numbers, those in its texts, and the sizes of its lists.
void collect(const nlohmann::json& json, std::set<std::string>& texts,
             std::vector<double>& values) {
  if (json.is_structured()) texts.insert(std::to_string(json.size()));
  if (json.is_array()) {
    for (std::size_t i = 0; i < json.size(); ++i) {
      if (json[i].is_number() || json[i].is_null()) texts.insert(std::to_string(i));
    }
  }
  if (json.is_object()) {
    for (const auto& [key, value] : json.items())
      collect(nlohmann::json(key), texts, values);
  }
  if (json.is_structured()) {
    for (const auto& element : json)
      collect(element, texts, values);
  } else if (json.is_number()) {
    texts.insert(json.dump());
    values.push_back(json.get<double>());
  } else if (json.is_string()) {
    for (const Figure& figure : figuresOf(json.get<std::string>()))
      texts.insert(figure.digits);
  }
}

// Data is hexadecimal here and base64 in JSON; an instant's zone is Z there.
std::string withoutOtherForms(std::string text) {
  for (std::size_t at = 0; (at = text.find('<', at)) != std::string::npos; ++at) {
    const std::size_t end = text.find_first_not_of("0123456789abcdef", at + 1);
    if (end != std::string::npos && text[end] == '>') text.erase(at, end - at);
  }
  for (std::size_t at; (at = text.find(" +0000")) != std::string::npos;)
    text.erase(at, 6);
  return text;
}

// Figures of the text that JSON lacks.
std::string missingFigures(const std::string& text, const std::string& document) {
  const auto json = nlohmann::json::parse(document, nullptr, false);
  if (json.is_discarded()) return "no JSON";
  std::set<std::string> texts;
  std::vector<double> values;
  collect(json, texts, values);
  std::string missing;
  for (const Figure& figure : figuresOf(withoutOtherForms(text))) {
    if (!figure.isOneOf(texts, values)) missing += figure.digits + ' ';
  }
  return missing;
}

using Words = std::vector<std::string>;

Words namesOfCommands(const TemporaryDevice& device, const Words& group) {
  Words help = group;
  help.emplace_back("--help");
  std::istringstream lines(device.run(help).out);
  Words names;
  bool isInList = false;
  for (std::string line; std::getline(lines, line);) {
    if (isInList && line.starts_with("  ")) {
      names.push_back(line.substr(2, line.find(' ', 2) - 2));
    } else {
      isInList = line == "Subcommands:";
    }
  }
  return names;
}

// "log list", "status": what takes --json.
std::set<std::string> commandsWithJson(const TemporaryDevice& device) {
  std::set<std::string> found;
  for (const std::string& name : namesOfCommands(device, {})) {
    Words commands = namesOfCommands(device, {name});
    if (commands.empty()) commands.emplace_back();
    for (const std::string& command : commands) {
      Words help{name, command, "--help"};
      std::erase(help, "");
      if (device.run(help).out.find("\n  --json") == std::string::npos) continue;
      found.insert(name + (command.empty() ? "" : " ") + command);
    }
  }
  return found;
}

void file(const TemporaryDevice& device, const std::string& name, const char* type,
          const std::string& logName, const std::string& text) {
  const std::string path = "/var/mobile/Library/Logs/Submission/pending/" + name;
  device.write(path + ".log", text);
  device.write(path + ".metadata.plist",
               xmlOf(format(R"({"LogType": "%s", "LogName": "%s", "OSVersion": "A 4",
                                "Time": {"$date": "2026-11-16T18:02:18Z"}})",
                            type, logName)));
}

// A device on which every command has something to print.
void fill(const TemporaryDevice& device) {
  for (const std::string name : {"registry/report.plist", "registry/storage.plist"}) {
    std::ostringstream content;
    content << std::ifstream(TAVREL_EXAMPLES "/" + name).rdbuf();
    device.write("/var/lib/tavrel/" + name, content.str());
  }
  device.write(kWhitelistFile, xmlOf(R"({"G": {"ScalarKeys": {"app.starts": {"sig_fig": 2, "x": 7}},
      "DistributionKeys": {"app.load": {"intervals": [20, 30]}}}})"));
  device.run({"stat", "import"},
             "scalar\t20000\tapp.starts\t12345\nvalue\t20000\tapp.load\t1\t21.5\n"
             "value\t20000\tapp.load\t2\t35.25\n");
  file(device, "log-tallied-1", "193", "log-tallied", xmlOf(R"json({
      "BHCrashLogVersion": 1, "BHStartDate": {"$date": "2026-11-15T00:00:00Z"},
      "BHScalars": {"a": 12345678, "b": -9},
      "BHDistributions": {"d": [1.25, 400.5, 20.123456789, 5, 44]},
      "BHDistributionsHistogram": {"d": {"(-inf, 20]": 41, "(20, inf)": 3}},
      "BHTasking": [{"Key": "k", "Value": 77}]})json"));
  file(device, "StorageStatus-2", "165", "StorageStatus",
       "System ID: 1-2\n\n2026-11-16 18:02:18 +0000 a b[211]: UserWamp:2.05;"
       "com.norvane.NANDInfo.x:7;ValidityList[0]:12,99\n");
  device.write("/var/mobile/Library/Logs/CrashReporter/StructuredData/172-2026-11-27.jsonl",
               R"({"time":"2026-11-27T18:02:18.250Z","type":172,"record":{"id":4,"reg0":17}})"
               "\n");
  device.run({"prefs", "set", "com.example.a", "n", "5125", "--int"});
  device.run({"tasking", "schedule", "-"},
             R"({"TaskingID": "t9", "TaskingDigest": "d8", "TaskingPayload": [
                 {"Domain": "com.example.a", "Key": "m", "Value": 61}]})");
}

TEST(Facts, EveryFigureOfTextIsInJson) {
  const TemporaryDevice device;
  fill(device);
  const std::string buffers = TAVREL_EXAMPLES "/nand/";
  const Words kCommands[] = {
      {"status"},
      {"log", "list"},
      {"log", "show", "log-tallied"},
      {"log", "show", "StorageStatus-2"},
      {"whitelist", "check"},
      {"whitelist", "explain", "app.starts", "app.load", "--value", "123"},
      {"stat", "list"},
      {"stat", "show", "app.starts"},
      {"stat", "show", "app.load"},
      {"tasking", "show"},
      {"nand", "info"},
      {"nand", "info", "--all"},
      {"nand", "parse", buffers + "statistics.bin"},
      {"nand", "parse", buffers + "statistics.bin", "--diff", buffers + "statistics-later.bin"},
      {"nand", "counters", buffers + "counters.bin", "--chip-id", "K4V", "--manufacturer-id",
       "4582603A5700"},
      {"nand", "freezer", buffers + "stack-snapshot.bin"},
      {"nandlog", "show"},
      {"records", "list"},
      {"records", "show"},
      {"prefs", "list"},
      {"prefs", "list", "com.example.a"},
      {"prefs", "get", "com.example.a", "n"},
      {"plist", "show", device.path(kWhitelistFile)},
      {"registry", "list"},
      {"registry", "show", "4294967809"},
      {"report", "list"},
      {"report", "list", "--flat"},
      {"report", "sample"},
      {"report", "sample", "--delta", "--interval", "0"},
  };
  // Commands whose two outputs cannot be compared: each run differs (disk space, identifiers), a
  // run changes what the next one prints, or the text is a document of its own.
  std::set<std::string> covered{"log preview", "notify post", "notify wait", "rehearse",
                                "stat import"};
  for (const Words& command : kCommands) {
    const Outcome text = device.run(command);
    Words withJson = command;
    withJson.emplace_back("--json");
    const Outcome json = device.run(withJson);
    EXPECT_EQ(json.status, text.status) << text;
    EXPECT_NE(text.out, "") << text;
    EXPECT_EQ(missingFigures(text.out, json.out), "") << command[0] << ' ' << command.back();
    covered.insert(command[0]);
    if (command.size() > 1) covered.insert(command[0] + ' ' + command[1]);
  }
  for (const std::string& command : commandsWithJson(device))
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
