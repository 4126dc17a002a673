#include "fleet/engine/clickhouse/clickhouse_engine.h"

#include "fleet/engine/clickhouse/clickhouse_appending.h"
#include "fleet/engine/clickhouse/clickhouse_reading.h"
#include "fleet/engine/clickhouse/clickhouse_schema.h"
#include "fleet/engine/clickhouse/server.h"

namespace tavrel::fleet {
namespace {

class ClickhouseEngine final : public Engine {
 public:
  ClickhouseEngine(const ServerAddress& address, OpenMode mode) : server_(address) {
    openTables(server_, mode);
  }

  Appended append(std::span<const LogRecord> records) override {
    return appending_.append(records);
  }
  void logs(std::int32_t firstDay, std::int32_t lastDay, const Visitor<LogRow>& visit) override {
    reading_.logs(firstDay, lastDay, visit);
  }
  std::vector<Key> keys() override { return reading_.keys(); }
  void scalars(std::string_view key, const Visitor<ScalarValue>& visit) override {
    reading_.scalars(key, visit);
  }
  void distributions(std::string_view key, const Visitor<DistributionValue>& visit) override {
    reading_.distributions(key, visit);
  }
  void cells(std::string_view key, const Visitor<CellValue>& visit) override {
    reading_.cells(key, visit);
  }

  std::unique_ptr<Engine> reader() override {
    return std::make_unique<ClickhouseEngine>(server_.address(), OpenMode::Read);
  }

 private:
  Server server_;
  ClickhouseReading reading_{server_};
  ClickhouseAppending appending_{server_};
};

}  // namespace

std::unique_ptr<Engine> openClickhouseEngine(std::string_view address, OpenMode mode) {
  return std::make_unique<ClickhouseEngine>(readServerAddress(address), mode);
}

}  // namespace tavrel::fleet
