#include "fleet/engine/sqlite/sqlite_engine.h"

#include <optional>

#include "fleet/engine/sqlite/appending.h"
#include "fleet/engine/sqlite/connection.h"
#include "fleet/engine/sqlite/reading.h"
#include "fleet/engine/sqlite/schema.h"

namespace tavrel::fleet {
namespace {

template <class Read>
void untilEnough(const Read& read) {
  try {
    read();
  } catch (const EnoughRows&) {
    // The visitor has ended the reading.
  }
}

class SqliteEngine final : public Engine {
 public:
  SqliteEngine(const std::string& path, OpenMode mode)
      : connection_(openFile(path, mode)), reading_(connection_) {}

  Appended append(std::span<const LogRecord> records) override {
    if (!appending_) appending_.emplace(connection_);
    try {
      return appending_->append(records);
    } catch (...) {
      appending_.reset();
      throw;
    }
  }

  void logs(std::int32_t firstDay, std::int32_t lastDay, const Visitor<LogRow>& visit) override {
    untilEnough([&] { reading_.logs(firstDay, lastDay, visit); });
  }
  std::vector<Key> keys() override { return reading_.keys(); }
  void scalars(std::string_view key, const Visitor<ScalarValue>& visit) override {
    untilEnough([&] { reading_.scalars(key, visit); });
  }
  void distributions(std::string_view key, const Visitor<DistributionValue>& visit) override {
    untilEnough([&] { reading_.distributions(key, visit); });
  }
  void cells(std::string_view key, const Visitor<CellValue>& visit) override {
    untilEnough([&] { reading_.cells(key, visit); });
  }

  std::unique_ptr<Engine> reader() override {
    return std::make_unique<SqliteEngine>(connection_.path(), OpenMode::Read);
  }

 private:
  Connection connection_;
  Reading reading_;
  std::optional<Appending> appending_;
};

}  // namespace

std::unique_ptr<Engine> openSqliteEngine(const std::string& path, OpenMode mode) {
  return std::make_unique<SqliteEngine>(path, mode);
}

}  // namespace tavrel::fleet
