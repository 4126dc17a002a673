// What every engine must do, tested on each of them.
#include <cmath>
#include <gmock/gmock.h>
#include <limits>
#include <random>
#include <thread>

#include "clickhouse_server.h"
#include "engine_records.h"
#include "fleet/engine/open/open_engine.h"
#include "tests/devices/temporary_root.h"

namespace tavrel::fleet {
namespace {

using testing::ElementsAre;
using testing::UnorderedElementsAreArray;

class EngineContract : public testing::TestWithParam<bool> {
 protected:
  EngineContract() {
    if (GetParam()) server_.emplace();
  }
  std::unique_ptr<Engine> open(OpenMode mode = OpenMode::Write,
                               const std::string& name = "fleet") const {
    return openEngine(server_ ? server_->address(name) : root_.root.path("/" + name), mode);
  }
  std::unique_ptr<Engine> openOther() const { return open(OpenMode::Write, "other"); }

 private:
  const TemporaryRoot root_;
  std::optional<ClickhouseServer> server_;
};

INSTANTIATE_TEST_SUITE_P(, EngineContract, testing::Bool(), [](const auto& instance) {
  return instance.param ? "ClickHouse" : "SQLite";
});

constexpr double kInfinity = std::numeric_limits<double>::infinity();

TEST_P(EngineContract, HandsOutWhatWasAppended) {
  LogRecord record = makeRecord(1, -3);
  const std::string longText(300, 'c');
  record.whitelistDigest = longText;
  record.scalars = {{"s", INT64_MIN}, {"t", INT64_MAX}};
  record.distributions = {{"s", {-0.0, kInfinity, std::nan(""), -std::nan("7"), UINT64_MAX}},
                          {"t", {5e-324, 0.0, 1.0, 0.1, 0}}};
  record.cells = {{"h", -kInfinity, -0.0, "(-inf, 0]", UINT64_MAX},
                  {"h", 0.1, 1e300, "(0.1, 1e+300]", 0}};
  EXPECT_EQ(open()->append({&record, 1}).added, 1u);

  const auto engine = open(OpenMode::Read);
  std::vector<std::string> keys;
  for (const Key& key : engine->keys())
    keys.push_back(std::to_string(static_cast<int>(key.kind)) + key.name);
  EXPECT_THAT(keys, ElementsAre("0s", "0t", "1s", "1t", "2h"));
  const std::string name = "region 1 ";
  const auto bits = bitsOf;
  EXPECT_THAT(rowsIn(*engine),
              UnorderedElementsAreArray(
                  {name + "-3|Pellio 4.2 (16R349)|" + longText, name + "s=-9223372036854775808",
                   name + "t=9223372036854775807",
                   name + "s:" + bits(-0.0) + "," + bits(kInfinity) + "," + bits(std::nan("")) +
                       "," + bits(-std::nan("7")) + ",18446744073709551615",
                   name + "t:" + bits(5e-324) + ",0," + bits(1) + "," + bits(0.1) + ",0",
                   name + "h(" + bits(-kInfinity) + "," + bits(-0.0) + "]18446744073709551615",
                   name + "h(" + bits(0.1) + "," + bits(1e300) + "]0"}));
  int rows = 0;
  engine->scalars("h", [&](auto) { ++rows; });
  engine->logs(-2, INT32_MAX, [&](auto) { ++rows; });
  EXPECT_EQ(rows, 0);
}

TEST_P(EngineContract, CountsALogOnceInWhateverOrderAndPortionsItComes) {
  std::vector<LogRecord> records = fullRecords(700);
  EXPECT_EQ(open()->append(records).added, 700u);
  const auto expected = rowsIn(*open());
  EXPECT_EQ(expected.size(), 4900u);

  const auto engine = openOther();
  std::shuffle(records.begin(), records.end(), std::mt19937(5));
  records.push_back(std::move(fullRecords(1, 3).front()));
  for (const auto& [first, count, before, twice] :
       {std::array<std::size_t, 4>{0, 1, 0, 0}, {0, 4, 1, 0}, {4, 600, 0, 0}, {500, 201, 104, 1}}) {
    const auto appended = engine->append(std::span(records).subspan(first, count));
    EXPECT_EQ(appended.known, before + twice);
    EXPECT_EQ(appended.added, count - before - twice);
    std::vector<bool> isNew(before, false);
    isNew.resize(count - twice, true);
    isNew.resize(count, false);
    EXPECT_EQ(appended.isNew, isNew);
  }
  EXPECT_EQ(rowsIn(*engine->reader()), expected);
}

TEST_P(EngineContract, TakesManyLogsAtOnce) {
  std::vector<LogRecord> records;
  for (std::uint64_t number = 0; number < 16'500; ++number) {
    records.push_back(makeRecord(number));
    records.back().scalars = {{"a", static_cast<std::int64_t>(number)}};
  }
  const auto engine = open();
  engine->append(std::span(records).first(1));
  EXPECT_EQ(engine->append(records).added, 16'499u);
  EXPECT_EQ(engine->append(records).known, 16'500u);
  std::map<LogId, std::int64_t> numbers;
  engine->logs(0, INT32_MAX, [&](std::span<const LogRow> rows) {
    for (const LogRow& row : rows)
      numbers[row.log] = std::stoll(std::string(row.region.substr(7)));
  });
  std::size_t right = 0;
  engine->scalars("a", [&](std::span<const ScalarValue> rows) {
    for (const ScalarValue& row : rows)
      right += numbers.at(row.log) == row.value ? 1U : 0U;
  });
  EXPECT_EQ(right, 16'500u);
}

TEST_P(EngineContract, PassesOnWhatAVisitorThrows) {
  const auto engine = open();
  engine->append(fullRecords(1500));
  const auto fail = [](auto) { throw std::runtime_error("enough"); };
  EXPECT_THROW(engine->scalars("a", fail), std::runtime_error);
  EXPECT_THROW(engine->cells("a", fail), std::runtime_error);
  int calls = 0;
  const auto end = [&](auto) {
    ++calls;
    throw EnoughRows();
  };
  engine->logs(0, INT32_MAX, end);
  engine->scalars("a", end);
  engine->distributions("a", end);
  engine->cells("a", end);
  EXPECT_EQ(calls, 4) << "none was called again";
  EXPECT_EQ(engine->append(fullRecords(1, 1500)).added, 1u);
  EXPECT_EQ(rowsIn(*engine).size(), 10507u);
}

TEST_P(EngineContract, LetsTwoLoadersAppendTheSameLogs) {
  const std::vector<LogRecord> records = fullRecords(240);
  std::array<std::size_t, 2> added{};
  {
    std::array<std::jthread, 2> loaders;
    for (std::size_t loader = 0; loader < 2; ++loader) {
      loaders[loader] = std::jthread([&, loader] {
        const auto engine = open();
        for (std::size_t portion = 0; portion < 24; ++portion)
          added[loader] += engine->append(std::span(records).subspan(portion * 10, 10)).added;
      });
    }
  }
  EXPECT_GE(added[0] + added[1], 240u);
  const auto engine = openOther();
  engine->append(records);
  EXPECT_EQ(rowsIn(*open()), rowsIn(*engine));
}

}  // namespace
}  // namespace tavrel::fleet
