#include "tools/report/live_recording.h"

#include <algorithm>
#include <chrono>

#include "base/format.h"
#include "base/limits.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/recorded/recorded_registry.h"
#include "platform/linux/recorded/recording.h"
#include "platform/plist/xml.h"
#include "tools/console/end_signals.h"
#include "tools/console/table.h"
#include "tools/report/playback.h"
#include "tools/report/report_sampler.h"

namespace tavrel {

plist::Dictionary recordLive(ToolContext& context, std::uint32_t seconds) {
  ReportSelection selection;
  selection.live = true;
  Sampler sampler(context, selection);
  if (!sampler) return {};
  const plist::Array services = context.linuxPlatform().registry().liveServices();
  const auto servicesText = plist::writeXml(services);
  if (!servicesText) {
    context.fail(format("cannot record the live services: %s",
                        std::string_view(servicesText.error().message)));
    return {};
  }
  // Deeper indentation in the document at most doubles it.
  Playback playback(limits::kPropertyListBytes -
                    std::min(limits::kPropertyListBytes, 2 * servicesText->size()));
  EndSignals signals;
  const auto begun = std::chrono::steady_clock::now();
  for (std::uint32_t second = 0;;) {
    const plist::Dictionary samples = sampler.sample();
    if (!samples) return {};
    if (!playback.add(channelsIn(samples))) {
      context.note(format("ended after %s: a recording has at most %zu MiB",
                          counted(playback.samples(), "sample"), limits::kPropertyListBytes >> 20));
      break;
    }
    if (second == seconds) break;
    if (signals.arriveBefore(begun + std::chrono::seconds(++second))) {
      context.note(format("ended by a signal before %u seconds were over", seconds));
      break;
    }
  }
  return {{"Services", services},
          {"Hub", plist::Dictionary{{"EntryID", kLiveHubID}, {"Channels", playback.channels()}}}};
}

}  // namespace tavrel
