// Walking the channels of an aggregate, with a callback for each.
//
//   IOReportIterate(aggregate, [&](const plist::Dictionary& channel) {
//     ++formats[IOReportChannelGetFormat(channel)];
//     return kIterateContinue;
//   });
//
// All walks go through the same order: a level's own channels, then the levels of its drivers, then
// those of its groups. A walk answers what its callbacks answered, OR-ed together; an odd answer
// ends it and is its result. So a caller tests one bit (`walkFailed`). A malformed aggregate, one
// that is nested too deeply or contains itself, and memory that is short end a walk with
// `kIterateFailed`.
//
// A callback may change the channel that it is given, as getters do. It must not take anything out
// of the aggregate, nor throw; what it files there meanwhile is not visited in its array and level.
// While an aggregate is pruned its arrays have gaps: the callback must not even look at it. A walk
// without a callback fails.
#pragma once

#include <cstdint>
#include <functional>
#include <variant>

#include "base/plist.h"
#include "ioreport/error_object.h"

namespace tavrel {

/// What a callback answers for a channel, and a walk for all of them.
using IterateResult = std::int32_t;

inline constexpr IterateResult kIterateContinue = 0;
/// Ends the walk, as every odd value does.
inline constexpr IterateResult kIterateStop = 1;
/// Removes the channel from the aggregate that is pruned, or leaves it out of the new one.
inline constexpr IterateResult kIterateRemove = 16;
inline constexpr IterateResult kIterateFailed = 273;

constexpr bool walkFailed(IterateResult result) {
  return (result & 1) != 0;
}

using ChannelCallback = std::function<IterateResult(const plist::Dictionary& channel)>;
using CloneCallback =
    std::function<IterateResult(const plist::Dictionary& channel, plist::Dictionary& newChannel)>;
using CompareCallback =
    std::function<IterateResult(const plist::Dictionary& match, const plist::Dictionary& channel,
                                plist::Dictionary& newChannel)>;

IterateResult IOReportIterate(const plist::Dictionary& aggregate, const ChannelCallback& callback);

/// Removes the channels for which the callback answers `kIterateRemove`, and levels that become
/// empty. When the walk is stopped, what was removed stays removed.
IterateResult IOReportPrune(const plist::Dictionary& aggregate, const ChannelCallback& callback);

/// Of the whole tree; -1 when it is malformed.
std::int32_t IOReportGetChannelCount(const plist::Dictionary& aggregate);

/// Files every channel of the source, by reference, as the destination's options say.
IterateResult IOReportMergeChannels(const plist::Dictionary& destination,
                                    const plist::Dictionary& source, ErrorOut error);

/// A new aggregate of copies of the channels for which the callback answers 0. It has no options.
/// A copy shares with its channel what is in it. An empty handle when the walk fails.
plist::Dictionary cloneAggregate(const plist::Dictionary& aggregate, const CloneCallback& callback);

/// The same, pairing each channel with that of `other` with the same driver, id and type, which
/// the callback is given too. A channel that has no match is copied as it is. The elements of the
/// copy of a matched channel are those of the match, with every value invalid.
plist::Dictionary compareAggregates(const plist::Dictionary& other,
                                    const plist::Dictionary& aggregate,
                                    const CompareCallback& callback);

/// The kinds of walk, each with its callback, which it borrows.
struct IterateWalk {
  const ChannelCallback& callback;
};
struct PruneWalk {
  const ChannelCallback& callback;
};
struct CloneWalk {
  const CloneCallback& callback;
};
struct CompareWalk {
  const CompareCallback& callback;
};
using AggregateWalk = std::variant<IterateWalk, PruneWalk, CloneWalk, CompareWalk>;

/// The engine of all walks. Only a compare walk looks at `other`; only clone and compare walks
/// need, and on success fill, `newAggregate`.
IterateResult iterateAggregate(const plist::Dictionary& aggregate, const plist::Dictionary& other,
                               const AggregateWalk& walk, plist::Dictionary* newAggregate);

}  // namespace tavrel
