#include "platform/linux/recording.h"

#include <utility>

#include "base/format.h"
#include "platform/linux/recorded_fields.h"

namespace tavrel {
namespace {

// The hub of all parts without its channels: what an earlier part says goes before a later one. An
// empty handle when no part has a hub.
plist::Dictionary mergedHub(std::span<const RecordingPart> parts) {
  plist::Dictionary merged;
  for (const RecordingPart& part : parts) {
    const plist::Dictionary hub = part.content.dictionary("Hub");
    if (hub && !merged) merged = plist::Dictionary::create(hub.size());
    for (const plist::Entry& entry : hub) {
      const std::string_view key = entry.key;
      if (key == "Channels") continue;
      if (!merged.contains(entry.key)) {
        const plist::Dictionary inner = entry.value.dictionary();
        merged.set(entry.key, inner ? plist::Value(plist::mutableCopy(inner)) : entry.value);
      } else if (plist::Dictionary errors = merged.dictionary(key);
                 key == "MethodErrors" && errors) {
        for (const plist::Entry& error : entry.value.dictionary()) {
          if (!errors.contains(error.key)) errors.set(error.key, error.value);
        }
      }
    }
  }
  return merged;
}

}  // namespace

Recording::Recording(std::span<const RecordingPart> parts, SystemLog& log) {
  RefusalLog refusals(log);
  for (const RecordingPart& part : parts) {
    std::size_t index = 0;
    for (const plist::Value& value : part.content.array("Services")) {
      const plist::Dictionary record = value.dictionary();
      const auto className = record.string("Class");
      if (!className || *className == kReportHubClass) {
        refusals.write(format("%s: service %zu is left out: %s", part.origin, index,
                              className ? "its \"Class\" is the hub's; describe that in \"Hub\""
                                        : "it has no \"Class\"; name the class of the driver"));
      } else {
        add({record, std::string(*className), wordOf(record.get("EntryID"))}, part.origin,
            refusals);
      }
      ++index;
    }
    hubChannels_.add(part.content.dictionary("Hub").array("Channels"), part.origin, refusals);
  }
  if (const plist::Dictionary hub = mergedHub(parts)) {
    add({hub, std::string(kReportHubClass), wordOf(hub.get("EntryID")), true}, "the hub", refusals);
  }
}

void Recording::add(RecordedEntry entry, std::string_view origin, RefusalLog& refusals) {
  const std::size_t position = services_.size();
  if (entry.entryID && !byID_.emplace(*entry.entryID, position).second) {
    refusals.write(
        format("%s: entry id %llu of a %s is that of an earlier %s, which alone is found "
               "as a parent; give each service its own",
               origin, *entry.entryID, entry.className, serviceWithID(*entry.entryID)->className));
  }
  byClass_[entry.className].push_back(position);
  services_.push_back(std::move(entry));
}

std::span<const std::size_t> Recording::servicesOfClass(std::string_view className) const {
  const auto at = byClass_.find(std::string(className));
  if (at == byClass_.end()) return {};
  return at->second;
}

const RecordedEntry* Recording::serviceWithID(std::uint64_t entryID) const {
  const auto at = byID_.find(entryID);
  return at == byID_.end() ? nullptr : &services_[at->second];
}

plist::Dictionary mergedRecording(std::span<const RecordingPart> parts) {
  plist::Array services = plist::Array::create();
  plist::Array channels = plist::Array::create();
  for (const RecordingPart& part : parts) {
    for (const plist::Value& service : part.content.array("Services"))
      services.append(service);
    for (const plist::Value& channel : part.content.dictionary("Hub").array("Channels"))
      channels.append(channel);
  }
  plist::Dictionary merged{{"Generation", generationOf(parts)}, {"Services", services}};
  if (plist::Dictionary hub = mergedHub(parts)) {
    hub.set("Channels", channels);
    merged.set("Hub", hub);
  }
  return merged;
}

std::uint64_t generationOf(std::span<const RecordingPart> parts) {
  std::uint64_t sum = 0;
  for (const RecordingPart& part : parts)
    sum += wordOf(part.content.get("Generation")).value_or(0);
  return sum;
}

}  // namespace tavrel
