#include "platform/linux/recorded/recorded_registry.h"

#include <numeric>
#include <optional>
#include <utility>
#include <vector>

#include "platform/linux/recorded/recorded_service.h"
#include "platform/linux/recorded/recording_folder.h"

namespace tavrel {

class RecordedRegistry::State {
 public:
  explicit State(SystemLog& systemLog) : log(systemLog) {}

  struct View {
    std::shared_ptr<const Recording> recording;
    std::uint64_t generation = 0;
  };

  /// The recordings as they are now.
  const View& current() {
    const bool isChanged = folder && folder->update(parts);
    const std::uint64_t now = generationOf(parts);
    if (isChanged || !view_.recording || now != view_.generation) {
      view_ = {std::make_shared<const Recording>(parts, live, log), now};
    }
    return view_;
  }

  SystemLog& log;
  std::optional<RecordingFolder> folder;  // nothing when a single recording is played
  std::vector<RecordingPart> parts;
  LiveServices* live = nullptr;

 private:
  View view_;
};

class RecordedRegistry::Walk final : public ServiceIterator {
 public:
  Walk(std::shared_ptr<State> state, State::View view, std::vector<std::size_t> positions)
      : state_(std::move(state)), view_(std::move(view)), positions_(std::move(positions)) {}

  bool isValid() override { return state_->current().generation == view_.generation; }

  std::shared_ptr<DriverService> next() override {
    if (next_ == positions_.size()) return nullptr;
    return std::make_shared<RecordedService>(view_.recording, positions_[next_++], state_->log);
  }

 private:
  const std::shared_ptr<State> state_;
  const State::View view_;
  const std::vector<std::size_t> positions_;
  std::size_t next_ = 0;
};

namespace {

bool hasProperties(const RecordedEntry& entry, const plist::Dictionary& wanted) {
  const plist::Dictionary properties = entry.record.dictionary("Properties");
  for (const plist::Entry& property : wanted) {
    if (!(properties.get(property.key) == property.value)) return false;
  }
  return true;
}

}  // namespace

RecordedRegistry::RecordedRegistry(const DeviceRoot& root, FileSystem& files,
                                   PropertyListCoding& propertyLists, SystemLog& log,
                                   LiveServices* live)
    : state_(std::make_shared<State>(log)) {
  state_->live = live;
  state_->folder.emplace(root, files, propertyLists, log);
}
RecordedRegistry::RecordedRegistry(const plist::Dictionary& recording, SystemLog& log)
    : state_(std::make_shared<State>(log)) {
  state_->parts.push_back({"recording", recording});
}
RecordedRegistry::~RecordedRegistry() = default;

std::shared_ptr<DriverService> RecordedRegistry::firstService(std::string_view className) {
  const auto recording = state_->current().recording;
  const auto positions = recording->servicesOfClass(className);
  if (positions.empty()) return nullptr;
  return std::make_shared<RecordedService>(recording, positions.front(), state_->log);
}

// Each key of the dictionary is a condition, and all must hold. No service meets an unknown or
// malformed condition.
KernelReturn RecordedRegistry::matchingServices(const plist::Dictionary& matching,
                                                std::unique_ptr<ServiceIterator>& services) {
  if (!matching) return kKernelBadArgument;
  const State::View view = state_->current();
  const std::vector<RecordedEntry>& entries = view.recording->services();
  std::vector<std::size_t> positions(entries.size());
  std::iota(positions.begin(), positions.end(), std::size_t{0});
  for (const plist::Entry& condition : matching) {
    const std::string_view key = condition.key;
    const auto className = condition.value.string();
    const plist::Dictionary properties = condition.value.dictionary();
    std::erase_if(positions, [&](std::size_t position) {
      const RecordedEntry& entry = entries[position];
      if (key == "IOProviderClass") return !className || entry.className != *className;
      if (key == "IOPropertyMatch") return !properties || !hasProperties(entry, properties);
      return true;
    });
  }
  services = std::make_unique<Walk>(state_, view, std::move(positions));
  return kKernelSuccess;
}

plist::Dictionary RecordedRegistry::recording() {
  state_->current();
  return mergedRecording(state_->parts);
}

plist::Array RecordedRegistry::liveServices() {
  plist::Array live = plist::Array::create();
  for (const RecordedEntry& entry : state_->current().recording->services()) {
    if (entry.isLive) live.append(entry.record);
  }
  return live;
}

}  // namespace tavrel
