#include "platform/linux/live/live_machine.h"

#include <algorithm>
#include <array>
#include <ctime>
#include <optional>
#include <span>
#include <unordered_map>
#include <utility>
#include <vector>

#include "base/limits.h"
#include "platform/linux/live/device_tables.h"
#include "platform/linux/live/live_source.h"
#include "platform/linux/live/slow_reads.h"
#include "platform/linux/live/sources.h"
#include "platform/report_protocol.h"

namespace tavrel {

using namespace live;

namespace {

struct SourceEntry {
  std::string_view className;
  std::string_view name;
  void (*add)(const DeviceRoot& root, LiveSource& source);
};

constexpr SourceEntry kSources[] = {
    {"LinuxBoot", "boot", addBoot},
    {"LinuxCpuTime", "cpu-time", addCpuTime},
    {"LinuxCpuIdle", "cpu-idle", addCpuIdle},
    {"LinuxCpuFrequency", "cpu-frequency", addCpuFrequency},
    {"LinuxScheduler", "scheduler", addScheduler},
    {"LinuxPressure", "pressure", addPressure},
    {"LinuxMemory", "memory", addMemory},
    {"LinuxSwap", "swap", addSwapDevices},
    {"LinuxBlock", "block", addBlockDevices},
    {"LinuxDriveHealth", "drive-health", addHealth},
    {"LinuxFileSystems", "file-systems", addFileSystems},
    {"LinuxNetwork", "network", addNetwork},
    {"LinuxInterrupts", "interrupts", addInterrupts},
    {"LinuxDeviceFrequency", "device-frequency", addDeviceFrequency},
    {"LinuxCooling", "cooling", addCooling},
    {"LinuxSuspend", "suspend", addSuspend},
    {"LinuxControlGroups", "control-groups", addControlGroups},
};

struct ChannelKey {
  std::uint64_t driverID;
  std::uint64_t channelID;
  bool operator==(const ChannelKey&) const = default;
};
struct ChannelKeyHash {
  // Both IDs are hashes already.
  std::size_t operator()(const ChannelKey& key) const {
    return static_cast<std::size_t>(key.driverID ^ key.channelID);
  }
};
struct ChannelPlace {
  std::uint32_t source;
  const LiveChannel* channel;
};

// The time base of element timestamps: nanoseconds since boot, without suspended time.
std::uint64_t nowInTicks() {
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC, &now);
  return static_cast<std::uint64_t>(now.tv_sec) * 1'000'000'000 +
         static_cast<std::uint64_t>(now.tv_nsec);
}

bool hasValue(const LiveChannel& channel, std::span<const std::int64_t> values) {
  const auto isUnset = [](std::int64_t value) { return value == kUnset; };
  // With one unknown residency, the shares of all states would be wrong.
  if (channel.format == kFormatState)
    return std::ranges::none_of(values.subspan(channel.elements), isUnset);
  return !std::ranges::all_of(values, isUnset);
}

using ElementValues = std::array<std::int64_t, kElementValues>;

// `values` are the entry counts of all states, followed by their residencies.
ElementValues stateValues(std::uint64_t id, std::span<const std::int64_t> values,
                          std::size_t state) {
  return {static_cast<std::int64_t>(id), values[state], values[values.size() / 2 + state]};
}

// The last element of an array may have room for more values than are left.
ElementValues numberValues(std::uint8_t format, std::span<const std::int64_t> values,
                           std::size_t element) {
  ElementValues result;
  result.fill(format == kFormatSimpleArray ? kUnset : 0);
  const auto rest = values.subspan(element * kElementValues);
  std::copy_n(rest.begin(), std::min(rest.size(), kElementValues), result.begin());
  return result;
}

void storeValues(MutableByteSpan record, const ElementValues& values) {
  for (std::size_t i = 0; i < values.size(); ++i) {
    storeLittle64(record, kElementFirstValue + 8 * i, static_cast<std::uint64_t>(values[i]));
  }
}

}  // namespace

