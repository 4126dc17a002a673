// Samples the machine: reads it again and again, and keeps what each reading and the previous one
// say as values of statistics.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"
#include "platform/system_log.h"
#include "tools/shared/tool_context.h"
#include "tools/stat/collect_sources.h"
#include "tools/stat/collect_state.h"
#include "tools/stat/machine_statistics.h"
#include "tools/stat/value_recorder.h"

namespace tavrel {

class Collector {
 public:
  /// One in `readingsPerCount` readings counts the processes.
  Collector(ToolContext& context, ValueRecorder& recorder, std::uint64_t readingsPerCount)
      : log_(context),
        sources_(context.root(), log_),
        recorder_(recorder),
        readingsPerCount_(readingsPerCount) {}

  /// The reading from which the next one continues.
  void startFrom(std::optional<CollectState> last) { last_ = std::move(last); }
  /// The values of the reading wait until `keep`.
  void read(std::chrono::nanoseconds at, ValueTime time);

  bool hasWaiting() const { return waiting_ > 0; }
  /// The earliest day to which values belong that wait; there must be some.
  std::int32_t firstDay() const { return values_.front().time.day; }
  bool isInMemory() const { return recorder_.isInMemory(); }
  /// Whether it is time to keep the values.
  bool isFull() const { return isInMemory() || waiting_ >= kReadingsPerTransaction; }

  /// After a failure the values still wait, unless memory has taken them.
  Status keep();

  /// The last reading; there must have been one.
  const CollectState& state() const { return *last_; }
  /// The reading before those that wait, if there was one.
  const std::optional<CollectState>& stateBefore() const { return before_; }
  std::uint64_t count() const { return count_; }

  /// Statistics that no reading has provided so far, each preceded by a blank.
  std::string missing() const;

 private:
  static constexpr std::size_t kReadingsPerTransaction = 60;

  class NotingLog final : public SystemLog {
   public:
    explicit NotingLog(ToolContext& context) : context_(context) {}
    void write(LogLevel, std::string_view message) override { context_.note(message); }

   private:
    ToolContext& context_;
  };

  struct TimedValue {
    ValueTime time;
    const MachineStatistic* statistic;
    double value;
  };

  Status keepValue(const TimedValue& given);

  NotingLog log_;
  MachineSources sources_;
  ValueRecorder& recorder_;
  const std::uint64_t readingsPerCount_;
  std::optional<CollectState> last_;
  std::optional<CollectState> before_;
  std::vector<TimedValue> values_;
  std::size_t waiting_ = 0;  // readings
  std::uint64_t count_ = 0;
  std::set<std::string_view> provided_;  // keys
};

}  // namespace tavrel
