// tavrelctl nand: buffers in, figures out.
#include "device.h"

namespace tavrel {
namespace {

using namespace std::string_literals;

// Little-endian 32-bit words.
std::string words(std::initializer_list<std::uint32_t> list) {
  std::string bytes;
  for (const std::uint32_t word : list) {
    for (unsigned i = 0; i < 4; ++i)
      bytes += static_cast<char>(word >> (8 * i) & 0xFF);
  }
  return bytes;
}

std::string built(const TemporaryDevice& device, const std::string& entries) {
  const Outcome outcome = device.run("nand build - -o -", R"({"entries": )" + entries + "}");
  EXPECT_EQ(outcome.status, 0) << outcome;
  return outcome.out;
}

// A device whose driver answers with `statistics`.
void record(const TemporaryDevice& device, const std::string& statistics) {
  const auto data = [](const std::string& bytes) {
    return jsonOf(plist::Data(asBytes(bytes))).dump();
  };
  device.write("/var/lib/tavrel/registry/storage.plist",
               xmlOf(R"({"Services": [{"Class": "ASPStorage", "Methods": [
                {"Method": 8, "Selector": 13, "Flags": 1, "Output": )" +
                     data(words({static_cast<std::uint32_t>(statistics.size())})) + R"(},
                {"Method": 8, "Selector": 13, "Flags": 0, "Output": )" +
                     data(statistics) + "}]}]}"));
}

constexpr const char* kStatistics = R"([
    ["exportVersion", 131075], ["numVirtualBlocks", 1024], ["pagesPerVirtualBlock", 2048],
    ["bytesPerPage", 16384], ["hostWrites", 1000000], ["hostReads", 18446744073709551615],
    ["bandErases", 250], ["numFreeVirtualBlocks", 93], ["utilFormatTime", 946684800],
    ["readCountHisto", [8, 4, 2, 0, 0]], ["gcWrites", 7],
    ["bandsMaxTempHisto0", 0], ["bandsMaxTempHisto1", 0], ["bandsMaxTempHisto2", 0]])";

using NandInfo = DeviceTest;

TEST_F(NandInfo, GroupsWhatTheDriverAnswers) {
  record(device, built(device, kStatistics));
  device.check("nand info", prints(R"(Device
  ExportVersion  131075  0x20003
  DriverVersion      -1

Geometry
  NumVirtualBlocks       1024  of 32.0 MiB, 32.0 GiB in total
  PagesPerVirtualBlock   2048
  BytesPerPage          16384
  NumFreeVirtualBlocks     93  9.1 %

Wear
  NumPhysicalErases  250

Traffic
  NumLogicalReads        -1
  NumLogicalWrites  1000000  sectors of 4 KiB: 3.8 GiB
  NumGCWrites             7

Write amplification
  2.05  erases x virtual block / logical writes

ReadsBeforeErasure
  0                 8  #########################################################
  50000             4  ############################
  100000            2  ##############
  150000 to 200000  0

17 figures are 0; --all shows them
)"));

  const Outcome all = device.run("nand info --all");
  EXPECT_EQ(std::count(all.out.begin(), all.out.end(), '\n'), 42) << all;
  expectIn(all.out, {"\nBandsMaxTempHisto: 3 buckets, all 0\n"});

  const auto json = device.json("nand info");
  EXPECT_EQ(json.size(), 34U) << json;
  EXPECT_EQ(json["derived"]["logical_read_bytes"], nullptr);
  EXPECT_EQ(json["derived"]["formatted_from"], nullptr);
  EXPECT_EQ(json["com.norvane.NANDInfo.NumLogicalReads"], -1);
  EXPECT_EQ(json["com.norvane.NANDInfo.BandsMaxTempHisto2"], 0);

  // An old buffer has only the first figures, and nothing to compute others from.
  record(device, built(device, R"([["exportVersion", 131073]])"));
  const Outcome old = device.run("nand info");
  EXPECT_EQ(old.status, 0) << old;
  EXPECT_EQ(old.out.find("amplification"), std::string::npos) << old;
  EXPECT_EQ(device.json("nand info").size(), 17U);

  record(device, built(device, R"([["exportVersion", 131075], ["numVirtualBlocks", 8]])"));
  EXPECT_EQ(device.json("nand info")["derived"]["free_virtual_blocks_share"], 0);
}

TEST_F(NandInfo, AFailureIsNoZero) {
  device.check("nand info",
               fails("Could not get matching Kernkit service for exporting classes\ntavrelctl: no "
                     "NAND information: Unable to parse buffer: no storage driver is recorded in " +
                     device.path("/var/lib/tavrel/registry") +
                     "; see 'tavrelctl disks' for this machine's drives"));
  record(device, built(device, R"([["hostWrites", 1]])"));
  device.check("nand info",
               fails("no NAND information: Unsupported export version: see what the driver answers "
                     "with 'tavrelctl registry show ID'"));
  EXPECT_EQ(device.json("nand info", "", 1),
            R"({"format_version": 1, "com.norvane.NANDInfo.Error": "1",
                "com.norvane.NANDInfo.ErrorMessage": "Unsupported export version"})"_json);
}

