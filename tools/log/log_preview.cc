#include "tools/log/log_preview.h"

#include "platform/linux/linux_platform.h"
#include "report/bh_report.h"
#include "tools/log/log_conclusion.h"
#include "tools/overlay/overlay_platform.h"

namespace tavrel {
namespace {

// Says why there is no log, and takes what the daemon logged about that from the errors.
void explainAbsence(ToolContext& context, std::string_view lastError, LogOutcome outcome,
                    LogPreview& preview) {
  preview.lacksWhitelist = outcome == LogOutcome::NoWhitelist;
  if (preview.lacksWhitelist) {
    // The daemon's own lines do not say where the whitelist is, or what to do.
    preview.reason = whitelistState(context).fault;
    std::erase_if(preview.errors, [&](const std::string& error) {
      return error == "Couldn't load whitelist" || preview.reason.starts_with(error) ||
             error.starts_with("Couldn't parse the contents of the config file.");
    });
    return;
  }
  // What was logged while all could be read has not kept anything from the log.
  const bool isExplained = outcome != LogOutcome::NothingToReport && !lastError.empty();
  preview.reason = isExplained ? lastError : whyNoLog(outcome);
  std::erase(preview.errors, preview.reason);
}

}  // namespace

LogPreview previewLog(
    ToolContext& context, std::int32_t day,
    const std::function<void(std::string_view level, std::string_view message)>& onLine) {
  OverlayPlatform overlay(context.linuxPlatform());
  LogPreview preview;
  overlay.setEventHandler([&](const OverlayEvent& event) {
    if (event.kind != OverlayEvent::Kind::LogLine) return;
    const std::string_view message = *event.value.string();
    if (onLine) onLine(event.subject, message);
    // A left-out histogram is no error for the daemon, but makes the preview incomplete.
    const bool isFault = event.subject == "error" || message.starts_with(kHistogramLeftOut);
    if (isFault) preview.errors.emplace_back(message);
  });
  preview.osVersion = overlay.platform().submission->ZTXOSVersion();
  const LogOutcome outcome = BHReport(overlay.platform()).writeLogForYesterday(day, {});
  if (!overlay.logs().empty()) {
    preview.log = overlay.logs().back();
  } else {
    explainAbsence(context, overlay.lastError(), outcome, preview);
  }
  preview.missingValues = overlay.missingValues();
  return preview;
}

}  // namespace tavrel
