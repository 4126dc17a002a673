// The tables as people and other programs see them, and tables spread over several servers.
#include <sqlite3.h>

#include "clickhouse_server.h"
#include "engine_records.h"
#include "fleet/engine/open/open_engine.h"

namespace tavrel::fleet {
namespace {

// Statements that run on both engines, and their answers for 600 logs.
const std::pair<std::string, std::string> kQuestions[] = {
    {"SELECT count(*), min(day), sum(created) FROM logs", "600\t20781\t1077000179700\n"},
    {"SELECT os_version, previous_os_version, config_number, task_id, language, preferred_language "
     "FROM logs WHERE region = 'region 7'",
     "Pellio 4.2 (16R349)\tbefore\tc\tt\tde\tde-AT\n"},
    {"SELECT sum(value), count(*) FROM scalars WHERE key = 'a'", "539100\t600\n"},
    {"SELECT sum(minimum + maximum + mean + squared_deviations) FROM distributions WHERE key = 'a'",
     "1425\n"},
    {"SELECT label, sum(count), min(lower), max(upper) FROM cells WHERE key = 'a' GROUP BY label "
     "ORDER BY label",
     "(0, 1]\t179700\t0\t1\n(1, 2]\t600\t1\t2\n"},
    {"SELECT bundle, sum(times) FROM applications GROUP BY bundle", "com.example\t1200\n"},
    {"SELECT sum(value) FROM scalars WHERE key = 'a' AND log IN (SELECT log FROM logs WHERE region "
     "= 'region 7')",
     "21\n"}};

TEST(EngineTables, AnswerTheSameStatementsOnBothEngines) {
  const TemporaryRoot root;
  const std::string path = root.root.path("/d");
  const ClickhouseServer server;
  for (const std::string& where : {path, server.address("d")})
    openEngine(where, OpenMode::Write)->append(fullRecords(600));
  for (const char* end : {"", "-wal", "-shm"})
    EXPECT_EQ(std::filesystem::status(path + end).permissions(), std::filesystem::perms{0640});
  sqlite3* connection = nullptr;
  sqlite3_open_v2(path.c_str(), &connection, SQLITE_OPEN_READONLY, nullptr);
  const auto addRow = [](void* answer, int columns, char** values, char**) {
    for (int i = 0; i < columns; ++i) {
      std::string value = values[i];
      if (value.ends_with(".0")) value.resize(value.size() - 2);
      *static_cast<std::string*>(answer) += value + (i + 1 < columns ? '\t' : '\n');
    }
    return 0;
  };
  for (const auto& [question, expected] : kQuestions) {
    std::string answer;
    EXPECT_EQ(sqlite3_exec(connection, question.c_str(), addRow, &answer, nullptr), SQLITE_OK);
    EXPECT_EQ(answer, expected) << question;
    EXPECT_EQ(server.ask(question, "d"), expected) << question;
  }
  sqlite3_close(connection);
}

TEST(EngineTables, AreSharedByTheServersOfACluster) {
  int first = 0;
  int second = 0;
  listenAtFreePort(first);
  listenAtFreePort(second);
  const ClickhouseServer one({first, second});
  const ClickhouseServer two({second, first});
  const std::string address = one.address("d") + "?cluster=pair";
  std::string failure;
  try {
    openEngine(address, OpenMode::Write);
  } catch (const EngineError& error) {
    failure = error.what();
  }
  EXPECT_EQ(failure, one.address("d") +
                         ": not all servers of cluster pair have the tables: load into each one "
                         "once, without \"cluster\" in the address");
  openEngine(two.address("d"), OpenMode::Write)->append(fullRecords(20));
  const auto engine = openEngine(address, OpenMode::Write);
  EXPECT_EQ(engine->append(fullRecords(600)).known, 20u);
  // A loader that knows only one server files logs that another server has.
  openEngine(one.address("d"), OpenMode::Write)->append(fullRecords(40));
  EXPECT_NE(one.ask("SELECT count() FROM d.log"), "0\n");
  EXPECT_GT(std::stoi(two.ask("SELECT count() FROM d.log")), 20);

  const TemporaryRoot root;
  const auto file = openEngine(root.root.path("/d"), OpenMode::Write);
  file->append(fullRecords(600));
  EXPECT_EQ(rowsIn(*engine), rowsIn(*file));
  for (const auto& [question, expected] : kQuestions)
    EXPECT_EQ(one.ask(question, "d_pair"), expected) << question;
}

}  // namespace
}  // namespace tavrel::fleet
