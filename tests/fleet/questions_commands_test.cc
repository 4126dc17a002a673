// The question commands, on both engines.
#include <algorithm>
#include <filesystem>
#include <gmock/gmock.h>
#include <nlohmann/json.hpp>
#include <random>
#include <regex>
#include <sstream>

#include "clickhouse_server.h"
#include "engine_records.h"
#include "fleet/commands/csv_writer.h"
#include "fleet/commands/show_output.h"
#include "fleet/fleet_tool.h"
#include "tests/helpers/command_line.h"

namespace tavrel::fleet {
namespace {

using testing::HasSubstr;
using testing::StartsWith;

struct Output {
  int status;
  std::string out;
  std::string error;
};

Output run(const std::string& database, CommandLine arguments,
           std::optional<std::size_t> columns = std::nullopt) {
  arguments.insert(arguments.begin(), {"--database", database});
  std::istringstream in;
  std::ostringstream out;
  std::ostringstream error;
  const int status =
      runFleet(arguments, {.in = in, .out = out, .error = error, .columns = columns});
  return {status, out.str(), error.str()};
}

constexpr const char* kOld = "OS 4.9 (A)";
constexpr const char* kNew = "OS 4.10 (B)";
constexpr const char* kSlow = "com.example.<script>\xE2\x80\xAE";

/// 40 devices on three days; the new version starts later and is slower.
std::vector<LogRecord> records() {
  constexpr double kInfinity = std::numeric_limits<double>::infinity();
  std::vector<LogRecord> all;
  std::mt19937 random(6);
  std::normal_distribution<double> noise(0, 1);
  for (std::uint64_t device = 0; device < 40; ++device) {
    for (std::int32_t day = 20779; day < 20782; ++day) {
      LogRecord& record = all.emplace_back(makeRecord(all.size(), day));
      const bool isNew = device % 2 == 0;
      record.osVersion = isNew ? kNew : kOld;
      record.region = device < 13 ? "(other)" : device < 26 ? "" : device < 37 ? "AT" : "LI";
      record.whitelistDigest = isNew ? "b" : "a";
      record.scalars = {
          {"com.norvane.ioreport.nvme0.used_pct", static_cast<std::int64_t>(device)},
          {"=sum", std::int64_t{1} << 60},
          {"almost", device == 0 ? -1 : static_cast<std::int64_t>(device / 2 * 1000)}};
      const double mean = 100 + 10 * noise(random) + (isNew ? 25 : 0);
      record.distributions = {{kSlow, {mean - 50, mean + 50.1, mean, 1e4 / 3, 7}},
                              {"=sum", {0, 1, device == 0 ? std::nan("") : mean, 1, 2}}};
      record.cells = {{kSlow, -kInfinity, 100, "(-inf, 100]", 4},
                      {kSlow, 100, kInfinity, "(100, inf)", 3}};
    }
  }
  return all;
}

const CommandLine kQuestions[] = {
    "summary --json",
    "summary --keys --csv",
    {"show", kSlow, "--by", "os", "--json", "--days", "2"},
    "show =sum --by region --csv",
    {"show", kSlow, "--by", "os", "--csv", "--buckets"},
    {"show", kSlow, "--against", "4.10"},
    {"show", kSlow, "--days", "2026-11-23..", "--against", "..2026-11-22", "--json"},
    "compare 4.9 4.10 --json",
    "compare 4.9 4.10 --all",
    "page -o -"};

class QuestionCommands : public testing::Test {
 protected:
  void load(const std::string& where, unsigned seed) {
    std::vector<LogRecord> all = records();
    std::shuffle(all.begin(), all.end(), std::mt19937(seed));
    openEngine(where, OpenMode::Write)->append(all);
  }
  TemporaryRoot root;
  const std::string file = root.root.path("/fleet.db");
};

TEST_F(QuestionCommands, AnswerInTheSameBitsOnBothEnginesInAnyOrder) {
  load(file, 1);
  const std::string shuffled = root.root.path("/shuffled.db");
  load(shuffled, 2);
  ClickhouseServer server;
  const std::string address = server.address("fleet");
  load(address, 3);
  for (const CommandLine& arguments : kQuestions) {
    SCOPED_TRACE(testing::PrintToString(arguments));
    const Output answer = run(file, arguments);
    EXPECT_EQ(answer.status, 0) << answer.error;
    EXPECT_EQ(run(shuffled, arguments).out, answer.out);
    EXPECT_EQ(run(address, arguments).out, answer.out);
  }
}

// Fills in the variables as Grafana's data source does.
TEST_F(QuestionCommands, TheDashboardAsksWhatTheServerAnswers) {
  ClickhouseServer server;
  std::vector<LogRecord> all = records();
  for (std::size_t i = 0; i < all.size(); ++i) {
    const bool isFinite = i % 4 != 0;
    all[i].distributions[0].numbers.mean = isFinite ? 100 : std::numeric_limits<double>::infinity();
    all[i].distributions.push_back({"plain", {1, 1, 1, 0, 1}});
    all[i].scalars.push_back({"com.norvane.ioreport.nvme1.used_pct", 20});
    for (const char* const key : {"a'b", "a\\", "a\n"})
      all[i].scalars.push_back({key, 1});
  }
  openEngine(server.address("fleet"), OpenMode::Write)->append(all);
  const auto dashboard =
      nlohmann::json::parse(contentOf(std::string(TAVREL_EXAMPLES) + "/fleet/grafana.json"));
  const auto& lists = dashboard["templating"]["list"];
  EXPECT_EQ(server.ask(lists[2]["query"], "fleet"),
            "almost\ncom.norvane.ioreport.nvme0.used_pct\ncom.norvane.ioreport.nvme1.used_pct\n");
  EXPECT_EQ(server.ask(lists[3]["query"], "fleet"), "plain\n");
  std::vector<std::string> answers;
  for (const auto& panel : dashboard["panels"]) {
    std::string sql = panel["targets"][0]["rawSql"];
    for (const auto& [variable, value] :
         {std::pair("$__dateFilter(date)", std::string("date >= toDate('2026-11-23')")),
          {"$least", "10"},
          {"$scalar", "=sum"},
          {"$distribution", kSlow}}) {
      for (std::size_t at = sql.find(variable); at != std::string::npos; at = sql.find(variable))
        sql.replace(at, std::strlen(variable), value);
    }
    if (panel["type"] == "timeseries") sql = "SELECT toUInt32(time), * FROM (" + sql + ")";
    answers.push_back(server.ask(sql, "fleet"));
  }
  const std::string day = std::to_string(20780 * 86'400) + "\t2026-11-23 00:00:00\tOS ";
  EXPECT_THAT(answers[0], StartsWith(day + "4.10 (B)\t20\n" + day + "4.9 (A)\t20\n"));
  EXPECT_THAT(answers[2], StartsWith(day + "4.10 (B)\t"));
  EXPECT_THAT(answers[4], StartsWith(day + "4.10 (B)\t100\n" + day + "4.9 (A)\t100\n"));
  EXPECT_EQ(answers[1], "\t13\n(other)\t13\nAT\t11\n");
  EXPECT_THAT(answers[3], HasSubstr("OS 4.9 (A)\t20\t1152921504606846976\t"));
  EXPECT_EQ(answers[5], "(-inf, 100]\t320\n(100, inf)\t240\n");
  EXPECT_EQ(answers[6], "OS 4.10 (B)\t20\t20\t36\nOS 4.9 (A)\t20\t20\t37\n");
}

TEST_F(QuestionCommands, TellWhatChanged) {
  load(file, 1);
  const auto compared = nlohmann::json::parse(run(file, "compare 4.9 4.10 --json").out);
  EXPECT_EQ(compared["format_version"], 1);
  EXPECT_EQ(compared["old_version"], kOld);
  const auto& first = compared["comparisons"][0];
  EXPECT_EQ(first["changed"], true);
  EXPECT_EQ(first["kind"], "distribution");
  EXPECT_EQ(first["before"]["devices"], 20);
  EXPECT_GT(first["lower"], 10);
  EXPECT_LT(first["upper"], 40);
  EXPECT_EQ(compared["comparisons"][1]["after"]["logs_without_mean"], 3);
  EXPECT_EQ(compared["comparisons"][4]["effect"], 0);  // all logs are alike
  const auto shown =
      nlohmann::json::parse(run(file, {"show", kSlow, "--by", "region", "--json"}).out);
  const auto& side = shown["answers"][0]["sides"][0];
  std::string groups;
  for (const auto& group : side["groups"])
    groups += group["part"].dump() + group["group"].dump();
  EXPECT_EQ(groups, R"x("not_reported"null"value""(other)""other"null)x");
  EXPECT_EQ(side["joined"], 2);  // AT and LI, 14 devices
  EXPECT_EQ(side["all"]["values"], 840);
  EXPECT_EQ(side["all"]["histogram"]["buckets"][1]["above"], 100);
  EXPECT_EQ(side["all"]["histogram"]["buckets"][1]["at_most"], nullptr);
  EXPECT_THAT(run(file, "compare 4.9 4.10").out,
              HasSubstr("OS 4.9 (A) -> OS 4.10 (B), all days: 2 of 5 statistics changed\n"));
  EXPECT_EQ(run(file, "compare 4.9 4.10 --all").out.find(" -0 "), std::string::npos);
  const std::string csv = run(file, "show =sum --by region --csv").out;
  EXPECT_THAT(csv, HasSubstr("\r\n'=sum,scalar,all days,all,,40,120,0,120,1152921504606846976,"
                             "1152921504606846976,1152921504606846976,0,0,1152921504606846976,,,"));
  EXPECT_THAT(csv, HasSubstr("\r\n'=sum,distribution,all days,value,(other),13,39,3,78,0,1,"));
  EXPECT_THAT(csv, HasSubstr("\r\n'=sum,distribution,all days,not_reported,,13,39,0,78,"));
  EXPECT_THAT(csv, HasSubstr("\r\n'=sum,distribution,all days,other,,14,42,0,84,"));
  const std::string buckets = run(file, {"show", kSlow, "--csv", "--buckets", "--by", "os"}).out;
  EXPECT_THAT(buckets, HasSubstr(",all days,all,,,100,480,480\r\n"));
  EXPECT_THAT(buckets, HasSubstr(",all days,value,OS 4.10 (B),100,,180,180\r\n"));

  const std::string page = run(file, "page -o -").out;
  EXPECT_THAT(page, HasSubstr("2 of 5 statistics changed"));
  const std::regex sentence("Chance alone would show");
  EXPECT_EQ(std::distance(std::sregex_iterator(page.begin(), page.end(), sentence), {}), 2);
  EXPECT_THAT(page, HasSubstr("Endurance used"));
  EXPECT_EQ(page.find("<script"), std::string::npos);
}

TEST_F(QuestionCommands, PagesTellNeighbouringBucketsApart) {
  constexpr const char* kKey = "com.norvane.usage.cpu.busy_milliseconds";
  std::vector<LogRecord> all;
  for (std::uint64_t device = 0; device < 20; ++device) {
    LogRecord& record = all.emplace_back(makeRecord(device, 20779));
    record.osVersion = kOld;
    record.distributions = {{kKey, {1000.3, 1000.5, 1000.4, 0.02, 2}}};
    record.scalars = {{"com.example.number", static_cast<std::int64_t>(device)}};
    record.cells = {{kKey, 1000.2, 1000.4, "(1000.2, 1000.4]", 1},
                    {kKey, 1000.4, 1000.6, "(1000.4, 1000.6]", 1}};
  }
  openEngine(file, OpenMode::Write)->append(all);
  const std::string page = run(file, "page -o -").out;
  for (const char* bar : {"\"1000.2 to 1000.4: 20\"", "\"1000.4 to 1000.6: 20\""})
    EXPECT_THAT(page, HasSubstr(std::string("aria-label=") + bar));
  EXPECT_THAT(page, HasSubstr(", many values per log (milliseconds)</p>"));
  EXPECT_THAT(page, HasSubstr("data-title=\"Mean\">1 s</td>"));
  EXPECT_THAT(page, HasSubstr("data-title=\"5 %\">not shown</td>"));
  EXPECT_THAT(page, HasSubstr("data-title=\"95 %\">18</td>"));
  EXPECT_THAT(page, HasSubstr("data-title=\"Median\">1000.2 to 1000.4 milliseconds</td>"));
  EXPECT_THAT(run(file, {"show", kKey}).out, HasSubstr(": distribution (milliseconds)\n"));
}

TEST_F(QuestionCommands, PagesAreBounded) {
  std::vector<LogRecord> all;
  for (std::int64_t device = 0; device < 20; ++device) {
    LogRecord& record = all.emplace_back(makeRecord(static_cast<std::uint64_t>(device), 20779));
    const bool isNew = device % 2 == 0;
    record.osVersion = isNew ? kNew : kOld;
    for (int i = 0; i < 101; ++i) {
      const std::string key = std::to_string(i) + ".used_pct";
      record.scalars.push_back({record.texts.keep(key), device + (isNew ? 100 : 0)});
    }
    for (int i = 0; i < 10; ++i) {
      const std::string_view key = record.texts.keep("fine " + std::to_string(i));
      const int buckets = i == 0 ? 501 : 499;
      record.distributions.push_back({key, {1, 501, isNew ? 260.0 : 250.0, 1e6, 501}});
      for (int lower = 0; lower < buckets; ++lower)
        record.cells.push_back(
            {key, lower + 0.0, lower + 1.0, record.texts.keep(std::to_string(lower)), 1});
    }
  }
  openEngine(file, OpenMode::Write)->append(all);
  const std::string page = run(file, "page -o -").out;
  for (const char* text :
       {">tavrel-fleet compare lists 11 more changes.<",
        ">tavrel-fleet show --buckets prints the histograms, which have 1,002 buckets.<",
        " more statistics.<"})
    EXPECT_THAT(page, HasSubstr(text));
  EXPECT_LT(page.size(), 2'000'000U);
  const std::regex change("data-title=\"Standard deviations\"");
  EXPECT_EQ(std::distance(std::sregex_iterator(page.begin(), page.end(), change), {}), 100);
}

TEST_F(QuestionCommands, CutNoNamesOnNarrowTerminals) {
  load(file, 1);
  const std::string shown = run(file, "show =sum --by region", 64).out;
  EXPECT_THAT(shown,
              HasSubstr("\n                  DEVICES  MINIMUM        MEAN  MAXIMUM  NO MEAN\n"
                        "  (all)                40  "));
  EXPECT_THAT(shown, HasSubstr("\n  \"(other)\"            13  "));
  EXPECT_THAT(shown, HasSubstr("\n  (not reported)       13  "));
  EXPECT_THAT(shown, HasSubstr("\n  No room for STD DEVIATION, LOGS, VALUES, 25 %, 75 %, MINIMUM, "
                               "MAXIMUM, 5 %, 95 %: widen the terminal\n"));
  EXPECT_THAT(shown, HasSubstr("\n  NO MEAN counts logs that means and deviations leave out"));
  const std::string compared = run(file, "compare 4.9 4.10 --all", 80).out;
  EXPECT_THAT(compared, HasSubstr("\n=sum  "));
  EXPECT_THAT(compared, HasSubstr("  scalar  "));
  EXPECT_EQ(compared.find("…"), std::string::npos);
}

TEST_F(QuestionCommands, ShareBracketsInTheManualOnlyIfAllExcludeEachOther) {
  root.write("/page", "@command show\n");
  EXPECT_THAT(run(file, {"completion", "man", root.root.path("/page")}).out,
              HasSubstr(" [\\fB\\-\\-json\\fR | \\fB\\-\\-csv\\fR] [\\fB\\-\\-buckets\\fR] "));
}

TEST_F(QuestionCommands, CompleteInBash) {
  load(file, 1);
  const std::string folder = root.root.path("");
  root.write("/versions", run(file, "completion versions").out);
  const std::string script = run(file, "completion bash").out + "tavrel-fleet() { echo \"$@\" > " +
                             folder + "/asked; cat " + folder +
                             "/versions; }\n"
                             "COMP_WORDS=($(sed 's/[:=]\\+/ & /g' <<< \"$COMP_LINE\"))\n"
                             "[[ $COMP_LINE != *' ' ]] || COMP_WORDS+=('')\n"
                             "COMP_CWORD=$((${#COMP_WORDS[@]} - 1))\n_tavrel_fleet\n"
                             "echo \"${COMPREPLY[@]}\"\n";
  const std::string address = "--database clickhouse://u@h:8123/d?cluster=c";
  const struct {
    std::string line, words, asked;
  } cases[] = {{"", "load summary show compare page\n", ""},
               {"compare ", "4.9 4.10\n", "completion versions\n"},
               {"show x --by r", "region\n", ""},
               {"show x --by=r", "region\n", ""},
               {"page --d", "--days --devices-at-least --database\n", ""},
               {"--database=x compare 4.9 4.1", "4.10\n", "--database x completion versions\n"},
               {address + " ", "load summary show compare page\n", ""},
               {address + " compare 4.9 4.1", "4.10\n", address + " completion versions\n"},
               {"load --set-aside a:", "b\n", ""}};
  std::filesystem::create_directory(folder + "/a:b");
  for (const auto& [line, words, asked] : cases) {
    root.write("/asked", "");
    root.write("/script", "cd " + folder + "\nCOMP_LINE='tavrel-fleet " + line + "'\n" + script);
    EXPECT_EQ(std::system(("bash " + folder + "/script > " + folder + "/words").c_str()), 0);
    EXPECT_EQ(contentOf(folder + "/words"), words) << line;
    EXPECT_EQ(contentOf(folder + "/asked"), asked) << line;
  }
}

TEST_F(QuestionCommands, CompleteFromTheNamedDatabaseInOtherShells) {
  const std::string folder = root.root.path("");
  root.write("/script.zsh", run(file, "completion zsh").out);
  root.write("/script.fish", run(file, "completion fish").out);
  root.write("/tavrel-fleet", "#!/bin/sh\necho \"$@\" > " + folder + "/asked\n");
  std::filesystem::permissions(folder + "/tavrel-fleet", std::filesystem::perms::owner_all);
  const std::string asks = "PATH=" + folder + ":$PATH ";
  const std::pair<std::string, std::string> shells[] = {
      {"fish", asks + "fish -c 'source " + folder +
                   "/script.fish; complete -C \"tavrel-fleet --database h:1/d compare \"'"},
      // zsh's completion functions work only in a terminal, so replace them.
      {"zsh", asks +
                  "zsh -fc '_arguments() { state=argument; words=(compare \"\"); "
                  "[[ $* != *versions* ]] || _tavrel_fleet_list versions }\n"
                  "_call_program() { eval \"$argv[2,-1]\" }; compadd() { }\n"
                  "words=(tavrel-fleet --database h:1/d compare \"\"); . " +
                  folder + "/script.zsh'"}};
  int tried = 0;
  for (const auto& [shell, command] : shells) {
    if (std::system(("command -v " + shell + " > /dev/null").c_str()) != 0) continue;
    ++tried;
    root.write("/asked", "");
    EXPECT_EQ(std::system((command + " > /dev/null").c_str()), 0) << shell;
    EXPECT_EQ(contentOf(folder + "/asked"), "--database h:1/d completion versions\n") << shell;
  }
  if (tried == 0) GTEST_SKIP() << "neither fish nor zsh";
}

TEST(ShowOutputTest, KeepsTheEndsOfBucketsApart) {
  EXPECT_EQ(bucketText(12345678900, 12345678901), "(12345678900, 12345678901]");
  EXPECT_EQ(bucketText(0.1, 0.30000000000000004), "(0.1, 0.30000000000000004]");
}

TEST(CsvWriterTest, WritesNothingThatATerminalObeys) {
  std::ostringstream out;
  CsvWriter(out).text("\xFF\x1B[m\xC2\x9B\tü").text("=\x7F").text(";=1\n=a;;-");
  EXPECT_EQ(out.str(), "\uFFFD\uFFFD[m\uFFFD\tü,'=\uFFFD,\";'=1\n'=a;;'-\"");
}

TEST_F(QuestionCommands, SayWhatIsWrong) {
  load(file, 1);
  LogRecord rare = makeRecord(1000, 47480);  // of one device, whose clock is wrong
  rare.osVersion = "OS 9";
  rare.scalars = {{"rare", 1}};
  openEngine(file, OpenMode::Write)->append({&rare, 1});
  const std::string few =
      " is in no log, or in logs of fewer than 10 devices: tavrel-fleet summary";
  const std::tuple<CommandLine, int, std::string> cases[] = {
      {{"page", "-o", file}, 2, "--output: " + file + " is the database: name another file"},
      {"show x\x1b", 1, "statistic \"x\\x1b\"" + few + " --keys lists the statistics"},
      {{"show", ""}, 2, "KEY: must not be empty: see 'tavrel-fleet show --help'"},
      {{"compare", "", "4.9"}, 2, "OLD: must not be empty: see 'tavrel-fleet compare --help'"},
      {{"compare", "4.9", ""}, 2, "NEW: must not be empty: see 'tavrel-fleet compare --help'"},
      {"show rare --days 1", 1, "statistic \"rare\"" + few + " --keys lists the statistics"},
      {"show =sum --against 1", 2,
       "--against: 2026-11-24 and all days overlap: choose separate days with --days; for a "
       "version, write more of its name"},
      {"show =sum --devices-at-least 5000 --days 1 --against 2026-11-20", 1,
       "fewer than 5000 devices: nothing is shown"},
      {"show =sum --against 5.0", 1, "version \"5.0\"" + few + " lists the versions"},
      {{"compare", "OS 9", "4.10"}, 1, "version \"OS 9\"" + few + " lists the versions"},
      {"compare OS 4.10", 1,
       "version \"OS\" is part of several versions: write one of them in full"},
      {"compare 4.1 4.9", 1, "version \"4.1\"" + few + " lists the versions"},
      {"compare 4.9 4.9", 2, "OLD and NEW are the same version: name two"},
      {"summary --days 0", 2,
       "--days: \"0\" is not a range of days: write FIRST..LAST with days as YYYY-MM-DD, "
       "or a number of days"},
      {"summary --devices-at-least 2", 2,
       "--devices-at-least: 2 is too few: in groups of fewer than 3 devices, one owner "
       "can work out the figures of another"}};
  for (const auto& [arguments, status, message] : cases) {
    const Output output = run(file, arguments);
    EXPECT_EQ(output.error, "tavrel-fleet: " + message + "\n");
    EXPECT_EQ(output.status, status);
    EXPECT_EQ(output.out, "");
  }
  for (const char* const question :
       {"summary --json", "page -o -", "show =sum", "compare 4.9 4.10"}) {
    SCOPED_TRACE(question);
    const std::string strict = std::string(question) + " --devices-at-least 41";
    const Output all = run(file, strict);
    const Output some = run(file, strict + " --days 7");
    EXPECT_EQ(some.out, all.out);
    EXPECT_EQ(some.error, all.error);
    EXPECT_EQ(some.status, all.status);
  }
  EXPECT_EQ(run(file, "summary --days 7 --devices-at-least 41").out,
            "All logs: fewer than 41 devices: nothing is shown\n");
  EXPECT_EQ(run(file, "summary --keys --devices-at-least 41").out,
            "no statistic of at least 41 devices\n");
  const Output against = run(file, "show =sum --against 7 --devices-at-least 41");
  EXPECT_EQ(against.error, "tavrel-fleet: fewer than 41 devices: nothing is shown\n");
  EXPECT_EQ(against.status, 1);
  for (const auto& [where, message] :
       {std::pair("http://h/d",
                  "no database has an address that begins with \"http://\": write "
                  "clickhouse:// for a server; ./http://… is a file"),
        {"clickhouse://h/d?a=b",
         "the database's address has the unknown option \"a\": give cluster, password-file, "
         "ca-file, timeout or retries"}}) {
    const Output output = run(where, "summary");
    EXPECT_EQ(output.error, "tavrel-fleet: --database: " + std::string(message) +
                                ": see 'tavrel-fleet summary --help'\n");
    EXPECT_EQ(output.status, 2);
  }
  const std::string empty = root.root.path("/empty.db");
  openEngine(empty, OpenMode::Write);
  EXPECT_EQ(run(empty, "summary").error,
            "tavrel-fleet: " + empty + ": holds no logs: load some with tavrel-fleet load\n");
  EXPECT_EQ(run(empty, "page -o /none/x").error,
            "tavrel-fleet: cannot write /none/x: /none: No such file or directory: create this "
            "folder\n");
}

}  // namespace
}  // namespace tavrel::fleet
