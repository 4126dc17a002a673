#include "platform/linux/recorded/recorded_service.h"

#include <unordered_set>
#include <utility>
#include <vector>

#include "base/utf8.h"
#include "platform/linux/recorded/recorded_driver_client.h"
#include "platform/linux/recorded/report_hub.h"
#include "platform/linux/recorded/typed_fields.h"

namespace tavrel {
namespace {

constexpr std::size_t kLongestName = 127;  // characters

std::string_view firstCharacters(std::string_view text, std::size_t count) {
  std::string_view rest = text;
  while (!rest.empty() && count > 0) {
    takeCodePoint(rest);
    --count;
  }
  return text.substr(0, text.size() - rest.size());
}

}  // namespace

RecordedService::RecordedService(std::shared_ptr<const Recording> recording, std::size_t position,
                                 SystemLog& log)
    : recording_(std::move(recording)), entry_(recording_->services()[position]), log_(log) {}

KernelReturn RecordedService::entryID(std::uint64_t& id) {
  const KernelReturn error = returnCodeOf(entry_.record, "EntryIDError");
  if (error != kKernelSuccess) return error;
  if (!entry_.entryID) return kKernelNotFound;
  id = *entry_.entryID;
  return kKernelSuccess;
}

KernelReturn RecordedService::name(std::string& name) {
  const KernelReturn error = returnCodeOf(entry_.record, "NameError");
  if (error != kKernelSuccess) return error;
  name = firstCharacters(entry_.record.string("Name").value_or(entry_.className), kLongestName);
  return kKernelSuccess;
}

std::uint32_t RecordedService::userRetainCount() {
  return halfWordOf(entry_.record.get("RetainCount")).value_or(1);
}

plist::Value RecordedService::property(std::string_view key) {
  return plist::deepCopy(entry_.record.dictionary("Properties").get(key));
}

plist::Value RecordedService::searchProperty(std::string_view plane, std::string_view key) {
  std::vector<const RecordedEntry*> toAsk{&entry_};
  std::unordered_set<const RecordedEntry*> seen{&entry_};
  const auto addParent = [&](const plist::Value& id) {
    const auto word = wordOf(id);
    const RecordedEntry* const parent = word ? recording_->serviceWithID(*word) : nullptr;
    if (parent && seen.insert(parent).second) toAsk.push_back(parent);
  };
  for (std::size_t i = 0; i < toAsk.size(); ++i) {
    const plist::Dictionary record = toAsk[i]->record;
    if (const plist::Value value = record.dictionary("Properties").get(key)) {
      return plist::deepCopy(value);
    }
    const plist::Value parents = record.dictionary("Parents").get(plane);
    addParent(parents);
    for (const plist::Value& parent : parents.array())
      addParent(parent);
  }
  return {};
}

KernelReturn RecordedService::open(std::uint32_t type, std::unique_ptr<UserClient>& client) {
  const KernelReturn error = returnCodeOf(entry_.record, "OpenError");
  if (error != kKernelSuccess) return error;
  if (type != 0) return kKernelBadArgument;
  client = entry_.isHub ? connectToReportHub(recording_, entry_.record, log_)
                        : connectToRecordedDriver(recording_, entry_);
  return kKernelSuccess;
}

}  // namespace tavrel
