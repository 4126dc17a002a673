// A platform that changes nothing: reads pass through to the device, writes stay in memory.
//
// It lets the daemon's own code show what a run would do:
//
//   OverlayPlatform overlay(context.linuxPlatform());
//   BHReport(overlay.platform()).writeLogForYesterday(day, {});
//   for (const CapturedLog& log : overlay.logs()) ...
//
// The platform below must outlive it.
#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/platform.h"
#include "tools/overlay/captured_log.h"
#include "tools/overlay/overlay_events.h"

namespace tavrel {

class LinuxPlatform;

class OverlayPlatform {
 public:
  explicit OverlayPlatform(LinuxPlatform& below);
  ~OverlayPlatform();
  OverlayPlatform(const OverlayPlatform&) = delete;
  OverlayPlatform& operator=(const OverlayPlatform&) = delete;

  Platform& platform();

  /// Receives each read, change and message as it happens. The handler must not use the platform.
  void setEventHandler(OverlayEvents::Handler handler);
  /// Makes reads of the device's file at `path` return `content`.
  void replaceFile(std::string path, std::string content);

  const std::vector<CapturedLog>& logs() const;
  /// Which values that wait to be folded could not be read, for people.
  const std::vector<std::string>& missingValues() const;
  /// The last entry at error level; empty when there was none.
  std::string_view lastError() const;

 private:
  struct Services;
  std::unique_ptr<Services> services_;
};

}  // namespace tavrel
