#include "platform/linux/recorded/recording.h"

#include <algorithm>
#include <utility>

#include "base/format.h"
#include "platform/linux/recorded/typed_fields.h"
#include "platform/report_protocol.h"

namespace tavrel {
namespace {

using Form = RecordedField::Form;

constexpr RecordedField kPartFields[] = {
    {"Services", Form::Array}, {"Hub", Form::Dictionary}, {"Generation", Form::Integer}};
constexpr RecordedField kServiceFields[] = {
    {"Name", Form::String},          {"EntryID", Form::Integer},   {"RetainCount", Form::Integer},
    {"Parents", Form::Dictionary},   {"Methods", Form::Array},     {"Properties", Form::Dictionary},
    {"NameError", Form::Integer},    {"OpenError", Form::Integer}, {"CloseError", Form::Integer},
    {"EntryIDError", Form::Integer},
};
constexpr RecordedField kHubFields[] = {
    {"Channels", Form::Array}, {"MethodErrors", Form::Dictionary}, {"MapError", Form::Integer}};
constexpr RecordedField kRowFields[] = {
    {"Method", Form::Integer}, {"Request", Form::Data},     {"Selector", Form::Integer},
    {"Flags", Form::Integer},  {"Error", Form::Integer},    {"OutputLength", Form::Integer},
    {"Output", Form::Data},    {"Scalars", Form::Integers},
};

std::string faultOfService(const plist::Dictionary& record) {
  const auto className = record.string("Class");
  if (!className) return "it has no \"Class\"; name the class of the driver";
  if (*className == kReportHubClass) {
    return "its \"Class\" is the hub's; describe that in \"Hub\"";
  }
  return faultOf(kServiceFields, record);
}

// The playable rows of the service; `service` is its index in its part, for messages.
std::vector<plist::Dictionary> rowsOf(const plist::Dictionary& record, std::string_view origin,
                                      std::size_t service, RefusalLog& refusals) {
  std::vector<plist::Dictionary> rows;
  std::size_t index = 0;
  for (const plist::Value& value : record.array("Methods")) {
    const plist::Dictionary row = value.dictionary();
    const std::string fault = row.contains("Method")
                                  ? faultOf(kRowFields, row)
                                  : "it has no \"Method\"; give the number of the method";
    if (fault.empty()) {
      rows.push_back(row);
    } else {
      refusals.write(format("%s: row %zu of the \"Methods\" of service %zu is left out: %s", origin,
                            index, service, fault));
    }
    ++index;
  }
  return rows;
}

// Adds the fields that earlier parts lack.
void mergeHub(plist::Dictionary& merged, const RecordingPart& part, RefusalLog* refusals) {
  const auto isRefused = [&](std::string_view key, const char* where, const char* wanted) {
    if (wanted && refusals) {
      refusals->write(format("%s: \"%s\" of the %s is left out: it must be %s", part.origin, key,
                             where, wanted));
    }
    return wanted != nullptr;
  };
  for (const plist::Entry& entry : part.content.dictionary("Hub")) {
    const std::string_view key = entry.key;
    const char* wanted = missedForm(kServiceFields, entry);
    if (!wanted) wanted = missedForm(kHubFields, entry);
    if (isRefused(key, "hub", wanted) || key == "Channels") continue;
    if (key != "MethodErrors") {
      if (!merged.contains(key)) merged.set(entry.key, entry.value);
      continue;
    }
    plist::Dictionary errors = merged.dictionary(key);
    if (!errors) merged.set(entry.key, errors = plist::Dictionary::create());
    for (const plist::Entry& error : entry.value.dictionary()) {
      const char* const wantedCode = wordOf(error.value) ? nullptr : "an integer";
      if (isRefused(error.key, "hub's \"MethodErrors\"", wantedCode)) continue;
      if (!errors.contains(error.key)) errors.set(error.key, error.value);
    }
  }
}

// The hub of all parts without its channels. An empty handle when no part has a hub.
plist::Dictionary mergedHub(std::span<const RecordingPart> parts, RefusalLog* refusals) {
  plist::Dictionary merged;
  for (const RecordingPart& part : parts) {
    if (!part.content.dictionary("Hub")) continue;
    if (!merged) merged = plist::Dictionary::create();
    mergeHub(merged, part, refusals);
  }
  return merged;
}

}  // namespace

Recording::Recording(std::span<const RecordingPart> parts, LiveServices* live, SystemLog& log)
    : live_(live) {
  RefusalLog refusals(log);
  for (const RecordingPart& part : parts) {
    for (const plist::Entry& entry : part.content) {
      if (const char* const wanted = missedForm(kPartFields, entry)) {
        refusals.write(
            format("%s: \"%s\" is left out: it must be %s", part.origin, entry.key, wanted));
      }
    }
    std::size_t index = 0;
    for (const plist::Value& value : part.content.array("Services")) {
      const plist::Dictionary record = value.dictionary();
      if (const std::string fault = faultOfService(record); !fault.empty()) {
        refusals.write(format("%s: service %zu is left out: %s", part.origin, index, fault));
      } else {
        add({record, std::string(*record.string("Class")), wordOf(record.get("EntryID")),
             rowsOf(record, part.origin, index, refusals)},
            part.origin, refusals);
      }
      ++index;
    }
    hubChannels_.add(part.content.dictionary("Hub").array("Channels"), part.origin, refusals);
  }
  const bool isAnyLive = live && addLive(refusals);
  plist::Dictionary hub = mergedHub(parts, &refusals);
  if (!hub && isAnyLive) hub = plist::Dictionary{{"EntryID", kLiveHubID}};
  if (hub) {
    add({hub, std::string(kReportHubClass), wordOf(hub.get("EntryID")), {}, true}, "the hub",
        refusals);
  }
}

bool Recording::addLive(RefusalLog& refusals) {
  bool isAny = false;
  const auto nameOf = [](const plist::Dictionary& record) {
    return record.string("Name").value_or(*record.string("Class"));
  };
  for (const plist::Value& value : live_->services()) {
    const plist::Dictionary record = value.dictionary();
    const std::string className(*record.string("Class"));
    const auto recorded = servicesOfClass(className);
    const bool isReplaced = std::any_of(recorded.begin(), recorded.end(), [&](std::size_t at) {
      return nameOf(services_[at].record) == nameOf(record);
    });
    if (isReplaced) continue;
    add({record, className, wordOf(record.get("EntryID")), {}, false, true}, "live", refusals);
    isAny = true;
  }
  return isAny;
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
  if (plist::Dictionary hub = mergedHub(parts, nullptr)) {
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