class LiveMachine::State {
 public:
  State(const DeviceRoot& root, SystemLog& log, const Options& options)
      : slowReads_(log, {options.oneSensorMilliseconds, options.allSensorsMilliseconds}) {
    if (!isFolder(root.path("/proc"))) return;
    for (const SourceEntry& entry : kSources) {
      LiveSource source(entry.className, entry.name);
      entry.add(root, source);
      keep(std::move(source), log);
    }
    for (const DeviceClass& devices : deviceClasses()) {
      LiveSource source(devices.className, devices.name);
      addDeviceClass(root, devices, source);
      keep(std::move(source), log);
    }
    for (std::size_t i = 0; i < sources_.size(); ++i) {
      sources_[i].forEachChannel([&](const LiveChannel& channel) {
        index_.emplace(ChannelKey{sources_[i].driverID(), channel.id},
                       ChannelPlace{static_cast<std::uint32_t>(i), &channel});
      });
    }
  }

  std::vector<LiveSource>& sources() { return sources_; }
  const ChannelPlace* find(const ChannelKey& key) const {
    const auto at = index_.find(key);
    return at == index_.end() ? nullptr : &at->second;
  }

  /// Reads the files marked in `wanted`, which has a list for each source; those of slow devices
  /// come last, all together. A source without a mark is skipped.
  void read(const std::vector<std::vector<bool>>& wanted) {
    std::vector<std::pair<std::size_t, std::size_t>> slow;
    std::vector<std::shared_ptr<SlowFile>> slowFiles;
    for (std::size_t source = 0; source < sources_.size(); ++source)
      readQuick(source, wanted[source], slow, slowFiles);
    const auto texts = slowReads_.read(std::move(slowFiles));
    for (std::size_t i = 0; i < slow.size(); ++i) {
      const auto [source, file] = slow[i];
      const auto& [text, isGone] = texts[i];
      if (text || isGone) {
        sources_[source].takeText(file, text);
      } else {
        sources_[source].takeSilence(file);
      }
    }
    for (std::size_t source = 0; source < sources_.size(); ++source) {
      if (!wanted[source].empty()) sources_[source].finish();
    }
  }

 private:
  void keep(LiveSource source, SystemLog& log) {
    for (const std::string& note : source.notes())
      log.write(LogLevel::Default, note);
    source.publishFolds();
    if (!source.empty()) sources_.push_back(std::move(source));
  }

  void readQuick(std::size_t index, const std::vector<bool>& wanted,
                 std::vector<std::pair<std::size_t, std::size_t>>& slow,
                 std::vector<std::shared_ptr<SlowFile>>& slowFiles) {
    LiveSource& source = sources_[index];
    std::vector<LiveFile>& files = source.files();
    std::optional<std::string_view> text;
    const std::string* textPath = nullptr;
    const LiveFile* asked = nullptr;  // the last one whose device was asked whether it is asleep
    bool sleeps = false;
    for (std::size_t i = 0; i < wanted.size(); ++i) {
      if (!wanted[i]) continue;
      if (files[i].speed == Speed::Slow) {
        // The files of a device follow one another.
        if (!asked || asked->powerStatus != files[i].powerStatus) sleeps = isAsleep(files[i]);
        asked = &files[i];
        if (sleeps) {
          source.takeSilence(i);
        } else {
          slow.emplace_back(index, i);
          slowFiles.push_back(slowFile(index, i));
        }
        continue;
      }
      // Successive files with the same path are tables of one text, which is read once.
      if (!textPath || *textPath != files[i].file.path()) {
        text = files[i].file.read(budget_, buffer_);
        textPath = &files[i].file.path();
      }
      source.takeText(i, text);
    }
  }

  bool isAsleep(const LiveFile& file) {
    for (const std::string& status : file.powerStatus) {
      const auto text = readKernelFile(status, ReadMode::Once, statusBuffer_);
      if (text && text->starts_with("suspend")) return true;
    }
    return false;
  }

