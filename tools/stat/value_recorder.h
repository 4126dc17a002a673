// Records today's values: in memory through libbrimhold, which any user may do and which writes
// nothing to flash, or in the store when the device has no folder for that.
//
//   auto recorder = openRecorder(context);
//   if (!recorder) return context.fail(recorder.error().message);
//   Status done = (*recorder)->add(valueTimeNow(), "com.example.starts", 1);
//   if (done) done = (*recorder)->keep();
#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <string>

#include "base/expected.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

/// When a value was measured. Recording in memory ignores this and reads the same clock itself.
struct ValueTime {
  std::int32_t day;
  std::uint32_t secondsInDay;
};
ValueTime valueTimeAt(std::chrono::system_clock::time_point time);
ValueTime valueTimeNow();

class ValueRecorder {
 public:
  virtual ~ValueRecorder() = default;
  /// These three fail when the user may not record the key, the store cannot be written,
  /// or a sum exceeds 64 bits. Then the store keeps nothing that was given since the last `keep`.
  virtual Status set(ValueTime time, const std::string& key, std::int64_t value) = 0;
  virtual Status add(ValueTime time, const std::string& key, std::int64_t amount) = 0;
  virtual Status append(ValueTime time, const std::string& key, double value) = 0;
  /// In the store, commits what was given since the last call in one transaction. In
  /// memory, where each value is kept at once, fails when the process's file was removed or is
  /// full, so that values were lost.
  virtual Status keep() = 0;
  virtual bool isInMemory() const = 0;
};

/// The context must outlive the recorder. libbrimhold looks up its folder only once, so a process
/// records for one device. Fails when libbrimhold cannot record in the folder: the user may not
/// create files there, memory or a limit is exhausted, the kernel is too old, or the system failed.
Expected<std::unique_ptr<ValueRecorder>> openRecorder(ToolContext& context);

/// What is wrong with a key; nothing when it can be recorded and exported.
std::string keyFault(const std::string& key);

}  // namespace tavrel
