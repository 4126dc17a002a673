#include "platform/linux/live/live_source.h"

#include <algorithm>
#include <cerrno>
#include <utility>

#include "base/format.h"
#include "base/limits.h"
#include "base/system_text.h"
#include "platform/linux/files/folder_walk.h"

namespace tavrel::live {
namespace {

constexpr std::uint32_t kArrayValues = 4;  // values per element

}  // namespace

std::uint32_t LiveSource::addSlots(std::uint32_t count) {
  const auto first = static_cast<std::uint32_t>(slots_.size());
  slots_.resize(slots_.size() + count, kUnset);
  return first;
}

std::uint32_t LiveSource::addNumberFile(std::string path, Scale scale, Speed speed,
                                        std::vector<std::string> powerStatus) {
  const std::uint32_t slot = addSlots(1);
  files_.push_back({KernelFile(std::move(path), ReadMode::Once), slot, 1, scale, nullptr, speed,
                    std::move(powerStatus)});
  return slot;
}

std::uint32_t LiveSource::addTextFile(std::string path, std::uint32_t slots,
                                      std::unique_ptr<const TextReader> reader, ReadMode mode) {
  const std::uint32_t first = addSlots(slots);
  files_.push_back({KernelFile(std::move(path), mode), first, slots, {}, std::move(reader)});
  return first;
}

std::uint32_t LiveSource::addMeasured(std::uint32_t slots,
                                      std::function<void(std::span<std::int64_t>)> measure) {
  const std::uint32_t first = addSlots(slots);
  measured_.push_back({first, slots, std::move(measure)});
  return first;
}

std::vector<std::string> LiveSource::namesIn(const std::string& folder) {
  std::vector<std::string> names;
  const int code = walkFolder(folder, [&names](const dirent& entry) {
    names.emplace_back(entry.d_name);
    return true;
  });
  if (code != 0 && code != ENOENT && code != ENOTDIR && code != EACCES &&
      !std::exchange(isListNoted_, true)) {
    note(format("cannot list %s: %s; not everything in it is shown", folder, systemText(code)));
  }
  std::sort(names.begin(), names.end());
  return names;
}

void LiveSource::add(const Place& place, LiveChannel channel) {
  // A second channel with the same name, as from two sensors with one label, gets a number.
  std::string name = channel.name;
  const auto idOf = [&](const std::string& text) {
    return stableID(std::string(place.group) + '\n' + std::string(place.subGroup) + '\n' + text);
  };
  for (int number = 2; !ids_.insert(channel.id = idOf(name)).second; ++number)
    name = channel.name + '#' + std::to_string(number);
  channel.name = std::move(name);
  // Channels of one subgroup are added together, so their group is among the last.
  for (std::size_t i = groups_.size(); i-- > 0;) {
    if (groups_[i].group != place.group || groups_[i].subGroup != place.subGroup) break;
    if (groups_[i].unit == place.unit) return groups_[i].channels.push_back(std::move(channel));
  }
  groups_.push_back({std::string(place.group), std::string(place.subGroup), place.unit, {}});
  groups_.back().channels.push_back(std::move(channel));
}

void LiveSource::addSimple(const Place& place, std::string name, std::uint32_t slot,
                           std::uint16_t categories) {
  add(place, {std::move(name), 0, kFormatSimple, categories, 1, slot, 1});
}

void LiveSource::addArray(const Place& place, std::string name, std::uint32_t firstSlot,
                          std::uint32_t slots) {
  const std::uint32_t elements = (slots + kArrayValues - 1) / kArrayValues;
  if (elements == 0 || elements > limits::kLiveElements) return;
  add(place, {std::move(name), 0, kFormatSimpleArray, kToolCategory,
              static_cast<std::uint16_t>(elements), firstSlot, slots});
}

void LiveSource::addStates(const Place& place, std::string name, std::uint32_t firstSlot,
                           Residency residency) {
  const std::size_t count = residency.ids.size();
  if (count == 0 || count > limits::kLiveElements) return;
  residencies_.push_back(std::move(residency));
  add(place, {std::move(name), 0, kFormatState, kToolCategory, static_cast<std::uint16_t>(count),
              firstSlot, static_cast<std::uint32_t>(2 * count),
              static_cast<std::int32_t>(residencies_.size() - 1)});
}

void LiveSource::addToFold(std::string_view name, Unit unit, Fold fold, std::uint32_t slot) {
  auto at = std::find_if(folds_.begin(), folds_.end(),
                         [&](const FoldedSlots& known) { return known.name == name; });
  if (at == folds_.end()) {
    folds_.push_back({std::string(name), unit, fold, {}});
    at = folds_.end() - 1;
  }
  at->of.push_back(slot);
}

void LiveSource::publishFolds() {
  for (FoldedSlots& fold : folds_) {
    fold.slot = addSlots(1);
    addSimple({"Daily", "", fold.unit}, fold.name, fold.slot, kDailyCategory);
  }
}

plist::Dictionary LiveSource::service() const {
  plist::Array legend = plist::Array::create(groups_.size());
  const plist::String groupKey(kGroupNameKey);
  const plist::String subGroupKey(kSubGroupNameKey);
  const plist::String infoKey(kChannelInfoKey);
  const plist::String channelsKey(kChannelsKey);
  for (const Group& group : groups_) {
    plist::Array channels = plist::Array::create(group.channels.size());
    for (const LiveChannel& channel : group.channels) {
      channels.append(plist::Array{static_cast<std::int64_t>(channel.id),
                                   static_cast<std::int64_t>(channel.type()), channel.name});
    }
    plist::Dictionary entry = plist::Dictionary::create(4);
    entry.set(groupKey, group.group);
    if (!group.subGroup.empty()) entry.set(subGroupKey, group.subGroup);
    if (group.unit != kPlain) {
      entry.set(infoKey,
                plist::Dictionary{{kChannelUnitKey, static_cast<std::int64_t>(group.unit)}});
    }
    entry.set(channelsKey, channels);
    legend.append(entry);
  }
  return {{"Class", className_},
          {"Name", name_},
          {"EntryID", static_cast<std::int64_t>(driverID())},
          {"Properties", plist::Dictionary{{kLegendPublicKey, true}, {kLegendKey, legend}}}};
}

void LiveSource::wantSlots(std::uint32_t first, std::uint32_t count,
                           std::vector<bool>& wanted) const {
  auto file = std::upper_bound(
      files_.begin(), files_.end(), first,
      [](std::uint32_t slot, const LiveFile& candidate) { return slot < candidate.firstSlot; });
  if (file != files_.begin()) --file;
  for (; file != files_.end() && file->firstSlot < first + count; ++file) {
    if (file->firstSlot + file->slots > first) {
      wanted[static_cast<std::size_t>(file - files_.begin())] = true;
    }
  }
}

void LiveSource::want(const LiveChannel& channel, std::vector<bool>& wanted) const {
  wantSlots(channel.firstSlot, channel.slots, wanted);
  if (channel.format == kFormatState) {
    const std::uint32_t current = residency(channel).currentSlot;
    if (current != UINT32_MAX) wantSlots(current, 1, wanted);
  }
  if (channel.categories != kDailyCategory) return;
  for (const FoldedSlots& fold : folds_) {
    if (fold.slot != channel.firstSlot) continue;
    for (const std::uint32_t slot : fold.of)
      wantSlots(slot, 1, wanted);
  }
}

void LiveSource::takeText(std::size_t file, std::optional<std::string_view> text) {
  LiveFile& source = files_[file];
  source.isSilent = false;
  const std::span<std::int64_t> slots = std::span(slots_).subspan(source.firstSlot, source.slots);
  std::fill(slots.begin(), slots.end(), kUnset);
  if (!text) return;
  if (source.reader) {
    source.reader->read(*text, slots);
  } else {
    slots[0] = scaledNumber(*text, source.scale);
  }
}

void LiveSource::takeSilence(std::size_t file) {
  takeText(file, std::nullopt);
  files_[file].isSilent = true;
}

bool LiveSource::isSilent(std::uint32_t slot) const {
  const auto next = std::upper_bound(
      files_.begin(), files_.end(), slot,
      [](std::uint32_t wanted, const LiveFile& file) { return wanted < file.firstSlot; });
  return next != files_.begin() && std::prev(next)->isSilent;
}

std::int64_t LiveSource::folded(const FoldedSlots& fold) const {
  std::int64_t result = kUnset;
  for (const std::uint32_t slot : fold.of) {
    const std::int64_t value = slots_[slot];
    if (value == kUnset) {
      if (fold.fold == Fold::Sum && isSilent(slot)) return kUnset;
    } else if (result == kUnset) {
      result = value;
    } else {
      result = fold.fold == Fold::Sum ? saturatingSum(result, value) : std::max(result, value);
    }
  }
  return result;
}

void LiveSource::finish() {
  for (const Measured& measured : measured_) {
    const auto slots = std::span(slots_).subspan(measured.firstSlot, measured.slots);
    std::fill(slots.begin(), slots.end(), kUnset);
    measured.measure(slots);
  }
  for (const FoldedSlots& fold : folds_)
    slots_[fold.slot] = folded(fold);
}

}  // namespace tavrel::live
