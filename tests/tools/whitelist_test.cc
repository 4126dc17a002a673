// tavrelctl whitelist
#include <sys/stat.h>

#include "device.h"

namespace tavrel {
namespace {

// Groups in our own files are sorted by name, so the later name wins.
constexpr std::string_view kGood = R"({
  "Apps": {"ScalarKeys": {"app.starts": {"sig_fig": 2, "bucket_interval": 10}, "app.raw": {}},
           "DistributionKeys": {"app.load": {"intervals": [10, 20.5]}}},
  "InternalTesting": {"ScalarKeys": {"app.secret": {}, "app.raw": {"sig_fig": 1}}},
  "Radio": {"ScalarKeyPrefixes": {"radio.": {"sig_fig": 1}},
            "DistributionKeyPrefixes": {"radio.": {}}}})";

using WhitelistCheck = DeviceTest;

TEST_F(WhitelistCheck, PointsAtEverythingThatTheDaemonWouldNotUse) {
  device.write(kWhitelistFile, xmlOf(R"({
    "A": {"Scalars": {}, "DistributionKeys": [], "ScalarKeys": {"both": {}, "number": 1,
        "options": {"sigfig": 2, "intervals": [1], "sig_fig": -1, "bucket_interval": 0},
        "types": {"sig_fig": "2", "bucket_interval": 2.5}}},
    "B": {"DistributionKeys": {"d": {"sig_fig": 1, "intervals": 3},
                               "e": {"intervals": [1, 1, "x", {"$real": "nan"}, 0, 2.5,
                                                   {"$real": "inf"}, 5]}},
      "ScalarKeyPrefixes": {"p.": {}, "p.q.": {"sig_fig": 1}, "p.q.r": {"sig_fig": 1},
                            "p.s": {"sig_fig": 1}, "": {}},
      "DistributionKeyPrefixes": {"e.": {}},
      "ScalarKeys": {"both": {"sig_fig": 1}, "mask": {"bucket_interval": 1}}},
    "C": {"ScalarKeys": {"both": {"sig_fig": 1}}, "ScalarKeyPrefixes": {"p.": {"sig_fig": 1}}},
    "D": true,
    "InternalTesting": {"ScalarKeys": {"both": {}, "late": {}},
                        "ScalarKeyPrefixes": {"": {}, "p.q.r.s": {}}},
    "Z": {"ScalarKeys": {"late": {"sig_fig": 1}}}})"));
  const std::string expected =
      R"(A/DistributionKeys: is an array: a table is a dictionary from keys to options: ignored
A/ScalarKeys/both: is let out unchanged: coarsen it, or say with a bucket_interval of 1 that this is intended
A/ScalarKeys/number: is an integer: options are a dictionary, an empty one to report the value unchanged: ignored
A/ScalarKeys/options/bucket_interval: is 0: a bucket has a width: the value is not bucketed
A/ScalarKeys/options/intervals: does not affect scalars: ignored
A/ScalarKeys/options/sig_fig: is -1: expected an integer from 0 to 4294967295: used as 4294967295
A/ScalarKeys/options/sigfig: is not an option: ignored; the options are sig_fig, bucket_interval, intervals
A/ScalarKeys/types/bucket_interval: is 2.5: expected an integer from 0 to 4294967295: used as 2
A/ScalarKeys/types/sig_fig: is a string: expected an integer: ignored
A/Scalars: is not a table of a group: ignored; the tables are ScalarKeys, ScalarKeyPrefixes, DistributionKeys, DistributionKeyPrefixes
B/DistributionKeyPrefixes/e.: lets out the exact minimum and maximum of every distribution with this prefix: list keys one by one
B/DistributionKeys/d/intervals: is an integer: expected an array of numbers: no histogram is made
B/DistributionKeys/d/sig_fig: does not affect distributions: ignored
B/DistributionKeys/e/intervals/1: is 1, not above the boundaries before it: its bucket stays empty, and tavrel-fleet may refuse the logs
B/DistributionKeys/e/intervals/2: is a string: expected a number: its bucket stays empty, and tavrel-fleet may refuse the logs
B/DistributionKeys/e/intervals/3: is not a number: its bucket stays empty, and tavrel-fleet may refuse the logs
B/DistributionKeys/e/intervals/4: is 0, not above the boundaries before it: its bucket stays empty, and tavrel-fleet may refuse the logs
B/DistributionKeys/e/intervals/6: is infinite: leave it out, the outer buckets are open already, and tavrel-fleet may refuse the logs
B/DistributionKeys/e/intervals/7: is 5, not above the boundaries before it: its bucket stays empty, and tavrel-fleet may refuse the logs
B/ScalarKeyPrefixes/: is the empty prefix: every key begins with it
B/ScalarKeyPrefixes/: is let out unchanged: coarsen it, or say with a bucket_interval of 1 that this is intended
B/ScalarKeyPrefixes/p.: is let out unchanged: coarsen it, or say with a bucket_interval of 1 that this is intended
D: is a boolean: a group is a dictionary of tables: ignored
A/ScalarKeys/both: is also listed by group C, which comes later and wins
B/ScalarKeys/both: is also listed by group C, which comes later and wins
InternalTesting/ScalarKeys/late: is also listed by group Z, which comes later and wins
B/ScalarKeyPrefixes/p.: is also listed by group C, which comes later and wins
B/ScalarKeyPrefixes/: is hidden by the longer prefix B/ScalarKeyPrefixes/p. for keys that begin with that
C/ScalarKeyPrefixes/p.: is hidden by the longer prefix B/ScalarKeyPrefixes/p.q. for keys that begin with that
B/ScalarKeyPrefixes/p.q.: is hidden by the longer prefix B/ScalarKeyPrefixes/p.q.r for keys that begin with that
C/ScalarKeyPrefixes/p.: is hidden by the longer prefix B/ScalarKeyPrefixes/p.s for keys that begin with that
)";
  device.check("whitelist check", (Outcome{1, expected, ""}));
}

