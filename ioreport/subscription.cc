#include "ioreport/subscription.h"

#include "ioreport/allocation.h"
#include "ioreport/channel.h"
#include "platform/report_protocol.h"

namespace tavrel {
namespace {

// The most channels of interest, so that their list stays below 2^31 bytes.
constexpr std::int32_t kMostInterests = 0x555554D;

KernelReturn callHub(UserClient& connection, std::uint32_t method,
                     std::span<const std::uint64_t> scalarInput = {}, ByteSpan structureInput = {},
                     std::span<std::uint64_t> scalarOutput = {}) {
  std::size_t structureLength = 0;
  return connection.callMethod(method, scalarInput, structureInput, scalarOutput, {},
                               structureLength);
}

}  // namespace

InterestList::InterestList(std::size_t count)
    : bytes_(kInterestHeaderBytes), completeBytes_(kInterestHeaderBytes + kInterestBytes * count) {
  storeLittle32(bytes_, 0, static_cast<std::uint32_t>(count));
}

IterateResult InterestList::addInterest(const plist::Dictionary& channel) {
  const std::int64_t driverID = IOReportChannelGetDriverID(channel);
  const std::int64_t channelID = IOReportChannelGetChannelID(channel);
  std::uint64_t type = 0;
  if (driverID == kInvalidValue || channelID == kInvalidValue ||
      getChannelType(channel, type) != kKernelSuccess || isComplete()) {
    return kIterateStop;
  }
  const std::size_t entry = bytes_.size();
  bytes_.resize(entry + kInterestBytes);
  storeLittle64(bytes_, entry, static_cast<std::uint64_t>(driverID));
  storeLittle64(bytes_, entry + 8, static_cast<std::uint64_t>(channelID));
  storeLittle64(bytes_, entry + 16, type);
  return kIterateContinue;
}

std::optional<InterestList> createInterestList(const plist::Dictionary& channels,
                                               std::int32_t count) {
  if (count < 0 || count > kMostInterests) return std::nullopt;
  return madeOrNull([&]() -> std::optional<InterestList> {
    InterestList list(static_cast<std::size_t>(count));
    const IterateResult walk = IOReportIterate(
        channels, [&](const plist::Dictionary& channel) { return list.addInterest(channel); });
    if (walkFailed(walk) || !list.isComplete()) return std::nullopt;
    return list;
  });
}

KernelReturn IOReportSubscription::connect(DriverRegistry& drivers, ByteSpan interests,
                                           ErrorOut error) {
  const auto hub = drivers.firstService(kReportHubClass);
  if (!hub) return fail(error, kKernelNotFound, nullptr);
  std::unique_ptr<UserClient> connection;
  KernelReturn result = hub->open(0, connection);
  if (result != kKernelSuccess || !connection) {
    return fail(error, result ? result : kKernelError, "Could not open IOReportHub");
  }
  result = callHub(*connection, kIOReportUserClientOpen);
  if (result != kKernelSuccess) return fail(error, result, "kIOReportUserClientOpen failed");
  connection_ = std::move(connection);
  result = callHub(*connection_, kIOReportUserClientConfigureInterests, {}, interests,
                   std::span(&bufferID_, 1));
  if (result != kKernelSuccess) {
    return fail(error, result, "kIOReportUserClientConfigureInterests failed");
  }
  result = connection_->mapMemory(static_cast<std::uint32_t>(bufferID_), buffer_);
  if (result != kKernelSuccess) return fail(error, result, "IOConnectMapMemory() failed");
  return kKernelSuccess;
}

void IOReportSubscription::subscriptionFinalize() {
  buffer_.reset();
  connection_.reset();
}

std::shared_ptr<IOReportSubscription> IOReportCreateSubscription(
    DriverRegistry& drivers, std::pmr::memory_resource* allocationContext,
    const plist::Dictionary& desiredChannels, plist::Dictionary* subscribedChannels, std::uint32_t,
    ErrorOut error) {
  using Subscription = std::shared_ptr<IOReportSubscription>;
  const auto failed = [&](KernelReturn code, const char* text) {
    fail(error, code, text);
    return Subscription();
  };
  if (!desiredChannels || !subscribedChannels) return failed(kKernelBadArgument, "bad arguments");
  const std::int32_t count = IOReportGetChannelCount(desiredChannels);
  if (count < 0) return failed(kKernelBadArgument, "iteration error");
  if (count == 0) return failed(kKernelBadArgument, "no channels");
  const auto interests = createInterestList(desiredChannels, count);
  if (!interests) return failed(kKernelNoMemory, "createInterestList() failed");

  const Subscription subscription = madeOrNull([&] {
    const std::pmr::polymorphic_allocator<IOReportSubscription> allocator(
        allocationContext ? allocationContext : std::pmr::get_default_resource());
    return std::allocate_shared<IOReportSubscription>(allocator);
  });
  if (!subscription) return failed(kKernelNoMemory, nullptr);
  if (subscription->connect(drivers, interests->bytes(), error) != kKernelSuccess) return {};

  const plist::Dictionary subscribed =
      cloneAggregate(desiredChannels,
                     [](const plist::Dictionary&, plist::Dictionary&) { return kIterateContinue; });
  if (!subscribed) return failed(kKernelNoMemory, nullptr);
  *subscribedChannels = subscribed;
  return subscription;
}

KernelReturn updateKernelBuffer(const IOReportSubscription& subscription, ErrorOut error) {
  if (!subscription.connection_) return fail(error, kKernelBadArgument, nullptr);
  const KernelReturn result =
      callHub(*subscription.connection_, kIOReportUserClientUpdateKernelBuffer,
              std::span(&subscription.bufferID_, 1));
  return result == kKernelSuccess ? result : fail(error, result, nullptr);
}

}  // namespace tavrel
