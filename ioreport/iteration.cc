#include "ioreport/iteration.h"

#include <algorithm>
#include <iterator>
#include <new>
#include <vector>

#include "base/limits.h"
#include "ioreport/aggregate.h"
#include "ioreport/channel_pairing.h"
#include "ioreport/elements.h"
#include "ioreport/keys.h"

namespace tavrel {
namespace {

// The first odd result ends the walk and becomes its result.
IterateResult combined(IterateResult earlier, IterateResult next) {
  return walkFailed(next) ? next : earlier | next;
}

// An empty handle for anything but a channel.
plist::Dictionary channelAt(const plist::Array& channels, std::size_t index) {
  return index < channels.size() ? channels.begin()[index].dictionary() : plist::Dictionary();
}

// A copy with room for the elements that make it a sample.
plist::Dictionary copyOfChannel(const plist::Dictionary& channel) {
  plist::Dictionary copy = plist::Dictionary::create(channel.size() + 1);
  for (const plist::Entry& entry : channel)
    copy.set(entry.key, entry.value);
  return copy;
}

/// An iterate walk that only counts, without reading the channels, which are far apart in the
/// memory of a large aggregate.
struct CountWalk {
  std::int32_t& count;
};

IterateResult walkChannels(const CountWalk& walk, const plist::Array& channels, const plist::Array&,
                           plist::Array&) {
  for (const plist::Value& channel : channels) {
    if (channel.kind() != plist::Kind::Dictionary) return kIterateFailed;
    // Shared arrays may count for more channels than fit into memory.
    if (walk.count == INT32_MAX) return kIterateFailed;
    ++walk.count;
  }
  return kIterateContinue;
}

// The walk visits the channels that are in the array when it arrives, not those that callbacks add.
IterateResult walkChannels(const IterateWalk& walk, const plist::Array& channels,
                           const plist::Array&, plist::Array&) {
  IterateResult result = kIterateContinue;
  const std::size_t count = channels.size();
  for (std::size_t i = 0; i < count && !walkFailed(result); ++i) {
    const plist::Dictionary channel = channelAt(channels, i);
    result = combined(result, channel ? walk.callback(channel) : kIterateFailed);
  }
  return result;
}

/// Removes channels from an array, from front to back. Each kept channel moves up at once, and the
/// end is cut off last, so that the cost does not depend on the number removed. Nothing is lost
/// when it ends early.
class Removal {
 public:
  explicit Removal(const plist::Array& channels) : channels_(channels) {}
  Removal(const Removal&) = delete;
  Removal& operator=(const Removal&) = delete;
  ~Removal() {
    while (next_ < channels_.size())
      keep();
    while (channels_.size() > kept_)
      channels_.remove(channels_.size() - 1);
  }

  plist::Dictionary channel() const { return channelAt(channels_, next_); }
  void keep() {
    if (kept_ != next_) {
      channels_.set(kept_, channels_.at(next_));
      channels_.set(next_, {});
    }
    ++kept_;
    ++next_;
  }
  void remove() { channels_.set(next_++, {}); }

