#include "tools/report/live_recording.h"

#include <chrono>
#include <map>
#include <thread>
#include <utility>

#include "ioreport/ioreport.h"
#include "ioreport/keys.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/recorded/recorded_registry.h"
#include "platform/linux/recorded/recording.h"
#include "tools/report/report_sampler.h"

namespace tavrel {

plist::Dictionary recordLive(ToolContext& context, std::uint32_t seconds) {
  ReportSelection selection;
  selection.live = true;
  Sampler sampler(context, selection);
  if (!sampler) return {};
  using Key = std::pair<std::int64_t, std::int64_t>;  // driver and channel
  std::map<Key, plist::Array> sequences;
  const auto begun = std::chrono::steady_clock::now();
  for (std::uint32_t second = 0; second <= seconds; ++second) {
    std::this_thread::sleep_until(begun + std::chrono::seconds(second));
    const plist::Dictionary samples = sampler.sample();
    if (!samples) return {};
    for (const plist::Dictionary& channel : channelsIn(samples)) {
      plist::Array& groups =
          sequences[{IOReportChannelGetDriverID(channel), IOReportChannelGetChannelID(channel)}];
      // Empty data stands for the samples in which the channel was absent.
      while (groups.size() < second)
        groups.append(plist::Data(ByteSpan()));
      groups.append(channel.data(kRawElementsKey));
    }
  }
  plist::Array channels = plist::Array::create(sequences.size());
  for (auto& [key, groups] : sequences) {
    while (groups.size() <= seconds)
      groups.append(plist::Data(ByteSpan()));
    channels.append(
        plist::Dictionary{{"DriverID", key.first},
                          {"ChannelID", key.second},
                          {"Elements", groups.size() == 1 ? groups.at(0) : plist::Value(groups)}});
  }
  return {{"Services", context.linuxPlatform().registry().liveServices()},
          {"Hub", plist::Dictionary{{"EntryID", kLiveHubID}, {"Channels", channels}}}};
}

}  // namespace tavrel
