// The example recording, inspected with the registry and report commands.
#include "device.h"
#include "platform/plist/binary.h"
#include "platform/plist/coding.h"
#include "tools/report/playback.h"

namespace tavrel {
namespace {

using plist::Array;
using plist::Dictionary;

constexpr const char* kRecording = "/var/lib/tavrel/registry/report.plist";

std::string example() {
  return contentOf(TAVREL_EXAMPLES "/registry/report.plist");
}

struct ReportTest : DeviceTest {
  ReportTest() { device.write(kRecording, example()); }

  Dictionary recording() const { return plist::read(asBytes(example()))->dictionary(); }
  void play(const Dictionary& recording) {
    device.write(kRecording, *plist::writeBinary(recording));
  }
};

TEST_F(ReportTest, ListsChannelsAsTreeAndTable) {
  device.check("report list --category 6",
               prints(R"(CHANNEL                  FORMAT  UNIT      CATEGORIES  ELEMENTS  ID
flash0 <id 0x100000201>
  NAND
    Errors
      Corrected per die  array   events    0x0004             2  0x456363446965
  Power
    Power state          state   24Mticks  0x0002             3  0x5077725374
  Temperature
    Controller           simple  mC        0x0002             1  0x54656d7043746c
radio0 <id 0x100000202>
  Resets
    Since start          simple            0x0004             1  0x1
)"));
  device.check(
      "report list --flat --category 4 --group NAND",
      prints("DRIVER                   GROUP  SUBGROUP  CHANNEL            FORMAT  UNIT    "
             "CATEGORIES  ELEMENTS  ID\n"
             "flash0 <id 0x100000201>  NAND   Errors    Corrected per die  array   events  "
             "0x0004             2  0x456363446965\n"));
  const std::pair<CommandLine, std::string> kCases[] = {
      {"--subgroup Receive", "DATARe CTRLRe "},
      {"--group NAND --subgroup Receive", ""},
      {"--category 0x6 --driver flash0", "Corrected per die Power state Controller "},
      {"--unit 4KiB", "Host reads Host writes "},
      {"--unit 0x0100007980000018", "Power state "},
      {"--driver 4294967810 --format 1 --category 4", "Since start "},
      {{"--driver", "radio0 <id 0x100000202>", "--format", "unknown"}, ""},
      {"--driver radio", ""},
      {"--format state", "Power state "}};
  for (const auto& [selection, names] : kCases) {
    CommandLine command{"report", "list"};
    command.insert(command.end(), selection.begin(), selection.end());
    std::string found;
    const auto json = device.json(command);
    for (const auto& channel : json["channels"])
      found += channel["name"].get<std::string>() + ' ';
    EXPECT_EQ(found, names) << selection[1];
  }
}

TEST_F(ReportTest, SamplesAndSubtracts) {
  device.check("report sample --driver flash0", prints(R"(flash0 <id 0x100000201>
  NAND
    Traffic
      Host reads   309.8 GiB
      Host writes  153.0 GiB
    Latency
      Read latency (us)
        (0, 2]          0
        (2, 4]          0
        (4, 8]          0
        (8, 16]        10  #                               mean 13.0, 9 to 15
        (16, 32]      700  ##############################  mean 24.3, 17 to 32
        (32, 1000]     40  #                               mean 225.0, 60 to 900
        (1000, 2000]    0
    Errors
      Corrected per die (events)
        [0]  3  0  7  1
        [4]  0  2  -  -
  Power
    Power state (24Mticks)
      ACTV  12.0 %  ###                              120 s  entered 900
      IDLE  70.0 %  #####################            700 s  entered 950  current
      SLP   18.0 %  #####                            180 s   entered 50
  Temperature
    Controller  41.3 °C
)"));
  device.check("report sample --group Power --delta --interval 0", prints(R"(flash0 <id 0x100000201>
  Power
    Power state (24Mticks)
      ACTV  20.0 %  ######                            200 ms  entered 4  current
      IDLE  80.0 %  #########################         800 ms  entered 3
      SLP    0.0 %                                       0 s  entered 0
)"));
  const std::string path = "flash0 <id 0x100000201>\n  Temperature\n    Controller  ";
  device.check(
      "report sample --group Temperature --delta --count 2 --interval 0",
      prints("Change 1 of 2\n" + path + "0.25 °C\n\nChange 2 of 2\n" + path + "-0.125 °C\n"));
  // Output that is printed piece by piece looks as if it had been printed at once.
  for (const auto& [command, indent] : {std::pair("list", 2),
                                        {"list --group none", 2},
                                        {"sample", 2},
                                        {"sample --delta --interval 0", 2},
                                        {"sample --count 2 --interval 0", -1}}) {
    const std::string text = device.run(format("report %s --json", std::string(command))).out;
    const std::string first = indent < 0 ? text.substr(0, text.find('\n') + 1) : text;
    EXPECT_EQ(first, Json::parse(first).dump(indent) + '\n');
  }
  const auto json = device.json("report sample --group NAND");
  EXPECT_EQ(json["missing"], 0);
  const auto& channels = json["channels"];
  EXPECT_EQ(channels[0]["converted"], R"({"value": 332595200000.0, "unit": "bytes"})"_json);
  EXPECT_EQ(channels[0]["timestamp"], 24000000000);
  const auto change = device.json("report sample --group Temperature --delta --interval 0");
  EXPECT_EQ(change["channels"][0].at("timestamp"), nullptr);
  EXPECT_EQ(channels[2]["buckets"][0]["sum"], nullptr);
  EXPECT_EQ(channels[2]["buckets"][5]["sum"], 9000);
  EXPECT_EQ(channels[3]["values"].dump(), "[3,0,7,1,0,2,null,null]");
}

plist::Data element(std::initializer_list<std::uint64_t> words) {
  std::vector<std::byte> bytes(64);
  std::size_t at = 0;
  for (const std::uint64_t word : words)
    storeLittle64(bytes, 8 * at++, word);
  return plist::Data(bytes);
}

TEST_F(ReportTest, ShowsValuesAtTheEndsOfTheirRange) {
  // A state's counters run backwards, past the 64-bit limit, in units of 2^-100 s.
  Array groups = Array::create();
  for (const std::uint64_t count : {std::uint64_t{5}, ~std::uint64_t{0}})
    groups.append(element({7, 8, 0x100000002, 0, 1, count, count}));
  const Dictionary recorded = parseJsonValue(R"({
      "Services": [{"Class": "A\u001b", "EntryID": 7, "Properties": {
        "IOReportLegendPublic": true, "IOReportLegend": [{"IOReportChannels": [[8, 4294967298]],
          "IOReportChannelInfo": {"IOReportChannelUnit": 72087280851877888}}]}}],
      "Hub": {"Channels": [{"DriverID": 7, "ChannelID": 8}]}})")
                                  ->dictionary();
  recorded.dictionary("Hub").array("Channels").at(0).dictionary().set("Elements", groups);
  play(recorded);
  device.check("report sample --count 2 --interval 0",
               prints("Sample 1 of 2\nA\\x1b <id 0x7>\n  0x8 (s)\n    0x1  100.0 %  " +
                      std::string(46, '#') +
                      "  5  entered 5\n\n"
                      "Sample 2 of 2\nA\\x1b <id 0x7>\n  0x8 (s)\n    0x1  100.0 %  ########  "
                      "18446744073709551615  entered 18446744073709551615\n"));
  const auto json = device.json("report sample --delta --interval 0");
  EXPECT_EQ(json["channels"][0]["states"], R"([{"id": 1, "name": null, "in_transitions": -6,
      "residency": -6, "converted": null, "duty_cycle": null, "current": false}])"_json);
}

TEST_F(ReportTest, LeavesOutChannelsThatCannotBeSubtracted) {
  const Dictionary recorded = recording();
  recorded.dictionary("Hub")
      .array("Channels")
      .at(0)
      .dictionary()
      .set("Elements",
           Array{element({0x100000201, 0x486F73745264, 0x100000001, 0, std::uint64_t{1} << 63})});
  play(recorded);
  device.check("report sample --group NAND --category 1 --delta --interval 0 --unit 4KiB",
               {0, "flash0 <id 0x100000201>\n  NAND\n    Traffic\n      Host writes  1.0 MiB\n",
                "tavrelctl: 1 channel left out, as the change is unknown; the first is "
                "flash0 <id 0x100000201> NAND Traffic Host reads: a value is not set, or the "
                "number of values changed\n"});

  // A channel without an earlier value has no change, and changes that of no other.
  Array updates = Array::create();
  updates.append(plist::Data(ByteSpan()));
  for (const std::uint64_t count : {7U, 9U})
    updates.append(element({0x100000201, 0x486F73745264, 0x100000001, 0, count}));
  recorded.dictionary("Hub").array("Channels").at(0).dictionary().set("Elements", updates);
  play(recorded);
  const std::string writes =
      "flash0 <id 0x100000201>\n  NAND\n    Traffic\n      Host writes  1.0 MiB\n";
  const Outcome changes =
      device.run("report sample --group NAND --delta --interval 0 --unit 4KiB --count 2");
  EXPECT_EQ(changes.error,
            "tavrelctl: 1 channel without values: the recording has none at this point, or the hub "
            "does not "
            "know them\ntavrelctl: all channels have values again\ntavrelctl: 1 channel left out, "
            "as the change is "
            "unknown; the first is flash0 <id 0x100000201> NAND Traffic Host reads: the previous "
            "sample has no value of it\n");
  EXPECT_EQ(changes.out, "Change 1 of 2\n" + writes +
                             "\nChange 2 of 2\nflash0 <id 0x100000201>\n  NAND\n    Traffic\n"
                             "      Host reads   8.0 KiB\n      Host writes  0 bytes\n");
}

TEST_F(ReportTest, APlaybackFillsADocumentButNotMore) {
  constexpr std::size_t kBytes = 100'000;
  Playback playback(kBytes);
  const auto channel = [](std::int64_t id) {
    return Dictionary{{"DriverID", 7},
                      {"LegendChannel", Array{id, 0x100000001}},
                      {"RawElements", element({1, 2, 3, 4, 5})}};
  };
  // A channel that comes later was absent before.
  while (playback.samples() < 200)
    ASSERT_TRUE(playback.add({channel(1)}));
  while (playback.add({channel(1), channel(2)})) {
  }
  const std::size_t samples = playback.samples();
  const Array channels = playback.channels();
  for (std::size_t i = 0; i < 2; ++i)
    EXPECT_EQ(channels.at(i).dictionary().array("Elements").size(), samples);
  EXPECT_EQ(channels.at(1).dictionary().array("Elements").at(199).data().size(), 0);
  EXPECT_EQ(channels.at(1).dictionary().array("Elements").at(200).data().size(), 64);
  const std::string document =
      *plist::writeXml(Dictionary{{"Hub", Dictionary{{"Channels", channels}}}});
  EXPECT_LE(document.size(), kBytes);
  EXPECT_GT(document.size(), kBytes / 2);
}

TEST_F(ReportTest, DescribesInTheSystemsWords) {
  device.check("report describe --group Power",
               prints("flash0 <id 0x100000201> Power state < 0x5077725374 (24Mticks) | G/g "
                      "Power/(none) | cat 0x02 | format 0x02 | elts 3 >\n"
                      "           Power state[    ACTV] = { # 900      1.200e+02 s / 12.0% }\n"
                      "           Power state[    IDLE] = { # 950      7.000e+02 s / 70.0% }\n"
                      "           Power state[     SLP] = { # 50       1.800e+02 s / 18.0% }\n"));
  device.check(
      "report describe --channels --group Resets",
      prints("radio0 <id 0x100000202> Since start < 0x1 ((null)) | G/g Resets/(none) | cat "
             "0x04 | format 0x01 | elts 1 >\n"));
}

TEST_F(ReportTest, SaysWhatIsMissing) {
  const Dictionary noHub = recording();
  Dictionary(noHub).remove("Hub");
  const Dictionary refusing = recording();
  refusing.dictionary("Hub").set("MethodErrors", Dictionary{{"2", 0xE00002C5}});
  const Dictionary forgetful = recording();
  forgetful.dictionary("Hub").array("Channels").remove(0);
  const Dictionary badLegend = recording();
  badLegend.array("Services").at(2).dictionary().dictionary("Properties").set("IOReportLegend", 1);
  const std::string subscribe = "cannot subscribe to the channels",
                    what = ": see 'tavrelctl report list --help'";
  const std::tuple<Dictionary, const char*, int, std::string> kCases[] = {
      {noHub, "sample", 1,
       subscribe + " (0xe00002f0): there is no hub: a recording in /var/lib/tavrel/registry must "
                   "have a \"Hub\""},
      {refusing, "describe", 1,
       subscribe + ": kIOReportUserClientConfigureInterests failed (0xe00002c5): 'tavrelctl "
                   "registry list' shows the drivers and the hub"},
      {forgetful, "sample", 0,
       "1 channel without values: the recording has none at this point, or the hub does not know "
       "them"},
      {badLegend, "list", 0,
       "radio0 <id 0x100000202>: bad legend\ntavrelctl: these drivers are left out: 'tavrelctl "
       "registry show ID' shows what they publish"},
      {noHub, "sample --group None", 1, "no channel matches: 'tavrelctl report list' shows all"},
      {noHub, "list --live --recorded", 2, "--live and --recorded exclude each other" + what},
      {noHub, "list --category 0x10000", 2,
       "--category: not a number of at most 16 bits: 0x10000" + what},
      {noHub, "list --format sample", 2,
       "--format: not a format of report channels: sample" + what}};
  for (const auto& [played, command, status, error] : kCases) {
    play(played);
    const Outcome outcome = device.run(std::string("report ") + command);
    EXPECT_EQ(outcome, (Outcome{status, outcome.out, "tavrelctl: " + error + '\n'}));
    EXPECT_EQ(outcome.out.empty(), status != 0) << outcome;
  }
  std::filesystem::remove(device.path(kRecording));
  device.check("report list", prints("no channels\n"));
  device.check("registry list", prints("no drivers: recordings of them belong in " +
                                       device.path("/var/lib/tavrel/registry") + "\n"));
}

TEST_F(ReportTest, RegistryListsShowsAndRecords) {
  device.check(
      "registry list",
      prints("         ID  CLASS                   NAME         PUBLIC  CHANNELS  METHODS\n"
             "0x100000000  ExampleRoot             root         no             0        0\n"
             "0x100000201  ExampleFlashController  flash0       yes            6        0\n"
             "0x100000202  ExampleRadio            radio0       yes            5        0\n"
             "0x100000203  ExampleSensor           sensor0      no             1        0\n"
             "0x100000004  IOReportHub             IOReportHub  no             0        0\n"));
  device.check(
      "registry show 0x100000000",
      prints("Class = \"ExampleRoot\"\nEntryID = 4294967296\nName = \"root\"\nParents = {}\n"
             "Properties:\n  model = \"Example board\"\n"));
  device.check("registry show 9",
               fails("no service has entry id 0x9: 'tavrelctl registry list' shows what there is"));
  device.check("registry show flash0",
               fails("not an entry id: flash0: give a 64-bit number, decimal or with 0x", 2));

  // A channel's memory must not take the number of the closed stream.
  const std::string closed =
      TAVREL_BUILD "/bin/tavrelctl --root " + device.path("") + " report sample 2>&1 >&-";
  std::unique_ptr<FILE, int (*)(FILE*)> program(popen(closed.c_str(), "r"), pclose);
  char line[80] = {};
  EXPECT_NE(std::fgets(line, sizeof line, program.get()), nullptr);
  EXPECT_STREQ(line, "tavrelctl: cannot write standard output: free space or check the pipe\n");

  device.check("registry record -", prints(example()));
  EXPECT_EQ(device.run("registry record " + device.path(kRecording)).status, 0);
  EXPECT_EQ(device.files()[0].second, example());
}

}  // namespace
}  // namespace tavrel
