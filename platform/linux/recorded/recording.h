// The content of a registry's recordings, merged and indexed: services by entry ID and by class,
// and the channels of the hub. docs/registry.md describes the format.
//
// The dictionaries of a recording are shared with it, not copied. An entry that cannot be played is
// left out, with a line in the system log. In the hub, only the malformed field is left out.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "base/keyed_hash.h"
#include "base/plist.h"
#include "platform/linux/recorded/hub_channels.h"
#include "platform/linux/recorded/live_services.h"
#include "platform/linux/system_log/refusal_log.h"

namespace tavrel {

/// One recorded document and its name in messages, such as its path.
struct RecordingPart {
  std::string origin;
  plist::Dictionary content;
};

/// Entry ID of the hub made for live services when no recording has a hub.
inline constexpr std::int64_t kLiveHubID = 0x4c69'7665'4875'62;

struct RecordedEntry {
  plist::Dictionary record;
  std::string className;
  std::optional<std::uint64_t> entryID;
  std::vector<plist::Dictionary> rows = {};  // of its "Methods"
  bool isHub = false;
  bool isLive = false;
};

class Recording {
 public:
  /// Live services, if any, follow the recorded ones; they must outlive the recording. A recorded
  /// service with the class and name of a live one replaces it.
  Recording(std::span<const RecordingPart> parts, LiveServices* live, SystemLog& log);

  const std::vector<RecordedEntry>& services() const { return services_; }
  /// Indices into `services`, ascending.
  std::span<const std::size_t> servicesOfClass(std::string_view className) const;
  /// The first service with that entry ID; null when there is none.
  const RecordedEntry* serviceWithID(std::uint64_t entryID) const;
  const HubChannels& hubChannels() const { return hubChannels_; }
  /// Null when there are none.
  LiveServices* live() const { return live_; }

 private:
  void add(RecordedEntry entry, std::string_view origin, RefusalLog& refusals);
  bool addLive(RefusalLog& refusals);

  std::vector<RecordedEntry> services_;
  std::unordered_map<std::uint64_t, std::size_t> byID_;
  std::unordered_map<std::string, std::vector<std::size_t>, KeyedHash> byClass_;
  HubChannels hubChannels_;
  LiveServices* const live_;
};

/// All parts merged into one recording that plays back the same.
plist::Dictionary mergedRecording(std::span<const RecordingPart> parts);

/// The sum of the parts' generations, in two's complement.
std::uint64_t generationOf(std::span<const RecordingPart> parts);

}  // namespace tavrel
