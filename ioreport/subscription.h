// A subscription: channels whose values the kernel's reporting hub keeps for this process in shared
// memory.
//
//   plist::Dictionary subscribed;
//   auto subscription = IOReportCreateSubscription(drivers, nullptr, channels, &subscribed, 0,
//                                                  &error);
//   auto samples = IOReportCreateSamples(subscription.get(), subscribed, &error);
//
// The hub writes to the shared memory only on request; each call of `IOReportCreateSamples` is one.
// Only one thread at a time may use a subscription.
#pragma once

#include <cstdint>
#include <memory>
#include <memory_resource>
#include <optional>
#include <vector>

#include "base/bytes.h"
#include "base/plist.h"
#include "ioreport/error_object.h"
#include "ioreport/iteration.h"
#include "platform/driver_registry.h"

namespace tavrel {

/// The connection to the hub, and the buffer that it shares. The destructor releases both.
class IOReportSubscription {
 public:
  IOReportSubscription() = default;
  IOReportSubscription(const IOReportSubscription&) = delete;
  IOReportSubscription& operator=(const IOReportSubscription&) = delete;
  ~IOReportSubscription() { subscriptionFinalize(); }

  /// The elements at the last update. Borrowed from the subscription.
  ByteSpan buffer() const { return buffer_ ? buffer_->bytes() : ByteSpan(); }

 private:
  friend std::shared_ptr<IOReportSubscription> IOReportCreateSubscription(
      DriverRegistry& drivers, std::pmr::memory_resource* allocationContext,
      const plist::Dictionary& desiredChannels, plist::Dictionary* subscribedChannels,
      std::uint32_t reserved, ErrorOut error);
  friend KernelReturn updateKernelBuffer(const IOReportSubscription& subscription, ErrorOut error);

  KernelReturn connect(DriverRegistry& drivers, ByteSpan interests, ErrorOut error);
  void subscriptionFinalize();

  std::unique_ptr<UserClient> connection_;
  std::unique_ptr<MappedMemory> buffer_;
  std::uint64_t bufferID_ = 0;  // its low 32 bits are the memory type
};

/// Subscribes to channels and returns a copy of them for sampling, which is the caller's own. The
/// subscription lives in memory of the allocation context, which must outlive it; null means the
/// default. The reserved value is ignored.
std::shared_ptr<IOReportSubscription> IOReportCreateSubscription(
    DriverRegistry& drivers, std::pmr::memory_resource* allocationContext,
    const plist::Dictionary& desiredChannels, plist::Dictionary* subscribedChannels,
    std::uint32_t reserved, ErrorOut error);

/// Makes the hub write the current elements of all channels to the shared buffer.
KernelReturn updateKernelBuffer(const IOReportSubscription& subscription, ErrorOut error);

/// The list of channels of interest for the hub, complete with `count` entries. It allocates memory
/// as it fills.
class InterestList {
 public:
  explicit InterestList(std::size_t count);

  /// Writes the next entry. Stops at a channel that cannot be subscribed to, and when the list is
  /// full.
  IterateResult addInterest(const plist::Dictionary& channel);
  bool isComplete() const { return bytes_.size() == completeBytes_; }
  ByteSpan bytes() const { return bytes_; }

 private:
  std::vector<std::byte> bytes_;
  std::size_t completeBytes_;
};

/// Nothing when one of the channels lacks an ID or a type, or there are more channels than the hub
/// accepts.
std::optional<InterestList> createInterestList(const plist::Dictionary& channels,
                                               std::int32_t count);

}  // namespace tavrel
