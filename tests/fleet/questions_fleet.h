// Fleets for tests of questions, in SQLite.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "fleet/engine/open/open_engine.h"
#include "tests/fleet/engine_records.h"
#include "tests/platform/temporary_root.h"

namespace tavrel::fleet {

class TestFleet {
 public:
  /// Adds a log, identified by the number of earlier logs; valid until the next one.
  LogRecord& add(std::int32_t day, std::string_view version, std::string_view region = "DE") {
    LogRecord& record = records_.emplace_back(makeRecord(records_.size(), day));
    record.osVersion = record.texts.keep(version);
    record.region = record.texts.keep(region);
    return record;
  }
  Engine& engine() {
    if (!records_.empty()) engine_->append(records_);
    records_.clear();
    return *engine_;
  }

 private:
  TemporaryRoot root_;
  std::unique_ptr<Engine> engine_ = openEngine(root_.root.path("/fleet.db"), OpenMode::kWrite);
  std::vector<LogRecord> records_;
};

}  // namespace tavrel::fleet