  std::shared_ptr<SlowFile> slowFile(std::size_t source, std::size_t file) {
    std::shared_ptr<SlowFile>& known = slowFiles_[{source, file}];
    if (!known) {
      known =
          std::make_shared<SlowFile>(sources_[source].files()[file].file.path(), budget_.take());
    }
    return known;
  }

  std::vector<LiveSource> sources_;
  std::unordered_map<ChannelKey, ChannelPlace, ChannelKeyHash> index_;
  std::unordered_map<ChannelKey, std::shared_ptr<SlowFile>, ChannelKeyHash> slowFiles_;
  DescriptorBudget budget_;
  TextBuffer buffer_;
  TextBuffer statusBuffer_;
  SlowReads slowReads_;
};

class LiveMachine::Sampling final : public LiveSampling {
 public:
  explicit Sampling(std::shared_ptr<State> state)
      : state_(std::move(state)), wanted_(state_->sources().size()) {}

  std::size_t add(std::uint64_t driverID, std::uint64_t channelID) override {
    const ChannelPlace* const place = state_->find({driverID, channelID});
    if (!place) return 0;
    LiveSource& source = state_->sources()[place->source];
    std::vector<bool>& wanted = wanted_[place->source];
    // One flag more than there are files, so that a source without files can be wanted too.
    if (wanted.empty()) wanted.resize(source.files().size() + 1);
    source.want(*place->channel, wanted);
    places_.push_back(*place);
    return std::size_t{place->channel->elements} * kElementBytes;
  }

  void update() override {
    state_->read(wanted_);
    ticks_ = nowInTicks();
  }

  std::size_t write(std::size_t index, MutableByteSpan room) const override {
    const LiveChannel& channel = *places_[index].channel;
    const LiveSource& source = state_->sources()[places_[index].source];
    const auto values = source.slots().subspan(channel.firstSlot, channel.slots);
    if (!hasValue(channel, values)) return 0;
    for (std::size_t element = 0; element < channel.elements; ++element) {
      const MutableByteSpan record = room.subspan(element * kElementBytes, kElementBytes);
      storeLittle64(record, kElementDriver, source.driverID());
      storeLittle64(record, kElementChannel, channel.id);
      storeLittle64(record, kElementType, channel.type());
      if (channel.format == kFormatState) {
        const Residency& states = source.residency(channel);
        const bool isCurrent = states.currentSlot < source.slots().size() &&
                               source.slots()[states.currentSlot] == states.numbers[element];
        storeLittle64(record, kElementTimestamp, isCurrent ? ticks_ : 0);
        storeValues(record, stateValues(states.ids[element], values, element));
      } else {
        storeLittle64(record, kElementTimestamp, ticks_);
        storeValues(record, numberValues(channel.format, values, element));
      }
    }
    return std::size_t{channel.elements} * kElementBytes;
  }

 private:
  const std::shared_ptr<State> state_;
  std::vector<std::vector<bool>> wanted_;  // for each source, a flag per file
  std::vector<ChannelPlace> places_;
  std::uint64_t ticks_ = 0;
};

LiveMachine::LiveMachine(const DeviceRoot& root, SystemLog& log)
    : LiveMachine(root, log, {limits::kSensorMilliseconds, limits::kSensorsMilliseconds}) {}
LiveMachine::LiveMachine(const DeviceRoot& root, SystemLog& log, const Options& options)
    : root_(root), log_(log), options_(options) {}
LiveMachine::~LiveMachine() = default;

LiveMachine::State& LiveMachine::state() {
  if (!state_) state_ = std::make_shared<State>(root_, log_, options_);
  return *state_;
}

plist::Array LiveMachine::services() {
  plist::Array services = plist::Array::create();
  for (const LiveSource& source : state().sources())
    services.append(source.service());
  return services;
}

std::unique_ptr<LiveSampling> LiveMachine::subscribe() {
  state();
  return std::make_unique<Sampling>(state_);
}

}  // namespace tavrel
