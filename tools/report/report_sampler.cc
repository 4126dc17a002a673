#include "tools/report/report_sampler.h"

#include <optional>
#include <string>

#include "base/format.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/recorded/recorded_registry.h"
#include "platform/linux/recorded/recording_folder.h"
#include "tools/report/report_failure.h"

namespace tavrel {
namespace {

std::string whyNoChannels(const DeviceRoot& root, const ReportSelection& selection) {
  if (selection.isEmpty()) {
    return format("no channels: recordings of drivers belong in %s", root.path(kRecordingFolder));
  }
  const std::string proc = root.path("/proc");
  if (selection.live && !FileSystem::status(proc)) {
    return format("no live channels: %s is missing: link /proc and /sys into the device root",
                  proc);
  }
  return "no channel matches: 'tavrelctl report list' shows all";
}

}  // namespace

Expected<plist::Dictionary> selectedChannels(ToolContext& context, NotingPlatform& noting,
                                             const ReportSelection& selection) {
  auto channels = selectChannels(noting.platform(), selection);
  if (noting.hasErrors()) context.setExitStatus(kExitFailure);
  // If a driver's channels cannot be read, the notes so far contain only the library's text.
  if (channels && noting.hasPrinted()) {
    context.note(
        "these drivers are left out: 'tavrelctl registry show ID' shows what they publish");
  }
  if (channels && selection.live != selection.recorded) {
    keepOrigin(*channels, selection, context.linuxPlatform().registry().liveServices());
  }
  return channels;
}

Sampler::Sampler(ToolContext& context, const ReportSelection& selection, NoChannels noChannels)
    : context_(context), noting_(context) {
  const auto selected = selectedChannels(context, noting_, selection);
  if (!selected) {
    context.fail(selected.error().message);
    return;
  }
  if (IOReportGetChannelCount(*selected) == 0) {
    if (noChannels == NoChannels::AreFine) return;
    context.fail(whyNoChannels(context.root(), selection));
    return;
  }
  std::optional<ErrorObject> error;
  subscription_ = IOReportCreateSubscription(noting_.platform().drivers, nullptr, *selected,
                                             &subscribed_, 0, &error);
  if (subscription_) return;
  const bool isHubMissing = error && error->code == kKernelNotFound && !reasonOf(error);
  std::string advice(kLookAtDrivers);
  if (isHubMissing) {
    advice = format("there is no hub: a recording in %s must have a \"Hub\"", kRecordingFolder);
  }
  context.fail(reportFailure("subscribe to the channels", error, advice));
}

plist::Dictionary Sampler::sample() {
  std::optional<ErrorObject> error;
  auto samples = IOReportCreateSamples(subscription_.get(), subscribed_, &error);
  if (!samples) context_.fail(reportFailure("sample the channels", error));
  return samples;
}

std::int32_t Sampler::missing(const plist::Dictionary& samples) const {
  return IOReportGetChannelCount(subscribed_) - IOReportGetChannelCount(samples);
}

const char* Sampler::reasonForMissing() const {
  const bool isAnyLive = !context_.linuxPlatform().registry().liveServices().empty();
  return isAnyLive ? "their devices do not report them now, or the hub does not know them"
                   : "the recording has none at this point, or the hub does not know them";
}

}  // namespace tavrel
