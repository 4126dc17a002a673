#include "tools/log/log_preview.h"

#include "platform/linux/linux_platform.h"
#include "report/bh_report.h"
#include "tools/log/log_conclusion.h"
#include "tools/overlay/overlay_platform.h"

namespace tavrel {

LogPreview previewLog(
    ToolContext& context, std::int32_t day,
    const std::function<void(std::string_view level, std::string_view message)>& onLine) {
  OverlayPlatform overlay(context.linuxPlatform());
  LogPreview preview;
  overlay.setEventHandler([&](const OverlayEvent& event) {
    if (event.kind != OverlayEvent::Kind::LogLine) return;
    const std::string_view message = *event.value.string();
    if (onLine) onLine(event.subject, message);
    // What the daemon says of a histogram that it leaves out is no error for it.
    const bool isFault =
        event.subject == "error" || message.starts_with("Couldn't allocate histCounts");
    if (isFault) preview.errors.emplace_back(message);
  });
  preview.osVersion = overlay.platform().submission->ZTXOSVersion();
  const LogOutcome outcome = BHReport(overlay.platform()).writeLogForYesterday(day, {});
  if (!overlay.logs().empty()) {
    preview.log = overlay.logs().back();
    return preview;
  }
  preview.reason = overlay.lastError();
  if (preview.reason.empty()) preview.reason = whyNoLog(outcome);
  if (!preview.errors.empty()) preview.errors.pop_back();
  preview.lacksWhitelist = outcome == LogOutcome::NoWhitelist;
  if (preview.lacksWhitelist) {
    // The daemon's own lines lack the place, or what to do.
    std::erase(preview.errors, "Couldn't load whitelist");
    preview.reason = whitelistState(context).fault;
  }
  return preview;
}

}  // namespace tavrel
