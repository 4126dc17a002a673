// Kills, files that are not databases, and servers that are away, refuse, or are slow.
#include <gmock/gmock.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <thread>

#include "clickhouse_server.h"
#include "engine_records.h"
#include "fleet/engine/open/open_engine.h"
#include "tests/helpers/killed_process.h"

namespace tavrel::fleet {
namespace {

using testing::HasSubstr;
using testing::IsSubsetOf;

std::string failureOf(const std::function<void()>& operation) {
  try {
    operation();
  } catch (const EngineError& error) {
    return error.what();
  }
  return "no failure";
}

std::string openingFailure(const std::string& where, OpenMode mode = OpenMode::Write) {
  return failureOf([&] { openEngine(where, mode); });
}

void appendInPortions(const std::string& where, const std::vector<LogRecord>& records) {
  const auto engine = openEngine(where, OpenMode::Write);
  for (std::size_t first = 0; first < records.size(); first += 8)
    engine->append(std::span(records).subspan(first, 8));
}

// Kills loaders at later and later moments; the next loader completes what each has begun.
void killLoaders(const std::function<std::string(std::size_t)>& whereOf) {
  const std::vector<LogRecord> all = fullRecords(16);
  appendInPortions(whereOf(0), all);
  const auto whole = rowsIn(*openEngine(whereOf(0), OpenMode::Read));
  ASSERT_EQ(whole.size(), 112u);
  std::size_t kills = 0;
  for (std::size_t calls = 1; kills < 100; calls += 1 + calls / 12, ++kills) {
    const std::string where = whereOf(calls);
    if (!runUntilSystemCall(calls, [&] { appendInPortions(where, all); })) break;
    const auto engine = openEngine(where, OpenMode::Write);
    const auto left = rowsIn(*engine);
    EXPECT_EQ(left.size() % 56, 0u) << calls;
    EXPECT_THAT(left, IsSubsetOf(whole)) << calls;
    engine->append(all);
    ASSERT_EQ(rowsIn(*engine), whole) << calls;
  }
  EXPECT_GT(kills, 20u);
  EXPECT_LT(kills, 100u);
}

TEST(EngineFaults, KilledLoaderOfAFileLeavesWholeAppends) {
  const TemporaryRoot root;
  killLoaders([&](std::size_t calls) { return root.root.path("/" + std::to_string(calls)); });
}

TEST(EngineFaults, KilledLoaderOfAServerLeavesWholeAppends) {
  const ClickhouseServer server;
  killLoaders([&](std::size_t calls) { return server.address("d" + std::to_string(calls)); });
}

TEST(EngineFaults, LeavesFilesAloneThatAreNotItsOwn) {
  const TemporaryRoot root;
  const std::string path = root.root.path("/file");
  const auto sql = [&](const char* statements) {
    sqlite3* connection = nullptr;
    sqlite3_open(path.c_str(), &connection);
    EXPECT_EQ(sqlite3_exec(connection, statements, nullptr, nullptr, nullptr), SQLITE_OK);
    sqlite3_close(connection);
  };
  const auto expectRefusal = [&](const std::string& failure) {
    const std::string before = contentOf(std::filesystem::path(path));
    EXPECT_EQ(openingFailure(path, OpenMode::Read), path + failure);
    EXPECT_EQ(openingFailure(path), path + failure);
    EXPECT_EQ(contentOf(std::filesystem::path(path)), before);
  };
  EXPECT_EQ(openingFailure(path, OpenMode::Read),
            path + ": there is no database: load logs into it first");
  EXPECT_FALSE(std::filesystem::exists(path));
  ASSERT_EQ(mkfifo(root.root.path("/pipe").c_str(), 0600), 0);
  for (const char* const name : {"/", "/pipe"}) {
    const std::string other = root.root.path(name);
    EXPECT_EQ(openingFailure(other), other + ": is not a regular file: name another file");
  }
  EXPECT_THAT(openingFailure(root.root.path("/no/file")),
              HasSubstr("/no/file: unable to open database file (No such file or directory): check "
                        "owner and permissions of the file and its folder"));
  root.write("/file", std::string(200, 'x'));
  expectRefusal(": is not a database: name another file");
  root.write("/file", "SQLite format 3");
  expectRefusal(": is not a database: name another file");
  std::filesystem::remove(path);
  sql("CREATE TABLE t(a)");
  expectRefusal(": is another program's database: name another file");
  std::filesystem::remove(path);
  openEngine(path, OpenMode::Write);
  sql("PRAGMA user_version = 7; PRAGMA journal_mode = DELETE");
  expectRefusal(
      ": has tables of version 7, and this program knows version 1: use the program that made it, "
      "or load the logs into a new file");
}

TEST(EngineFaults, TakesEachNameForThatOfAFile) {
  const TemporaryRoot root;
  const std::filesystem::path before = std::filesystem::current_path();
  std::filesystem::current_path(root.root.path("/"));
  for (const char* const name : {":memory:", "file:fleet.db"}) {
    std::size_t rows = 0;
    EXPECT_EQ(failureOf([&] {
                appendInPortions(name, fullRecords(8));
                rows = rowsIn(*openEngine(name, OpenMode::Read)->reader()).size();
              }),
              "no failure");
    EXPECT_EQ(rows, 56u) << name;
  }
  std::filesystem::current_path(before);
}

TEST(EngineFaults, LetsOtherUsersQuery) {
  if (geteuid() != 0) GTEST_SKIP() << "may not become another user";
  const TemporaryRoot root;
  const std::string path = root.root.path("/fleet.db");
  appendInPortions(path, fullRecords(8));
  std::filesystem::permissions(root.root.path("/"), std::filesystem::perms(0755));
  for (const char* end : {"", "-wal", "-shm"})
    std::filesystem::permissions(path + end, std::filesystem::perms(0644));
  const auto failureOfAnother = [&] {
    EXPECT_EQ(seteuid(65534), 0);
    const std::string failure =
        failureOf([&] { EXPECT_EQ(rowsIn(*openEngine(path, OpenMode::Read)).size(), 56u); });
    EXPECT_EQ(seteuid(0), 0);
    return failure;
  };
  EXPECT_EQ(failureOfAnother(), "no failure");
  EXPECT_EQ(std::filesystem::file_size(path + "-wal"), 0u);
  EXPECT_EQ(failureOf([&] { appendInPortions(path, fullRecords(8)); }), "no failure");
  std::filesystem::remove(path + "-wal");
  std::filesystem::remove(path + "-shm");
  EXPECT_EQ(failureOfAnother(),
            path +
                ": attempt to write a readonly database: copy it to a folder that you may write "
                "in, or load a log into it as its owner");
}

TEST(EngineFaults, NamesWhatIsWrongWithAnAddress) {
  const TemporaryRoot root;
  root.write("/long", std::string(5000, 'x'));
  const std::string advice = ": write clickhouse[s]://[USER@]HOST[:PORT]/NAME[?OPTION=VALUE[&...]]";
  const std::pair<std::string, std::string> cases[] = {
      {"clickhouse://", "is malformed"},
      {"clickhouse://h:x/d", "is malformed"},
      {"clickhouse://h", "needs a database with a name of letters, digits and underscores"},
      {"clickhouse://h/a;b", "needs a database with a name of letters, digits and underscores"},
      {"clickhouse://h/d?cluster=",
       "needs a cluster with a name of letters, digits and underscores"},
      {"clickhouse://h/d?timeout=0", "needs a number from 1 to 86400 as its timeout"},
      {"clickhouse://h/d?retries=1x", "needs a number from 0 to 20 as its retries"}};
  for (const auto& [address, failure] : cases)
    EXPECT_EQ(openingFailure(address), "the database's address " + failure + advice) << address;
  ASSERT_EQ(mkfifo(root.root.path("/pipe").c_str(), 0600), 0);
  const std::pair<const char*, const char*> passwords[] = {
      {"/long", ": has more than 4096 bytes: name a file that holds only a password"},
      {"/pipe", ": is not a regular file: name another file"},
      {"/none", ": no such file: name the file that holds the password"}};
  for (const auto& [name, failure] : passwords) {
    const std::string path = root.root.path(name);
    EXPECT_EQ(openingFailure("clickhouse://h/d?password-file=" + path), path + failure);
  }
}

TEST(EngineFaults, TellsWhatTheServerSays) {
  const ClickhouseServer server;
  const std::string address = server.address("d");
  EXPECT_EQ(openingFailure(address, OpenMode::Read),
            address + ": there are no tables: load logs into it first");
  EXPECT_THAT(openingFailure(server.address("d", "fleet:wrong@")),
              HasSubstr(address + ": the server refused: "));
  EXPECT_THAT(openingFailure(server.address("d", "fleet:wrong@")),
              HasSubstr(": check the user and the password in the address"));
  server.root.write("/password", "se'cret\n");
  EXPECT_EQ(openingFailure(server.address("d", "fleet:se%27cret@")), "no failure");
  EXPECT_EQ(openingFailure(server.address("d", "fleet@") + "?password-file=" + server.folder +
                           "password"),
            "no failure");
  server.ask("INSERT INTO d.tavrel_schema SELECT 7");
  EXPECT_EQ(openingFailure(address),
            address +
                ": has tables of version 1,7, and this program knows version 1: use the "
                "program that made them, or load the logs into a new database");
}

TEST(EngineFaults, WaitsForAServerThatStartsAgain) {
  ClickhouseServer server;
  const std::vector<LogRecord> all = fullRecords(400);
  const auto engine = openEngine(server.address("d"), OpenMode::Write);
  for (std::size_t first = 0; first < all.size(); first += 8) {
    std::jthread starter;
    if (first % 128 == 64) {
      server.end();
      starter = std::jthread([&] { server.start(); });
    }
    engine->append(std::span(all).subspan(first, 8));
  }
  const TemporaryRoot root;
  appendInPortions(root.root.path("/d"), all);
  EXPECT_EQ(rowsIn(*engine), rowsIn(*openEngine(root.root.path("/d"), OpenMode::Read)));
  server.end();
  EXPECT_THAT(
      openingFailure(server.address("d") + "?retries=1"),
      HasSubstr("Couldn't connect to server: check that the server runs and can be reached, "
                "and try again"));
}

TEST(EngineFaults, SpeaksTlsWithWhomItMay) {
  const Nginx proxy;
  const std::string where =
      "clickhouses://127.0.0.1:" + std::to_string(proxy.port) + "/d?retries=0";
  EXPECT_THAT(openingFailure(where), HasSubstr("SSL certificate problem"));
  EXPECT_THAT(openingFailure(where + "&ca-file=/none"),
              HasSubstr(": check the address and its ca-file"));
  EXPECT_THAT(openingFailure(where + "&ca-file=" + proxy.folder + "ca.crt"),
              HasSubstr("/d: the server answered with status 400"));
}

TEST(EngineFaults, BoundsItsPatience) {
  int requests = 0;
  std::string answer;
  ScriptedServer server([&](const std::string&) {
    ++requests;
    return answer;
  });
  std::string name = server.url();
  name = "clickhouse" + name.substr(4, name.rfind('/') - 3) + "d";
  const auto expect = [&](const std::string& options, const std::string& failure, int expected) {
    requests = 0;
    EXPECT_EQ(openingFailure(name + options), name + ": " + failure);
    EXPECT_EQ(requests, expected);
  };
  const auto answerWith = [&](const std::string& status, const std::string& body) {
    answer = "HTTP/1.1 " + status + "\r\nContent-Length: " + std::to_string(body.size()) +
             "\r\n\r\n" + body;
  };
  answerWith("500 Error",
             "Code: 252, e.displayText() = DB::Exception: Too many parts., e.what() = DB::E\n");
  expect("?retries=1",
         "the server refused: Too many parts: try again later; logs that are already filed will "
         "count once",
         2);
  answerWith("500 Error", "Code: 8, e.displayText() = DB::Exception: A\nb\x1B[0m, e.what()");
  expect("", "the server refused: A b [0m: check the address and the server's log", 1);
  answerWith("404 Not Found", "");
  expect("", "the server answered with status 404: check the address and the server's log", 1);
  const std::string other = "does not answer as a ClickHouse server does: check the address";
  for (const auto& [body, statements] :
       {std::pair(std::string(), 16), std::pair(std::string("<html>\n"), 1),
        std::pair(std::string(2U << 20, '1'), 1)}) {
    answerWith("200 OK", body);
    expect("", other, statements);
  }
  answerWith("200 OK", "1");
  answer.replace(answer.find(": 1"), 3, ": 9");
  server.closesAfterAnswer = true;
  expect("", "transfer closed with 8 bytes remaining to read: the answer is incomplete; try again",
         1);
}

TEST(EngineFaults, TakesRowsOnlyWhole) {
  std::string body = "1\n";
  ScriptedServer server([&](const std::string&) {
    return "HTTP/1.1 200 OK\r\nContent-Length: " + std::to_string(body.size()) + "\r\n\r\n" + body;
  });
  std::string name = server.url();
  name = "clickhouse" + name.substr(4, name.rfind('/') - 3) + "d";
  const auto engine = openEngine(name, OpenMode::Read);
  using namespace std::string_literals;
  const std::string block = "\2\2\4kind\5UInt8\0\1\4name\6String\1a\2bc"s;
  const std::pair<std::string, std::string> cases[] = {
      {"", ""},
      {block + "\2\0\4kind\5UInt8\4name\6String"s + block, "a bc a bc "},
      {"\2\2\4kind\5UInt8\0\3\4name\6String\1a\2bc"s, "a "},
      {block.substr(0, block.size() - 1), "the answer is incomplete; try again"},
      {"\2\x80\x80\x80\x80\x80\x80\x80\x80\x80\1" + block.substr(2),
       "the answer is incomplete; try again"},
      {block + "Code: 241",
       "the answer does not have the requested form; check that this program made the tables, "
       "and try again"}};
  for (const auto& [answer, expected] : cases) {
    body = answer;
    std::string names;
    try {
      for (const Key& key : engine->keys())
        names += key.name + ' ';
    } catch (const EngineError& error) {
      names = std::string(error.what()).substr(name.size() + 2);
    }
    EXPECT_EQ(names, expected);
  }
}

}  // namespace
}  // namespace tavrel::fleet
