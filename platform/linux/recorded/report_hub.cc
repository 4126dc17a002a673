#include "platform/linux/recorded/report_hub.h"

#include <algorithm>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "base/limits.h"
#include "platform/linux/recorded/shared_buffer.h"
#include "platform/linux/recorded/typed_fields.h"
#include "platform/report_protocol.h"

namespace tavrel {
namespace {

constexpr std::uint32_t kOpen = kIOReportUserClientOpen;
constexpr std::uint32_t kConfigure = kIOReportUserClientConfigureInterests;
constexpr std::uint32_t kUpdate = kIOReportUserClientUpdateKernelBuffer;

// The channel ID that readers take as absent. With driver 0, such a group does not even match a
// channel that lacks both IDs.
constexpr std::uint64_t kNoChannel = std::uint64_t{1} << 63;
constexpr std::size_t kLargestGroupElements = 0xFFFF;

// Fills all of `rest` with groups that belong to no channel.
void fillWithNothing(MutableByteSpan rest) {
  std::fill(rest.begin(), rest.end(), std::byte{0});
  while (!rest.empty()) {
    const std::size_t count = std::min(rest.size() / kElementBytes, kLargestGroupElements);
    storeLittle64(rest, kElementChannel, kNoChannel);
    storeLittle16(rest, kElementGroupCount, static_cast<std::uint16_t>(count));
    rest = rest.subspan(count * kElementBytes);
  }
}

// A channel that the hub knows: a recorded one or, when null, the next live one.
struct Interest {
  const HubChannel* recorded;
};

class ReportHubClient final : public UserClient {
 public:
  ReportHubClient(std::shared_ptr<const Recording> recording, plist::Dictionary hub, SystemLog& log)
      : recording_(std::move(recording)), hub_(std::move(hub)), log_(log) {}

  KernelReturn callMethod(std::uint32_t selector, std::span<const std::uint64_t> scalarInput,
                          ByteSpan structureInput, std::span<std::uint64_t> scalarOutput,
                          MutableByteSpan structureOutput,
                          std::size_t& structureOutputLength) override {
    if (isClosed_) return kKernelBadArgument;
    const KernelReturn refusal =
        returnCodeOf(hub_.dictionary("MethodErrors"), std::to_string(selector));
    if (refusal != kKernelSuccess) return refusal;
    const std::size_t inputs = selector == kUpdate ? 1 : 0;
    const std::size_t outputs = selector == kConfigure ? 1 : 0;
    const bool fits = scalarInput.size() == inputs && scalarOutput.size() == outputs &&
                      structureOutput.empty() && (selector == kConfigure || structureInput.empty());
    if (!fits || (selector != kOpen && !isOpen_)) return kKernelBadArgument;

    KernelReturn result = kKernelBadArgument;
    if (selector == kOpen) {
      isOpen_ = true;
      result = kKernelSuccess;
    } else if (selector == kConfigure) {
      result = configure(structureInput, scalarOutput[0]);
    } else if (selector == kUpdate) {
      result = update(scalarInput[0]);
    }
    if (result == kKernelSuccess) structureOutputLength = 0;
    return result;
  }

  KernelReturn mapMemory(std::uint32_t memoryType, std::unique_ptr<MappedMemory>& mapped) override {
    const KernelReturn refusal = returnCodeOf(hub_, "MapError");
    if (refusal != kKernelSuccess) return refusal;
    if (isClosed_ || !buffer_ || memoryType != bufferID_) return kKernelBadArgument;
    auto mapping = buffer_->map();
    if (!mapping) return failFor(mapping.error());
    mapped = *std::move(mapping);
    return kKernelSuccess;
  }

  KernelReturn close() override {
    if (std::exchange(isClosed_, true)) return kKernelBadArgument;
    buffer_.reset();
    return returnCodeOf(hub_, "CloseError");
  }

 private:
  // False for a recorded service that replaces a live one, although their ids may be equal.
  bool isLive(std::uint64_t driver) const {
    const RecordedEntry* const service = recording_->serviceWithID(driver);
    return service && service->isLive;
  }

  KernelReturn failFor(const Error& error) {
    log_.write(LogLevel::Error, error.message);
    return kKernelNoMemory;
  }

  // A later call replaces the buffer; mappings of the earlier buffer stay valid.
  KernelReturn configure(ByteSpan interests, std::uint64_t& bufferID) {
    const auto count = loadLittle32(interests, 0);
    if (!count || loadLittle32(interests, 4) != 0U ||
        interests.size() != kInterestHeaderBytes + std::uint64_t{*count} * kInterestBytes) {
      return kKernelBadArgument;
    }
    std::vector<Interest> channels;
    auto live = recording_->live() ? recording_->live()->subscribe() : nullptr;
    std::uint64_t bytes = 0;
    for (std::size_t at = kInterestHeaderBytes; at < interests.size(); at += kInterestBytes) {
      const std::uint64_t driver = *loadLittle64(interests, at);
      const std::uint64_t id = *loadLittle64(interests, at + 8);
      const HubChannel* const channel = recording_->hubChannels().find(driver, id);
      std::size_t size = 0;
      if (channel) {
        size = channel->largestGroup();
      } else if (live && isLive(driver)) {
        size = live->add(driver, id);
      }
      if (size == 0) continue;
      bytes += size;
      if (bytes > limits::kDeviceAllocationBytes) return kKernelNoMemory;
      channels.push_back({channel});
    }
    auto buffer = SharedBuffer::create(std::max(static_cast<std::size_t>(bytes), kElementBytes));
    if (!buffer) return failFor(buffer.error());
    buffer_ = *std::move(buffer);
    channels_ = std::move(channels);
    live_ = std::move(live);
    updates_ = 0;
    bufferID = ++bufferID_;
    return kKernelSuccess;
  }

  KernelReturn update(std::uint64_t bufferID) {
    if (!buffer_ || bufferID != bufferID_) return kKernelBadArgument;
    MutableByteSpan rest = buffer_->bytes();
    if (live_) live_->update();
    std::size_t liveIndex = 0;
    for (const Interest& interest : channels_) {
      std::size_t written = 0;
      if (interest.recorded) {
        const ByteSpan group = interest.recorded->group(updates_);
        std::copy(group.begin(), group.end(), rest.begin());
        written = group.size();
      } else {
        written = live_->write(liveIndex++, rest);
      }
      rest = rest.subspan(written);
    }
    fillWithNothing(rest);
    ++updates_;
    return kKernelSuccess;
  }

  const std::shared_ptr<const Recording> recording_;
  const plist::Dictionary hub_;
  SystemLog& log_;
  bool isOpen_ = false;
  bool isClosed_ = false;
  std::optional<SharedBuffer> buffer_;
  std::uint32_t bufferID_ = 0;
  std::vector<Interest> channels_;  // in the order of interest
  std::unique_ptr<LiveSampling> live_;
  std::size_t updates_ = 0;
};

}  // namespace

std::unique_ptr<UserClient> connectToReportHub(std::shared_ptr<const Recording> recording,
                                               const plist::Dictionary& hub, SystemLog& log) {
  return std::make_unique<ReportHubClient>(std::move(recording), hub, log);
}

}  // namespace tavrel
