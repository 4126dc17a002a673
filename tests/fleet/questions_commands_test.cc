// The commands that ask questions, on both engines.
#include <algorithm>
#include <gmock/gmock.h>
#include <nlohmann/json.hpp>
#include <random>
#include <sstream>

#include "fleet/fleet_tool.h"
#include "tests/fleet/clickhouse_server.h"
#include "tests/fleet/engine_records.h"

namespace tavrel::fleet {
namespace {

using testing::HasSubstr;

struct Output {
  int status;
  std::string out;
  std::string error;
};

Output run(const std::string& database, std::vector<std::string> arguments) {
  arguments.insert(arguments.begin(), {"--database", database});
  std::istringstream in;
  std::ostringstream out;
  std::ostringstream error;
  const int status = runFleet(arguments, {in, out, error});
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
      record.region = device < 25 ? "DE" : device < 37 ? "AT" : "LI";
      record.whitelistDigest = isNew ? "b" : "a";
      record.scalars = {{"com.norvane.ioreport.nvme0.used_pct", static_cast<std::int64_t>(device)},
                        {"=sum", std::int64_t{1} << 60}};
      const double mean = 100 + 10 * noise(random) + (isNew ? 25 : 0);
      record.distributions = {{kSlow, {mean - 50, mean + 50.1, mean, 1e4 / 3, 7}}};
      record.cells = {{kSlow, -kInfinity, 100, "(-inf, 100]", 4},
                      {kSlow, 100, kInfinity, "(100, inf)", 3}};
    }
  }
  return all;
}

struct Question {
  const char* name;
  std::vector<std::string> arguments;
};
const Question kQuestions[] = {
    {"summary", {"summary", "--json"}},
    {"keys", {"summary", "--keys", "--csv"}},
    {"distribution", {"show", kSlow, "--by", "os", "--json", "--days", "2"}},
    {"scalar", {"show", "=sum", "--by", "region", "--csv"}},
    {"against", {"show", kSlow, "--against", "4.10"}},
    {"days", {"show", kSlow, "--days", "2026-11-23..", "--against", "..2026-11-22", "--json"}},
    {"compare", {"compare", "4.9", "4.10", "--json"}},
    {"text", {"compare", "4.9", "4.10", "--all"}},
    {"page", {"page", "-o", "-"}}};

class QuestionCommands : public testing::Test {
 protected:
  void load(const std::string& where, unsigned seed) {
    std::vector<LogRecord> all = records();
    std::shuffle(all.begin(), all.end(), std::mt19937(seed));
    openEngine(where, OpenMode::kWrite)->append(all);
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
  for (const auto& [name, arguments] : kQuestions) {
    SCOPED_TRACE(name);
    const Output answer = run(file, arguments);
    EXPECT_EQ(answer.status, 0) << answer.error;
    EXPECT_EQ(run(shuffled, arguments).out, answer.out);
    EXPECT_EQ(run(address, arguments).out, answer.out);
  }
}

// As Grafana's data source fills in its variables.
TEST_F(QuestionCommands, TheDashboardAsksWhatTheServerAnswers) {
  ClickhouseServer server;
  load(server.address("fleet"), 1);
  const auto dashboard =
      nlohmann::json::parse(contentOf(std::string(TAVREL_EXAMPLES) + "/fleet/grafana.json"));
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
    answers.push_back(server.ask(sql, "fleet"));
  }
  EXPECT_EQ(answers[0].substr(0, answers[0].find('\n')), "2026-11-23 00:00:00\tOS 4.10 (B)\t20");
  EXPECT_EQ(answers[1], "DE\t25\nAT\t12\n");
  EXPECT_THAT(answers[3], HasSubstr("OS 4.9 (A)\t20\t1152921504606846976\t"));
  EXPECT_EQ(answers[5], "(-inf, 100]\t320\n(100, inf)\t240\n");
  EXPECT_EQ(answers[6], "OS 4.10 (B)\t20\t20\t38\nOS 4.9 (A)\t20\t21\t39\n");
}