using NandParse = DeviceTest;

TEST_F(NandParse, ReadsBackWhatWasBuilt) {
  const std::string first = built(device, R"([["exportVersion", 4295098371], ["hostWrites", 1],
      ["hostWrites", 18446744073709551615], ["readCountHisto", [1, 2, 3]], ["ECBins", [9]],
      [21, [5, 5, 5]], ["TempSensorMax", []]])");
  EXPECT_EQ(first, words({53,  1, 131075, 1, 4, 1, 1, 0, 4,   1, 0xFFFFFFFF, 0xFFFFFFFF,
                          265, 3, 1,      0, 2, 0, 3, 0, 54,  1, 9,          0,
                          21,  3, 5,      0, 5, 0, 5, 0, 184, 0}));
  EXPECT_EQ(device.run("nand parse -", first),
            (Outcome{0, R"(STATISTIC                       VALUE
exportVersion              4295098371
hostWrites                          1
hostWrites       18446744073709551615
readCountHisto0                     1
readCountHisto1                     2
readCountHisto2                     3
ECBins                              9
)",
                     "tavrelctl: standard input: 2 records not listed in full (unknown "
                     "statistics, no values or too many): --json prints them in full\n"}));
  const Outcome parsed = device.run("nand parse - --json", first + "\xab");
  EXPECT_EQ(device.run("nand build - -o -", parsed.out), prints(first + "\xab"));
  EXPECT_EQ(nlohmann::json::parse(parsed.out), R"({"format_version": 1, "result": 1, "fields": {
      "exportVersion": 131075, "driverVersion": 4294967295, "numVirtualBlocks": 0,
      "blocksPerVirtualBlock": 0, "pagesPerVirtualBlock": 0, "bytesPerPage": 0, "hostReads": 0,
      "hostWrites": 18446744073709551615, "numFreeVirtualBlocks": 0, "wearLevMoves": 0,
      "nandReads": 0, "nandWrites": 0, "bandErases": 0, "IND_pool_free": 0, "IND_pool_count": 0,
      "utilFormatTime": 0, "numSleepOps": 0, "maxHighEnduranceBlockErases": 0,
      "readCountHisto": [1, 2, 3, 0, 0]}, "entries": [["exportVersion", 4295098371],
      ["hostWrites", 1], ["hostWrites", 18446744073709551615], ["readCountHisto0", 1],
      ["readCountHisto1", 2], ["readCountHisto2", 3], ["ECBins", 9], {"key": 21, "values": [5, 5, 5]},
      {"key": "TempSensorMax", "values": []}, {"hex": "ab"}]})"_json);
}