 private:
  plist::Array channels_;
  std::size_t kept_ = 0;
  std::size_t next_ = 0;
};

IterateResult walkChannels(const PruneWalk& walk, const plist::Array& channels, const plist::Array&,
                           plist::Array&) {
  IterateResult result = kIterateContinue;
  Removal removal(channels);
  const std::size_t count = channels.size();
  for (std::size_t i = 0; i < count && !walkFailed(result); ++i) {
    const plist::Dictionary channel = removal.channel();
    const IterateResult answer = channel ? walk.callback(channel) : kIterateFailed;
    result = combined(result, answer);
    if (answer == kIterateRemove) {
      removal.remove();
    } else {
      removal.keep();
    }
  }
  return result;
}

// Fills the new array with the copies that `visit` keeps.
template <class Visit>
IterateResult buildChannels(const plist::Array& channels, plist::Array& newChannels,
                            const Visit& visit) {
  IterateResult result = kIterateContinue;
  const std::size_t count = channels.size();
  for (std::size_t i = 0; i < count && !walkFailed(result); ++i) {
    const plist::Dictionary channel = channelAt(channels, i);
    if (!channel) return kIterateFailed;
    plist::Dictionary newChannel = copyOfChannel(channel);
    const IterateResult answer = visit(i, channel, newChannel);
    result = combined(result, answer);
    if (answer == kIterateContinue) newChannels.append(newChannel);
  }
  return result;
}

IterateResult walkChannels(const CloneWalk& walk, const plist::Array& channels, const plist::Array&,
                           plist::Array& newChannels) {
  return buildChannels(
      channels, newChannels,
      [&](std::size_t, const plist::Dictionary& channel, plist::Dictionary& newChannel) {
        return walk.callback(channel, newChannel);
      });
}

IterateResult walkChannels(const CompareWalk& walk, const plist::Array& channels,
                           const plist::Array& otherChannels, plist::Array& newChannels) {
  if (!otherChannels) return kIterateFailed;
  ChannelPairing pairing(otherChannels);
  const auto visit = [&](std::size_t i, const plist::Dictionary& channel,
                         plist::Dictionary& newChannel) {
    plist::Dictionary match;
    if (!pairing.find(i, channel, match)) return kIterateFailed;
    if (!match) return kIterateContinue;
    const KernelReturn cleared = cloneElements(newChannel, match, kClearValues);
    return cleared == kKernelSuccess ? walk.callback(match, channel, newChannel) : kIterateFailed;
  };
  return buildChannels(channels, newChannels, visit);
}

template <class Walk>
class Engine {
 public:
  static constexpr bool kPrunes = std::is_same_v<Walk, PruneWalk>;
  static constexpr bool kCompares = std::is_same_v<Walk, CompareWalk>;
  static constexpr bool kBuilds = kCompares || std::is_same_v<Walk, CloneWalk>;

  explicit Engine(const Walk& walk) : walk_(walk) {}

  IterateResult walkLevel(plist::Dictionary level, const plist::Dictionary& other,
                          plist::Dictionary& newLevel, std::size_t depth) const {
    if (!level || depth == limits::kPropertyListDepth) return kIterateFailed;
    if (kCompares && !other) return kIterateFailed;
    plist::Dictionary built;
    if (kBuilds) built = plist::Dictionary::create();
    IterateResult result = walkLevelChannels(level, other, built);
    for (const std::string_view container : {kDriversKey, kChannelGroupsKey}) {
      if (walkFailed(result)) return result;
      result = combined(result, walkContainer(container, level, other, built, depth));
    }
    if (!walkFailed(result)) newLevel = built;
    return result;
  }

 private:
  IterateResult walkLevelChannels(plist::Dictionary& level, const plist::Dictionary& other,
                                  plist::Dictionary& built) const {
    const plist::Value present = level.get(kChannelsKey);
    if (!present) return kIterateContinue;
    const plist::Array channels = present.array();
    if (!channels) return kIterateFailed;
    plist::Array newChannels;
    if (kBuilds) newChannels = plist::Array::create(channels.size());
    const IterateResult result =
        walkChannels(walk_, channels, other.array(kChannelsKey), newChannels);
    if (kBuilds) built.set(kChannelsKey, newChannels);
    if (kPrunes && channels.empty()) level.remove(kChannelsKey);
    return result;
  }

