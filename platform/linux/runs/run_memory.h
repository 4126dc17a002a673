// A log that remembers, for who asks later, which day's tasks a run did and what it could not do.
//
//   RunMemory memory(root, clock, systemLog, "daily");
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

#include <string>
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
  RunMemory(DeviceRoot root, Clock& clock, SystemLog& log, std::string_view task);

  /// Passes the entry on. Errors are kept; the line with which the tasks of a day begin writes the
  /// record.
  void write(LogLevel level, std::string_view message) override;

  /// The run has come to its end, whatever it could not do.
  void finish();

 private:
  void begin(std::int64_t day);
  void save();

  DeviceRoot root_;
  Clock& clock_;
  SystemLog& log_;
  FileSystem files_;
  LastRun run_;
  bool isEarlierKnown_ = false;  // what the record of the earlier run has that this one keeps
};

}  // namespace tavrel