TEST_F(NandParse, SaysWhereABufferIsBroken) {
  const auto parse = [&](const std::string& entries, std::size_t recorded,
                         const std::string& error) {
    const std::string buffer = built(device, entries);
    EXPECT_EQ(device.run("nand parse -", buffer).error,
              "tavrelctl: standard input is not a complete statistics buffer: " + error +
                  ": fetch or build it again\n");
    const auto json = device.json("nand parse -", buffer, 1);
    EXPECT_EQ(json["result"], 0);
    EXPECT_EQ(json["entries"].size(), recorded);
  };
  const std::string good = R"([["hostWrites", 1], )";
  const std::string second = "the record at byte 16: ";
  parse("[]", 0, "it has 0 bytes, and a record has at least 8");
  parse(R"([{"hex": "01 02 03 04 05 06 07"}])", 0, "it has 7 bytes, and a record has at least 8");
  parse(good + R"({"key": 805306369}])", 1,
        second + "0x30000001 is above 0x30000000, the largest number of a statistic");
  parse(good + R"({"key": "ECBins", "count": 4294967295, "values": [1]}, {"hex": "00Ff"}])", 1,
        second + "statistic 54 has 4294967295 values, but there is room for 1");
  EXPECT_EQ(device.run("nand parse -", built(device, good + "[805306368, []]]")).error,
            "tavrelctl: standard input: 1 record not listed in full (unknown statistics, no "
            "values or too many): --json prints them in full\n");
  EXPECT_EQ(
      device.run("nand parse -", words({4, 1, 1, 0, 0})),
      (Outcome{0, "STATISTIC   VALUE\nhostWrites      1\n",
               "tavrelctl: standard input: the last 4 bytes are less than a unit of 8 and were "
               "skipped\n"}));
}

