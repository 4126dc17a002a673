// Takes single readings of the machine. Each continues from the previous one, which a file holds
// between processes.
//
//   SingleReadings readings(context, recorder, stateFile);
//   Status done = readings.take(now, time);
//   if (done) done = readings.keep();
#pragma once

#include <chrono>
#include <string>

#include "base/expected.h"
#include "platform/linux/files/descriptor.h"
#include "tools/shared/tool_context.h"
#include "tools/stat/collector.h"
#include "tools/stat/value_recorder.h"

namespace tavrel {

class SingleReadings {
 public:
  /// An empty `stateFile` stands for the device's own.
  SingleReadings(ToolContext& context, ValueRecorder& recorder, const std::string& stateFile);

  /// Fails when readings of another process wait.
  Status take(std::chrono::nanoseconds now, ValueTime time);

  /// Whether values for the store may wait for a next reading at `next`: fewer transactions are
  /// less wear. They do not wait into the next day, whose first run reports them.
  bool mayWait(std::chrono::nanoseconds next, ValueTime nextTime) const;

  /// Fails when the state cannot be left to the next process.
  Status keep();
  /// Keeps the values even then.
  Status keepAtEnd();
  /// As `keepAtEnd`, but values that the store does not take wait for the next reading, up to an
  /// hour longer than others.
  Status keepOrWait(std::chrono::nanoseconds now);

 private:
  Status lock();
  /// `withoutState`: what follows when the state cannot be written; null when nothing is kept then.
  Status keep(const char* withoutState);
  void restoreState() const;
  bool removeState() const;
  void startFromState(std::chrono::nanoseconds now);

  ToolContext& context_;
  const std::string path_;
  const std::string boot_;
  Collector collector_;
  Descriptor lock_;
  std::chrono::nanoseconds waitingSince_{};
  bool hasLostState_ = false;
  bool isHeldUp_ = false;  // by a store that takes no values
};

}  // namespace tavrel
