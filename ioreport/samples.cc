#include "ioreport/samples.h"

#include <algorithm>

#include "ioreport/channel.h"
#include "ioreport/elements.h"
#include "ioreport/keys.h"

namespace tavrel {
SampleExtractor::SampleExtractor(ByteSpan buffer) : buffer_(buffer), elementsKey_(kRawElementsKey) {
  std::size_t offset = 0;
  while (const auto element = slice(buffer, offset, kElementBytes)) {
    const std::size_t length =
        elementCountOf(*loadLittle64(*element, kElementType)) * kElementBytes;
    endsInEmptyGroup_ = length == 0;
    if (endsInEmptyGroup_ || !slice(buffer, offset, length)) break;
    groups_.push_back({*loadLittle64(*element, kElementDriver),
                       *loadLittle64(*element, kElementChannel), offset, length});
    offset += length;
  }
  std::ranges::sort(groups_);
}

std::optional<ByteSpan> SampleExtractor::groupOf(const plist::Dictionary& channel) const {
  const Group earliest{static_cast<std::uint64_t>(IOReportChannelGetDriverID(channel)),
                       static_cast<std::uint64_t>(IOReportChannelGetChannelID(channel)), 0, 0};
  const auto found = std::ranges::lower_bound(groups_, earliest);
  if (found == groups_.end() || found->providerID != earliest.providerID ||
      found->channelID != earliest.channelID) {
    return std::nullopt;
  }
  return buffer_.subspan(found->offset, found->length);
}

IterateResult SampleExtractor::extractChannelSample(const plist::Dictionary& channel,
                                                    plist::Dictionary& newChannel) {
  const auto group = groupOf(channel);
  if (!group) {
    if (endsInEmptyGroup_) return kIterateStop;
    status_ = kKernelNotFound;
    return kIterateRemove;
  }
  // Read the type from the copy: the hub might be writing to the buffer.
  const plist::Data elements(*group);
  if (IOReportChannelGetFormat(channel) == kFormatUnknown) {
    setChannelType(newChannel, *loadLittle64(elements.bytes(), kElementType));
  }
  newChannel.set(elementsKey_, elements);
  return kIterateContinue;
}

plist::Dictionary IOReportCreateSamples(const IOReportSubscription* subscription,
                                        const plist::Dictionary& subscribedChannels,
                                        ErrorOut error) {
  if (!subscription || !subscribedChannels) {
    fail(error, kKernelBadArgument, nullptr);
    return {};
  }
  if (updateKernelBuffer(*subscription, error) != kKernelSuccess) return {};
  return IOReportCreateSamplesRaw(subscribedChannels, subscription->buffer(), error);
}

plist::Dictionary IOReportCreateSamplesRaw(const plist::Dictionary& subscribedChannels,
                                           ByteSpan buffer, ErrorOut error) {
  constexpr const char* kFailure = "couldn't create samples";
  if (!subscribedChannels || buffer.size() < kElementBytes) {
    fail(error, kKernelBadArgument, kFailure);
    return {};
  }
  KernelReturn status = kKernelError;
  plist::Dictionary samples;
  try {
    SampleExtractor extractor(buffer);
    samples = cloneAggregate(subscribedChannels,
                             [&](const plist::Dictionary& channel, plist::Dictionary& newChannel) {
                               return extractor.extractChannelSample(channel, newChannel);
                             });
    status = extractor.status();
  } catch (const std::bad_alloc&) {
    samples = {};
  }
  if (!samples) fail(error, status, kFailure);
  return samples;
}

}  // namespace tavrel