TEST_F(QuestionCommands, TellWhatChanged) {
  load(file, 1);
  const auto compared = nlohmann::json::parse(run(file, {"compare", "4.9", "4.10", "--json"}).out);
  EXPECT_EQ(compared["format_version"], 1);
  EXPECT_EQ(compared["old_version"], kOld);
  const auto& first = compared["comparisons"][0];
  EXPECT_EQ(first["changed"], true);
  EXPECT_EQ(first["kind"], "distribution");
  EXPECT_EQ(first["before"]["devices"], 20);
  EXPECT_GT(first["lower"], 10);
  EXPECT_LT(first["upper"], 40);
  EXPECT_EQ(compared["comparisons"][2]["effect"], 0);  // all are alike
  const auto shown =
      nlohmann::json::parse(run(file, {"show", kSlow, "--by", "region", "--json"}).out);
  const auto& side = shown["answers"][0]["sides"][0];
  EXPECT_EQ(side["joined"], 2);  // of AT and LI, 15 devices
  EXPECT_EQ(side["groups"].size(), 2u);
  EXPECT_EQ(side["all"]["values"], 840);
  EXPECT_EQ(side["all"]["histogram"]["buckets"][1]["above"], 100);
  EXPECT_EQ(side["all"]["histogram"]["buckets"][1]["at_most"], nullptr);
  EXPECT_THAT(run(file, {"compare", "4.9", "4.10"}).out,
              HasSubstr("OS 4.9 (A) -> OS 4.10 (B), all days: 1 of 3 statistics changed\n"));
  EXPECT_THAT(run(file, {"show", "=sum", "--csv"}).out,
              HasSubstr("\r\n'=sum,scalar,all days,,40,120,120,1152921504606846976,"));

  const std::string page = run(file, {"page", "-o", "-"}).out;
  EXPECT_THAT(page, HasSubstr("1 of 3 statistics changed"));
  EXPECT_THAT(page, HasSubstr("Endurance used"));
  EXPECT_EQ(page.find("<script"), std::string::npos);
}

TEST_F(QuestionCommands, SayWhatIsWrong) {
  load(file, 1);
  const struct {
    std::vector<std::string> arguments;
    int status;
    const char* message;
  } cases[] = {{{"show", "x\x1b"},
                1,
                "statistic \"x\\x1b\" is in no log: tavrel-fleet summary --keys lists all"},
               {{"show", "=sum", "--against", "1"},
                2,
                "--against: 2026-11-24 and all days overlap: name days apart with --days"},
               {{"show", "=sum", "--against", "5.0"},
                1,
                "version \"5.0\" is in no log: tavrel-fleet summary lists the versions"},
               {{"compare", "OS", "4.10"},
                1,
                "version \"OS\" is part of several versions: write the whole of one of them"},
               {{"compare", "4.9", "4.9"}, 2, "OLD and NEW are the same version: name two"},
               {{"summary", "--days", "0"},
                2,
                "--days: \"0\" is no range of days: write FIRST..LAST with days as YYYY-MM-DD, or "
                "a count of "
                "days"},
               {{"summary", "--devices-at-least", "2"},
                2,
                "--devices-at-least: 2 is too few: in groups of fewer than 3 devices, one owner "
                "can tell the "
                "figures of another"}};
  for (const auto& [arguments, status, message] : cases) {
    const Output output = run(file, arguments);
    EXPECT_EQ(output.error, "tavrel-fleet: " + std::string(message) + "\n");
    EXPECT_EQ(output.status, status);
    EXPECT_EQ(output.out, "");
  }
  EXPECT_EQ(run(file, {"summary", "--devices-at-least", "41"}).out,
            "All logs: fewer than 41 devices: nothing is shown\n");
  const std::string empty = root.root.path("/empty.db");
  openEngine(empty, OpenMode::kWrite);
  EXPECT_EQ(run(empty, {"summary"}).error,
            "tavrel-fleet: " + empty + ": holds no logs: load some with tavrel-fleet load\n");
}

}  // namespace
}  // namespace tavrel::fleet
