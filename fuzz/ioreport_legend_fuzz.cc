// Discovers what a driver publishes as its legend, and channels that it is asked for. Whatever is
// found can be counted, regrouped, selected and described.
//
// Input: a byte of options, the legend.
#include "reporting_values.h"

namespace {

using namespace tavrel;
using plist::Dictionary;

struct Driver : DriverService {
  plist::Value legend;

  KernelReturn entryID(std::uint64_t& id) override {
    id = 7;
    return kKernelSuccess;
  }
  KernelReturn name(std::string& text) override {
    text = "disk";
    return kKernelSuccess;
  }
  std::uint32_t userRetainCount() override { return 1; }
  plist::Value property(std::string_view key) override {
    return key == "IOReportLegend" ? legend : plist::Value(true);
  }
  plist::Value searchProperty(std::string_view, std::string_view) override { return {}; }
  KernelReturn open(std::uint32_t, std::unique_ptr<UserClient>&) override { return kKernelError; }
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::ValueReader reader(std::as_bytes(std::span(data, size)));
  const auto options = static_cast<std::int32_t>(reader.word(1) % 4);
  Driver driver;
  driver.legend = reader.value();
  const plist::Value before = plist::deepCopy(driver.legend);

  std::optional<ErrorObject> error;
  const Dictionary channels = IOReportCopyChannelsForDriver(&driver, options, &error);
  fuzz::require(static_cast<bool>(channels) != error.has_value());
  fuzz::require(driver.legend == before);
  if (!channels) return 0;

  const std::int32_t count = IOReportGetChannelCount(channels);
  fuzz::require(count >= 0);
  const Dictionary flat = IOReportCreateAggregate(0);
  fuzz::require(IOReportMergeChannels(flat, channels, nullptr) == kIterateContinue);
  fuzz::require(static_cast<std::int32_t>(flat.array("IOReportChannels").size()) == count);
  IOReportIterate(flat, [](const Dictionary& channel) {
    fuzz::examine(channel);
    return kIterateContinue;
  });
  fuzz::require(!walkFailed(IOReportSelectChannelsInGroup(channels, "a", std::nullopt, nullptr)));
  fuzz::require(IOReportGetChannelCount(channels) <= count);
  return 0;
}