  // List the entries first, because a callback may file channels under new names.
  IterateResult walkContainer(std::string_view key, plist::Dictionary& level,
                              const plist::Dictionary& other, plist::Dictionary& built,
                              std::size_t depth) const {
    const plist::Value present = level.get(key);
    if (!present) return kIterateContinue;
    plist::Dictionary container = present.dictionary();
    const plist::Dictionary otherContainer = other.dictionary(key);
    if (!container || (kCompares && !otherContainer)) return kIterateFailed;

    std::vector<plist::Entry> entries;
    entries.reserve(container.size());
    std::ranges::copy(container, std::back_inserter(entries));
    plist::Dictionary newContainer;
    IterateResult result = kIterateContinue;
    bool isUsable = false;
    for (const plist::Entry& entry : entries) {
      const plist::Dictionary sublevel = entry.value.dictionary();
      if (!sublevel) continue;
      isUsable = true;
      plist::Dictionary newSublevel;
      result = combined(result, walkLevel(sublevel, otherContainer.dictionary(entry.key),
                                          newSublevel, depth + 1));
      if (kPrunes && sublevel.empty()) container.remove(entry.key);
      if (walkFailed(result)) break;
      if (kBuilds) newContainer.set(entry.key, newSublevel);
    }
    if (kBuilds) built.set(key, newContainer);
    if (kPrunes && container.empty()) level.remove(key);
    return isUsable ? result : kIterateFailed;
  }

  const Walk& walk_;
};

template <class Walk>
IterateResult runWalk(const Walk& walk, const plist::Dictionary& aggregate,
                      const plist::Dictionary& other, plist::Dictionary* newAggregate) {
  using Walker = Engine<Walk>;
  plist::Dictionary built;
  try {
    const IterateResult result = Walker(walk).walkLevel(aggregate, other, built, 0);
    if (!Walker::kBuilds || walkFailed(result)) return result;
    if (!newAggregate) return kIterateFailed;
    *newAggregate = built;
    return result;
  } catch (const std::bad_alloc&) {
    return kIterateFailed;
  }
}

}  // namespace

IterateResult iterateAggregate(const plist::Dictionary& aggregate, const plist::Dictionary& other,
                               const AggregateWalk& walk, plist::Dictionary* newAggregate) {
  return std::visit(
      [&](const auto& chosen) {
        return chosen.callback ? runWalk(chosen, aggregate, other, newAggregate) : kIterateFailed;
      },
      walk);
}

IterateResult IOReportIterate(const plist::Dictionary& aggregate, const ChannelCallback& callback) {
  return iterateAggregate(aggregate, {}, IterateWalk{callback}, nullptr);
}

IterateResult IOReportPrune(const plist::Dictionary& aggregate, const ChannelCallback& callback) {
  return iterateAggregate(aggregate, {}, PruneWalk{callback}, nullptr);
}

std::int32_t IOReportGetChannelCount(const plist::Dictionary& aggregate) {
  std::int32_t count = 0;
  const IterateResult result = runWalk(CountWalk{count}, aggregate, {}, nullptr);
  return result == 0 ? count : -1;
}

IterateResult IOReportMergeChannels(const plist::Dictionary& destination,
                                    const plist::Dictionary& source, ErrorOut error) {
  if (!destination || !source || destination.isSame(source)) {
    fail(error, kKernelBadArgument, "bad argument");
    return kIterateFailed;
  }
  const std::int32_t options = _getAggregateOpts(destination);
  const auto file = [&](const plist::Dictionary& channel) -> IterateResult {
    const KernelReturn filed = _addChannel(destination, channel, options, error);
    return filed == kKernelSuccess ? kIterateContinue : kIterateStop;
  };
  return IOReportIterate(source, std::ref(file));
}

plist::Dictionary cloneAggregate(const plist::Dictionary& aggregate,
                                 const CloneCallback& callback) {
  plist::Dictionary clone;
  iterateAggregate(aggregate, {}, CloneWalk{callback}, &clone);
  return clone;
}

plist::Dictionary compareAggregates(const plist::Dictionary& other,
                                    const plist::Dictionary& aggregate,
                                    const CompareCallback& callback) {
  plist::Dictionary compared;
  iterateAggregate(aggregate, other, CompareWalk{callback}, &compared);
  return compared;
}

}  // namespace tavrel
