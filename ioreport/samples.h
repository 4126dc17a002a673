// Samples: copies of the subscribed channels that hold, under "RawElements", the elements that the
// channels had at one time.
//
// The elements of one channel form a group in a buffer; the first one counts them. When a channel
// has two groups, the first one is used. Samples own their elements and stay valid after the next
// update.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <vector>

#include "base/bytes.h"
#include "base/plist.h"
#include "ioreport/error_object.h"
#include "ioreport/iteration.h"
#include "ioreport/subscription.h"

namespace tavrel {

/// The current values of subscribed channels. Channels that the kernel left out are missing. An
/// empty handle when sampling fails.
plist::Dictionary IOReportCreateSamples(const IOReportSubscription* subscription,
                                        const plist::Dictionary& subscribedChannels,
                                        ErrorOut error);

/// The same from the caller's own buffer.
plist::Dictionary IOReportCreateSamplesRaw(const plist::Dictionary& subscribedChannels,
                                           ByteSpan buffer, ErrorOut error);

/// Takes the samples of one buffer, which it borrows, channel by channel. The buffer is read once,
/// whatever the number of channels.
class SampleExtractor {
 public:
  explicit SampleExtractor(ByteSpan buffer);

  /// Gives the copy of a channel its elements and, when the channel's own type is unknown, the type
  /// in them. Returns `kIterateRemove` for a channel that is not in the buffer, and `kIterateStop`
  /// when the channel could only come after a group without elements, which ends a buffer.
  IterateResult extractChannelSample(const plist::Dictionary& channel,
                                     plist::Dictionary& newChannel);

  /// The error code to report if sampling fails.
  KernelReturn status() const { return status_; }

 private:
  // Sorted for searching: by channel, and for each channel in the buffer's order.
  struct Group {
    std::uint64_t providerID;
    std::uint64_t channelID;
    std::size_t offset;
    std::size_t length;
    auto operator<=>(const Group&) const = default;
  };

  std::optional<ByteSpan> groupOf(const plist::Dictionary& channel) const;

  ByteSpan buffer_;
  std::vector<Group> groups_;
  bool endsInEmptyGroup_ = false;
  KernelReturn status_ = kKernelError;
  plist::String elementsKey_;  // one text for all samples
};

}  // namespace tavrel
