// A log that records which day's tasks a run did and what failed, for later queries.
//
//   RunMemory memory(root, clock, systemLog, RunKind::Daily);
//   {
//     LinuxPlatform linuxPlatform(root, {.log = &memory});
//     ...
//   }
//   memory.finish();
//
// The record is written when the tasks of a day begin and when the run finishes. A run that is
// killed in between stays recorded as not finished. A run that found nothing to do, and had no
// error, writes nothing.
#pragma once

#include <string_view>

#include "platform/clock.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/runs/last_run.h"
#include "platform/system_log.h"

namespace tavrel {

class RunMemory final : public SystemLog {
 public:
  /// Clock and log must outlive it.
  RunMemory(DeviceRoot root, Clock& clock, SystemLog& log, std::optional<RunKind> kind);

  /// Passes the entry on. Keeps errors, and writes the record at the line with which a day's tasks
  /// begin.
  void write(LogLevel level, std::string_view message) override;

  /// Records that the run has reached its end, with or without errors.
  void finish();

 private:
  void begin(std::int64_t day);
  void save();

  DeviceRoot root_;
  Clock& clock_;
  SystemLog& log_;
  FileSystem files_;
  LastRun run_;
  bool isEarlierKnown_ = false;  // the earlier run's record has been read
};

}  // namespace tavrel