TEST_F(WhitelistCheck, SaysWhatKeepsTheFileFromBeingUsed) {
  const std::string path = device.path(kWhitelistFile);
  device.check("whitelist check", fails("cannot read " + path +
                                            ": No such file or directory: write a whitelist, as "
                                            "tavrel(8) describes it",
                                        2));
  device.write(kWhitelistFile, "<plist><dict>");
  device.check("whitelist check",
               fails(path + ": XML property list, line 1, column 14: no element found", 2));
  std::filesystem::remove(path);
  ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
  device.check("whitelist check",
               fails("cannot use " + path + ": it is not a regular file; move it away", 2));
  EXPECT_EQ(device.run("whitelist check -", xmlOf("[]")),
            (Outcome{1,
                     "standard input: is an array: a whitelist is a dictionary of groups: nothing "
                     "is reported\n",
                     ""}));
  EXPECT_EQ(device.run("whitelist check -", xmlOf("{}")),
            prints("standard input: no findings (digest 06e68461460e3d5f71e4211e51eb944c)\n"));
}

TEST_F(WhitelistCheck, ListsAThousandFindingsAndCountsTheRest) {
  std::string json = "{\"" + std::string(1000, 'g') + "\": {\"ScalarKeys\": {";
  for (int i = 0; i < 1234; ++i)
    json += "\"k" + std::to_string(i) + "\": 1,";
  json.back() = '}';
  const Outcome outcome = device.run("whitelist check -", xmlOf(json + "}}"));
  EXPECT_EQ(outcome.status, 1);
  EXPECT_EQ(std::count(outcome.out.begin(), outcome.out.end(), '\n'), 1001);
  EXPECT_TRUE(outcome.out.ends_with("standard input: has 234 more findings\n"));
}

