// The folders of submitted logs, for the program that empties them.
#pragma once

#include <compare>
#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/logs/log_folder.h"

namespace tavrel::upload {

struct WaitingLog {
  std::int64_t filed;  // seconds since 1970, UTC
  std::string name;    // of its file, without the extension

  auto operator<=>(const WaitingLog&) const = default;
};

class Outbox {
 public:
  Outbox(const DeviceRoot& root, FileSystem& files);

  /// The folder that contains all the others.
  const std::string& folder() const { return folder_; }
  std::string logPath(std::string_view name) const { return outbox_.logPath(name); }
  std::string metadataPath(std::string_view name) const { return outbox_.metadataPath(name); }

  /// The logs in the outbox, oldest first. Opens no file. Removes metadata without its log.
  Expected<std::vector<WaitingLog>> logs();

  /// Moves waiting logs from pending/ to the outbox as long as `mayMove` returns true; it is called
  /// for each log at a time when nobody else can move that log. A log that cannot be moved does not
  /// stop the others; the first failure is returned.
  Status takePending(const std::function<bool()>& mayMove);

  /// Removes a log from the outbox. It may already be gone.
  Status remove(const std::string& name);

  /// Moves a log from the outbox to refused/, which keeps the newest `limits::kRefusedLogs` logs of
  /// at most `limits::kRefusedBytes` in total, and this log in any case.
  Status refuse(const std::string& name, std::int64_t today);

  /// Removes all waiting logs, also those in pending/.
  RemovedLogs removeAll();

 private:
  std::string folder_;
  FileSystem& files_;
  LogFolder pending_;
  LogFolder outbox_;
  LogFolder refused_;
};

}  // namespace tavrel::upload
