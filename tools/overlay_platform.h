// A platform that changes nothing: reads go through to the device, writes stay in memory.
//
// With it the daemon's own code shows what a run would do:
//
//   OverlayPlatform overlay(context.linuxPlatform());
//   BHReport(overlay.platform()).writeLogForYesterday(day, {});
//   for (const CapturedLog& log : overlay.logs()) ...
//
// The platform below must outlive it.
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/plist.h"
#include "platform/platform.h"

namespace tavrel {

class LinuxPlatform;

/// A log that was handed to the submission service.
struct CapturedLog {
  std::string type;
  std::string name;
  plist::Dictionary options;  // an empty handle for none
  std::string bytes;
};

/// An entry of the system log.
struct CapturedLine {
  LogLevel level;
  std::string message;
};

class OverlayPlatform {
 public:
  using LineHandler = std::function<void(const CapturedLine&)>;

  explicit OverlayPlatform(LinuxPlatform& below);
  ~OverlayPlatform();
  OverlayPlatform(const OverlayPlatform&) = delete;
  OverlayPlatform& operator=(const OverlayPlatform&) = delete;

  Platform& platform();

  /// Called for each entry of the system log as it is written.
  void setLineHandler(LineHandler handler);
  /// Makes `content` the content of the device's file at `path`.
  void replaceFile(std::string path, std::string content);

  const std::vector<CapturedLog>& logs() const;
  /// The last entry at error level, empty when there was none.
  std::string_view lastError() const;

 private:
  struct Services;
  std::unique_ptr<Services> services_;
};

}  // namespace tavrel
