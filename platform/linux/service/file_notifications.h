// Notifications as counters that any process can watch.
//
// "/run/tavrel/notifications/NAME" below the device root holds, as a decimal number and a line end,
// how often NAME was posted since the machine started. Each post renames a new file over it, so a
// reader never sees half a number; watch the folder:
//
//   inotifywait -e moved_to /run/tavrel/notifications
//
// Posters take turns by locking ".lock" in the folder. When a counter cannot be read, the next post
// logs that and replaces it with the microseconds since 1970, a number that no waiting process has
// seen.
#pragma once

#include <chrono>
#include <cstdint>
#include <string>
#include <string_view>

#include "base/expected.h"
#include "platform/linux/files/device_root.h"
#include "platform/notifications.h"
#include "platform/system_log.h"

namespace tavrel {

class FileNotifications final : public Notifications {
 public:
  FileNotifications(const DeviceRoot& root, SystemLog& log);

  /// A failure is logged.
  void post(std::string_view name) override;

  /// The count after posting.
  Expected<std::uint64_t> tryPost(std::string_view name);

  /// How often `name` was posted; 0 when never.
  Expected<std::uint64_t> count(std::string_view name) const;

  /// Waits until the count differs from `seen` and returns it; nothing when the time is up. A
  /// counter that is removed meanwhile is no difference; its first post is one.
  Expected<std::optional<std::uint64_t>> waitBeyond(std::string_view name, std::uint64_t seen,
                                                    std::chrono::milliseconds longest) const;

 private:
  Expected<std::string> pathOf(std::string_view name) const;

  std::string folder_;
  SystemLog& log_;
};

}  // namespace tavrel