TEST_F(NandParse, DifferencesPairEqualNamesInTheirOrder) {
  device.write("/a", built(device, R"([["hostWrites", 1], ["boots", 5], ["hostWrites", 2],
      ["hostReads", 9], ["ECBins", [1, 2]], ["shutdowns", 0]])"));
  device.write("/b", built(device, R"([["hostReads", 4], ["hostWrites", 1], ["numSleepOps", 3],
      ["boots", 5], ["hostWrites", 7], ["ECBins", [1]], ["shutdowns", 18446744073709551615]])"));
  const CommandLine command = "nand parse " + device.path("/a") + " --diff " + device.path("/b");
  device.check(command, prints(R"(STATISTIC    BEFORE                 AFTER                 CHANGE
hostWrites        2                     7                     +5
hostReads         9                     4                     -5
ECBins0           1                     -
ECBins1           2                     -
shutdowns         0  18446744073709551615  +18446744073709551615
numSleepOps       -                     3
ECBins            -                     1
)"));
  const auto json = device.json(command);
  EXPECT_EQ(json["results"].dump(), "[1,1]");
  EXPECT_EQ(json["differences"][4].dump(),
            R"({"after":18446744073709551615,"before":0,"change":null,"statistic":"shutdowns"})");
  EXPECT_EQ(device.run("nand parse " + device.path("/a") + " --diff " + device.path("/a")),
            prints("no differences among named statistics\n"));
}

TEST(NandBuild, NamesThePlaceOfAMistake) {
  const TemporaryDevice device;
  std::string errors;
  for (const std::string entries :
       {R"([], "entrys": [])", R"([["boots", 1], ["bots", 1]])", R"([["boots"]])",
        R"([["boots", -1]])", R"([["boots", [1.5]]])", R"([[4294967296, 1]])",
        R"([["ECBins0", 1], ["boots", 1], ["ECBins1", 1]])", R"([{"key": 1, "sum": 2}])",
        R"([{"key": 1, "count": 4294967296}])", R"([{"key": 1, "values": 2}])",
        R"([{"hex": "012"}])", "[7]"}) {
    const Outcome outcome =
        device.run("nand build - -o " + device.path("/out"), R"({"entries": )" + entries + "}");
    EXPECT_EQ(outcome.status, 1) << outcome;
    errors += outcome.error.substr(27);
  }
  EXPECT_EQ(errors, R"("entrys" is not a member of this form: records belong in "entries"
entries[1]: no statistic is named "bots": give the number of one that is not known
entries[0]: 1 members: give a statistic and its value, or a list of its values
entries[0]: -1 is not a value: give an integer from 0 to 2^64 - 1
entries[0]: 1.5 is not a value: give an integer from 0 to 2^64 - 1
entries[0]: 4294967296 is not a statistic: give its name or its 32-bit number
entries[2]: ECBins1 does not follow ECBins0: give the elements from 0 on, one after the other, or a list
entries[0]: "sum" is not a member of a record: it has key, count and values
entries[0]: "count": 4294967296 is not an integer from 0 to 2^32 - 1
entries[0]: "values": 2 is not a list
entries[0]: "hex": "012": give pairs of hexadecimal digits
entries[0]: 7 is not an entry: give [statistic, value], {"key": …, "values": […]} or {"hex": …}
)");
  EXPECT_EQ(device.run("nand build - -o " + device.path("/out"), "[]"),
            fails("standard input: no list of entries: give an object with \"entries\": […]"));
  EXPECT_FALSE(std::filesystem::exists(device.path("/out")));
}

TEST(NandCounters, ParserIsThatOfChipAndMaker) {
  const TemporaryDevice device;
  std::string block;
  for (std::uint32_t i = 0; i < 1024; ++i)
    block += words({i});
  const auto counters = [&](const char* chip, const char* maker, const std::string& error) {
    const CommandLine command{"nand", "counters",          "-",  "--chip-id",
                              chip,   "--manufacturer-id", maker};
    EXPECT_EQ(device.run(command, block).error, error);
    const auto json = device.json(command, block);
    EXPECT_EQ(json["counters"].size(), 11U);
    EXPECT_EQ(json["counters"]["retentionIndication"].size(), 12U);
    return json["parser"].get<std::string>() + ' ' + json["counters"]["readStage"][0].dump();
  };
  EXPECT_EQ(counters("K3V", "4582603A5700", ""), "parseCountersAlgoGeneric 0");
  EXPECT_EQ(counters("K", "AGAD\x01",
                     "tavrelctl: unrecognized hex character: g\n"
                     "tavrelctl: unrecognized hex character: \\x01\n"),
            "parseCounters1y 256");
  const Outcome text = device.run("nand counters - --chip-id K4V --manufacturer-id 0", block);
  expectIn(text.out,
           {"Parser  parseCountersAlgoGenericK4\n\nreadStage (33)\n   0:    0    1    2    3",
            "\n  32:  110\n", "\nalgoNANDAccessesBin (8): all 0\n",
            "\nreadStage10NumOfErrorsBin (10)\n  0  55  #################################",
            "\nretentionIndication (12)\n  0:  0  0  75  76"});
  EXPECT_EQ(device.run("nand counters - --chip-id K4V --manufacturer-id 0", block + "x"),
            fails("standard input is not a counter block: it has 4097 bytes, and a block has 4096: "
                  "cut one out with dd bs=4096 count=1 skip=CHANNEL"));
}

// A version 6 descriptor with one field of kind 0.
std::string descriptor(std::uint32_t count, const std::string& fieldFormat) {
  std::string bytes =
      words({0, 6, 4, count, 0, 0, 36, 0}) + "%s\n\0"s + words({1, 0, 0, 0, 0}) + fieldFormat;
  bytes.resize(36 + 8 + 28);
  return bytes;
}

TEST(NandSnapshot, PrintsTheWholeTextOrNothing) {
  const TemporaryDevice device;
  std::string records(std::size_t{3000} * 252, '\0');
  for (std::size_t at = 0; at < records.size(); at += 252)
    records[at] = 1;
  const Outcome fixed = device.run("nand snapshot -", records);
  EXPECT_TRUE(fixed.out.starts_with("Key: \nT   - Timestamp\n"));
  EXPECT_EQ(std::count(fixed.out.begin(), fixed.out.end(), '='), 26 * 3000);
  EXPECT_TRUE(fixed.out.ends_with("\n\n"));

  // A text that is far longer than its records.
  device.write("/wide", descriptor(3, "%4096u|"));
  const CommandLine command = "nand snapshot - --descriptor " + device.path("/wide");
  const std::string wide(4095, ' ');
  device.check(command, prints("%s\n" + wide + "7|\n" + wide + "8|\n"), words({7, 0, 8}));
  device.write("/acting", descriptor(2, "\t\x1b[2J%u\xc2\x9b"));
  device.check("nand snapshot - --descriptor " + device.path("/acting"),
               prints("%s\n\t\\x1b[2J7\\xc2\\x9b\n"), words({7, 0}));

  // Without a stride, all records are the same one.
  for (const auto& [count, text] : {std::pair(3U, std::string("8\n8\n8\n")), {~0U, ""}}) {
    std::string descriptorOfOne = descriptor(count, "%u");
    descriptorOfOne[8] = 0;
    device.write("/one", descriptorOfOne);
    const CommandLine repeated = "nand snapshot - --descriptor " + device.path("/one");
    device.check(repeated, prints("%s\n"), words({0}));
    if (!text.empty()) device.check(repeated, prints("%s\n" + text), words({8}));
  }
  EXPECT_EQ(device.run("nand snapshot - --descriptor " + device.path("/one"), words({8})),
            fails("cannot render " + device.path("/one") +
                  ": the text is longer than 335544320 bytes: render fewer records"));

  EXPECT_EQ(device.run("nand snapshot -", std::string(100, 'x')),
            fails("standard input has no complete record: it has 100 bytes, and a record has 252: "
                  "give a timeline of the controller, and --descriptor if one came with it"));
  EXPECT_EQ(device.run(command, words({7, 0})),
            fails("cannot render " + device.path("/wide") +
                  ": field 0 of the last of 3 records ends at byte 12 of a buffer of 8"));
}

TEST(NandFreezer, TakesAFileOrTheDevicesSnapshot) {
  const TemporaryDevice device;
  const std::string found =
      words({0x13, 4, 1, 0, 0, 0x909, 12, 0, 0}) + "VM_swapout\0\0"s +
      words({0x901, 32, 0, 0, 0, 0, 0, 0, 0, 0, 0xFFFFFFFF, 0xFFFFFFFF, 0x14, 0, 1, 0});
  const Outcome shown = prints("Traffic\n  VMFreezer.NumPhysicalWrites  18446744073709551615\n");
  EXPECT_EQ(device.run("nand freezer -", found), shown);

  const std::string path = "/var/lib/tavrel/registry/stack-snapshot.bin";
  const std::string reason = "Unable parse snapshot for VMFreezer NAND writes";
  const std::string key = "com.norvane.NANDInfo.VMFreezer.";
  EXPECT_EQ(
      device.json("nand freezer", "", 1),
      nlohmann::json(
          {{"format_version", 1}, {key + "Error", "1"}, {key + "ErrorMessage", reason + "."}}));
  device.check("nand freezer", fails("no freezer writes: " + reason +
                                     ": put a stack snapshot whose first container holds the "
                                     "thread VM_swapout, with complete IO statistics if it has "
                                     "any, at " +
                                     device.path(path)));
  device.write(path, found);
  device.check("nand freezer", shown);
  EXPECT_EQ(device.json("nand freezer")[key + "NumPhysicalWrites"].dump(), "18446744073709551615");
  device.check("nand freezer -",
               fails("standard input: " + reason +
                     ": give a stack snapshot whose first container "
                     "holds the thread VM_swapout, with complete IO statistics if it has any"),
               found.substr(0, 40));
}

}  // namespace
}  // namespace tavrel