TEST_F(WhitelistCheck, LooksAtTheDistributionsOfTheLastWholeDay) {
  device.write(kWhitelistFile, xmlOf(R"({
    "G": {"DistributionKeys": {"few": {}, "spoilt": {}, "fine": {"intervals":
              [1, 2, 3, 4, 5, 6, 7, 8, 9]}, "coarse": {"intervals": [1, 2]}}},
    "InternalTesting": {"DistributionKeyPrefixes": {"u": {}}, "ScalarKeys": {"s": {}}}})"));
  EXPECT_EQ(device.run("whitelist check").status, 0);
  device.run("stat import", "value\ttoday\tfew\t1\t1\n");
  EXPECT_EQ(device.run("whitelist check").status, 0) << "today is not over";
  device.run("stat import", "value\t19999\tfew\t1\t1\nvalue\t19999\tspoilt\t1\tnan\n");
  device.check(
      "whitelist check",
      (Outcome{
          1,
          R"(G/DistributionKeys/few: few on 2024-10-03: minimum, maximum, mean and deviation are exact and reveal its only value
G/DistributionKeys/spoilt: spoilt on 2024-10-03: mean and deviation are nan, as 1 of 1 value is not a number: fix the program that records it
)",
          ""}));
  std::string lines;
  for (int i = 1; i <= 15; ++i) {
    const std::string number = std::to_string(i);
    for (const std::string key : {"few", "spoilt", "fine", "coarse", "unlisted"}) {
      if (key == "few" && i > 4) continue;
      const std::string value = key == "spoilt" && i == 7 ? "nan" : number;
      lines += "value\t20000\t" + key + "\t" + number + "\t" + value + "\n";
    }
  }
  device.run("stat import", lines);
  device.check(
      "whitelist check",
      (Outcome{
          1,
          R"(G/DistributionKeys/few: few on 2024-10-04: minimum, maximum, mean and deviation are exact and reveal each of its 4 values
G/DistributionKeys/fine: fine on 2024-10-04: intervals are finer than what is recorded: 15 values fill 10 buckets
G/DistributionKeys/spoilt: spoilt on 2024-10-04: mean and deviation are nan, as 1 of 15 values is not a number: fix the program that records it
)",
          ""}));
  std::filesystem::remove(device.path(kStore + "-wal"));
  device.write(kStore, "no database");
  device.check("whitelist check",
               fails("statistics store " + device.path(kStore) +
                         ": file is not a database: the file has to be set aside; the next run "
                         "sets it aside; the whitelist is not checked against what is recorded",
                     2));
}

TEST(WhitelistDiff, SaysWhatChangesForWhatLeaves) {
  const TemporaryDevice device;
  const std::string before = device.path("/old.plist");
  const std::string after = device.path("/new.plist");
  device.write("/old.plist", xmlOf(R"({
    "A": {"ScalarKeys": {"finer": {"sig_fig": 1}, "coarser": {}, "mixed": {"bucket_interval": 10},
                         "same": {"bucket_interval": 1}, "gone": {}, "moved": {"sig_fig": 2},
                         "all": {"sig_fig": 19}, "nothing": {"sig_fig": 4294967295}},
          "ScalarKeyPrefixes": {"p.": {"sig_fig": 2}, "p.q.": {"sig_fig": 1}},
          "DistributionKeys": {"more": {"intervals": [1, 3]}, "less": {"intervals": ["x", 1, 2, 0]},
                               "empty": {"intervals": []}}},
    "InternalTesting": {"ScalarKeys": {"secret": {}}}})"));
  device.write("/new.plist", xmlOf(R"({
    "A": {"ScalarKeys": {"finer": {"sig_fig": 2}, "coarser": {"bucket_interval": 2},
                         "mixed": {"bucket_interval": 5, "sig_fig": 3},
                         "same": {"sig_fig": 25}, "all": {"sig_fig": "1"}, "nothing": {"sig_fig": 0}},
          "ScalarKeyPrefixes": {"p.": {"sig_fig": 2}, "": {"sig_fig": 2}},
          "DistributionKeys": {"more": {"intervals": [1, 2, 3]}, "less": {"intervals": [2]},
                               "empty": {}, "new": {"intervals": 1}}}})"));
  const std::string expected = R"(newly leaves (2)
  scalars *: sig_fig 2
  distribution new: summary only

gets finer (5)
  scalar finer: sig_fig 1 -> sig_fig 2
  scalar mixed: bucket_interval 10 -> bucket_interval 5, sig_fig 3
  scalar nothing: sig_fig 4294967295 -> sig_fig 0
  scalars p.q.*: sig_fig 1 -> sig_fig 2
  distribution more: summary and histogram, intervals [1, 3] -> summary and histogram, intervals [1, 2, 3]

gets coarser (3)
  scalar coarser: reported unchanged -> bucket_interval 2
  scalar gone: reported unchanged -> sig_fig 2
  distribution less: summary and histogram, intervals ["x", 1, 2, 0] -> summary and histogram, intervals [2]
)";
  device.check({"whitelist", "diff", before, after}, (Outcome{1, expected, ""}));
  device.check({"whitelist", "diff", before, before}, prints("no change in what leaves\n"));
  const auto json = device.json({"whitelist", "diff", after, before}, "", 1);
  EXPECT_EQ(json["no_longer_leaves"], R"([
      {"kind": "scalar", "prefix": "", "old": {"sig_fig": 2}, "new": null},
      {"kind": "distribution", "key": "new", "old": {"intervals": 1}, "new": null}])"_json);
  EXPECT_EQ(json["finer"].size(), 4U);
  EXPECT_EQ(json["newly_leaves"].size(), 0U);

  // Changes after which less leaves, or coarser values, need no second look.
  device.write("/none.plist", xmlOf("{}"));
  EXPECT_EQ(device.run({"whitelist", "diff", before, device.path("/none.plist")}).status, 0);
  const std::string absent = device.path("/absent");
  device.check({"whitelist", "diff", before, absent},
               fails("cannot read " + absent + ": No such file or directory", 2));
  device.check({"whitelist", "diff", "-", after},
               fails("standard input: not a whitelist: its root must be a dictionary of groups", 2),
               xmlOf("[]"));
}

