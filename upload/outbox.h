// The folders of submitted logs, as the one who empties them sees them.
//
// A log leaves before its metadata, so that each log that can be seen has its metadata.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"

namespace tavrel::upload {

struct WaitingLog {
  std::int64_t filed;  // seconds since 1970, UTC
  std::string name;    // of its file, without the ending
};

class Outbox {
 public:
  Outbox(const DeviceRoot& root, FileSystem& files);

  /// The folder above all others.
  const std::string& folder() const { return folder_; }
  std::string logPath(std::string_view name) const;
  std::string metadataPath(std::string_view name) const;

  /// The logs of the outbox, oldest first. Opens no file. Removes metadata whose log is gone.
  Expected<std::vector<WaitingLog>> logs();

  /// Moves what waits in pending/ to the outbox, as long as `mayMove` says so, which is asked for
  /// each log while nobody else can move it. A log that cannot be moved does not keep others; the
  /// first failure is reported.
  Status takePending(const std::function<bool()>& mayMove);

  /// Removes a log of the outbox. One that is gone already is fine.
  Status remove(std::string_view name);

  /// Moves a log of the outbox into refused/, where the newest `limits::kRefusedLogs` stay, of
  /// `limits::kRefusedBytes` together.
  Status refuse(std::string_view name);

  /// Removes all logs that wait, in pending/ too; yields how many.
  Expected<std::size_t> removeAll();

 private:
  std::string path(std::string_view place, std::string_view name, std::string_view ending) const;
  Expected<std::vector<WaitingLog>> logsIn(std::string_view place,
                                           std::vector<std::string>& orphans);
  /// The caller has the folder locked.
  Status move(std::string_view name, std::string_view from, std::string_view to);
  Status removeFrom(std::string_view place, std::string_view name);
  Status boundRefused();

  std::string folder_;
  FileSystem& files_;
};

}  // namespace tavrel::upload
