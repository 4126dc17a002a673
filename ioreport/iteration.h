// Walks the channels of an aggregate, with a callback for each.
//
//   IOReportIterate(aggregate, [&](const plist::Dictionary& channel) {
//     ++formats[IOReportChannelGetFormat(channel)];
//     return kIterateContinue;
//   });
//
// All walks have the same order: a level's own channels, then the levels of its drivers, then those
// of its groups. A walk returns the results of its callbacks, OR-ed together; an odd result ends it
// and is its result, so a caller tests one bit (`walkFailed`). A walk ends with `kIterateFailed`
// when memory runs out, or when the aggregate is malformed, nested too deeply or contains itself.
//
// A callback may change the channel that it gets, as getters do. It must not remove anything from
// the aggregate, nor throw. The walk does not visit channels that a callback adds to the current
// array and level. While an aggregate is being pruned, its arrays have gaps, and the callback must
// not even read it. A walk without a callback fails.
#pragma once

#include <cstdint>
#include <functional>
#include <variant>

#include "base/plist.h"
#include "ioreport/error_object.h"

namespace tavrel {

/// The result of a callback for a channel, and of a walk for all of them.
using IterateResult = std::int32_t;

inline constexpr IterateResult kIterateContinue = 0;
/// Ends the walk, as all odd values do.
inline constexpr IterateResult kIterateStop = 1;
/// Removes the channel from the pruned aggregate, or leaves it out of the new one.
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

/// Removes the channels for which the callback returns `kIterateRemove`, and levels that become
/// empty. When the walk stops early, removed channels stay removed.
IterateResult IOReportPrune(const plist::Dictionary& aggregate, const ChannelCallback& callback);

/// The number of channels in the whole tree; -1 when it is malformed.
std::int32_t IOReportGetChannelCount(const plist::Dictionary& aggregate);

/// Files all channels of the source, by reference, as the destination's options say.
IterateResult IOReportMergeChannels(const plist::Dictionary& destination,
                                    const plist::Dictionary& source, ErrorOut error);

/// A new aggregate, without options, of copies of the channels for which the callback returns 0. A
/// copy shares the content of its channel. An empty handle when the walk fails.
plist::Dictionary cloneAggregate(const plist::Dictionary& aggregate, const CloneCallback& callback);

/// The same, but pairs each channel with the one of `other` that has the same driver, ID and type,
/// and passes both to the callback. A channel without a match is copied unchanged. The copy of a
/// matched channel has the elements of the match, with all values invalid.
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

/// The engine of all walks. Only a compare walk reads `other`; only clone and compare walks need
/// `newAggregate`, and fill it on success.
IterateResult iterateAggregate(const plist::Dictionary& aggregate, const plist::Dictionary& other,
                               const AggregateWalk& walk, plist::Dictionary* newAggregate);

}  // namespace tavrel
