// The folders of submitted logs, for the program that empties them.
//
// A log is removed before its metadata, so that every log that can be seen has its metadata.
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
  std::string name;    // of its file, without the extension
};

class Outbox {
 public:
  Outbox(const DeviceRoot& root, FileSystem& files);

  /// The folder that contains all the others.
  const std::string& folder() const { return folder_; }
  std::string logPath(std::string_view name) const;
  std::string metadataPath(std::string_view name) const;

  /// The logs in the outbox, oldest first. Opens no file. Removes metadata whose log is gone.
  Expected<std::vector<WaitingLog>> logs();

  /// Moves waiting logs from pending/ to the outbox as long as `mayMove` returns true; it is called
  /// for each log at a time when nobody else can move that log. A log that cannot be moved does not
  /// stop the others; the first failure is returned.
  Status takePending(const std::function<bool()>& mayMove);

  /// Removes a log from the outbox. It may already be gone.
  Status remove(std::string_view name);

  /// Moves a log from the outbox to refused/, which keeps the newest `limits::kRefusedLogs` logs of
  /// at most `limits::kRefusedBytes` in total.
  Status refuse(std::string_view name);

  /// Removes all waiting logs, also those in pending/, and adds their number to `count`. A log that
  /// cannot be removed does not stop the others; the first failure is returned.
  Status removeAll(std::size_t& count);

 private:
  std::string path(std::string_view place, std::string_view name, std::string_view ending) const;
  Expected<std::vector<WaitingLog>> logsIn(std::string_view place,
                                           std::vector<std::string>& orphans);
  /// The caller must hold the folder's lock.
  Status move(std::string_view name, std::string_view from, std::string_view to);
  Status removeFrom(std::string_view place, std::string_view name);
  Status boundRefused();

  std::string folder_;
  FileSystem& files_;
};

}  // namespace tavrel::upload