using WhitelistExplain = DeviceTest;

TEST_F(WhitelistExplain, NamesTheRuleAndShowsWhatItDoes) {
  device.write(kWhitelistFile, xmlOf(kGood));
  const std::tuple<const char*, const char*, const char*> kCases[] = {
      {"app.starts", "12345", R"(app.starts
  scalar        group Apps, exact key
                bucket_interval 10, sig_fig 2
                12345 is reported as 12000
  distribution  not reported
)"},
      {"app.load", "20.5", R"(app.load
  scalar        not reported
  distribution  group Apps, exact key
                summary and histogram, intervals [10, 20.5]
                20.5 is counted in (10, 20.5]
)"},
      {"radio.x", "-15.5", R"(radio.x
  scalar        group Radio, prefix radio.
                sig_fig 1
                the value is not a 64-bit integer, so it cannot be a scalar
  distribution  group Radio, prefix radio.
                summary only
)"},
      {"app.raw", "-9223372036854775808", R"(app.raw
  scalar        group Apps, exact key
                reported unchanged
                -9223372036854775808 is reported as -9223372036854775808
                group InternalTesting would apply, but it is for internal devices
  distribution  not reported
)"}};
  for (const auto& [key, value, text] : kCases)
    device.check({"whitelist", "explain", key, "--value", value}, prints(text));
  EXPECT_EQ(device.run("whitelist explain app.raw --value many").status, 2);
}

TEST_F(WhitelistExplain, FollowsTaskingAndInternalDevices) {
  device.write(kWhitelistFile, xmlOf(kGood));
  device.run("prefs set com.norvane.da Radio false --bool");
  device.check("whitelist explain radio.x", prints(R"(radio.x
  scalar        not reported
                group Radio would apply, but it is switched off by tasking
  distribution  not reported
                group Radio would apply, but it is switched off by tasking
)"));
  device.write("/etc/tavrel/device-answers.plist", xmlOf(R"({"InternalBuild": true})"));
  const auto json = device.json("whitelist explain app.raw other --value 123");
  EXPECT_EQ(json["keys"][0]["scalar"], R"({
      "reported": true, "rule": "exact", "group": "InternalTesting", "options": {"sig_fig": 1},
      "value": 123, "reported_value": 100})"_json);
  EXPECT_EQ(json["keys"][1]["scalar"], R"({
      "reported": true, "rule": "internal", "options": {},
      "value": 123, "reported_value": 123})"_json);
}

}  // namespace
}  // namespace tavrel
