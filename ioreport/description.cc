#include "ioreport/description.h"

#include "base/format.h"
#include "base/limits.h"
#include "base/utf8.h"
#include "ioreport/allocation.h"
#include "ioreport/channel.h"
#include "ioreport/elements.h"
#include "ioreport/histogram_values.h"
#include "ioreport/sample_values.h"
#include "ioreport/state_values.h"
#include "ioreport/units.h"

namespace tavrel {
namespace {

// The longest text of an ID that stands for a channel's name.
constexpr std::size_t kChannelIDCharacters = 9;

std::string_view upToZeroByte(std::string_view text) {
  return text.substr(0, text.find('\0'));
}

// A name that can be printed; a malformed one cannot.
std::optional<std::string_view> usableName(std::optional<std::string_view> name) {
  if (!name || !isValidUtf8(*name)) return std::nullopt;
  return upToZeroByte(*name);
}

std::string nameOr(std::optional<std::string_view> name, std::uint64_t id, std::size_t longestID) {
  if (const auto usable = usableName(name)) return std::string(*usable);
  return format("%#llx", id).substr(0, longestID);
}

/// Describes the elements of one sample. Looks up their common properties once.
class SampleDescription {
 public:
  SampleDescription(const plist::Dictionary& channel, std::uint8_t channelFormat,
                    const Elements& elements, const char* prefix)
      : channel_(channel),
        format_(channelFormat),
        elements_(elements),
        checked_(elementsOfType(channel, channelFormat)),
        prefix_(prefix),
        name_(nameOr(IOReportChannelGetChannelName(channel), elements.channelID(0),
                     kChannelIDCharacters)),
        unitLabel_(textOrNull(IOReportChannelGetUnitLabel(channel))) {
    if (format_ != kFormatState) return;
    unit_ = static_cast<std::uint64_t>(IOReportChannelGetUnit(channel));
    stateNames_ = stateNames(channel);
    totalResidency_ = totalResidency(checked_);
  }

  std::optional<std::string> text() {
    for (std::size_t i = 0; i < elements_.count(); ++i) {
      if (!append(i) || text_.size() > limits::kDeviceAllocationBytes) return std::nullopt;
    }
    return text_;
  }

 private:
  bool append(std::size_t element) {
    switch (format_) {
      case kFormatSimple:
        return appendSimple();
      case kFormatState:
        return appendState(element);
      case kFormatHistogram:
        return appendBucket(element);
      case kFormatSimpleArray:
        text_ += "arrays unsupported?";
        return true;
      default:
        return false;
    }
  }

  bool appendSimple() {
    appendFormat(text_, "%s%32s = { %12lld %@ }\n", prefix_, name_,
                 IOReportSimpleGetIntegerValue(channel_), unitLabel_);
    return true;
  }

  bool appendState(std::size_t i) {
    const std::int64_t id = checked_.value(i, kStateID);
    const std::string name =
        nameOr(stateNames_.at(i).string(), static_cast<std::uint64_t>(id), std::string::npos);
    const auto residency = static_cast<std::uint64_t>(checked_.value(i, kStateResidency));
    const double duty = dutyCycle(checked_, i, totalResidency_);
    appendFormat(text_, "%s%20s[%8s] = { # %-8llu %9.3e %s / %4.1f%% }\n", prefix_, name_, name,
                 checked_.value(i, kStateInTransitions),
                 IOReportScaleValue(residency, unit_, kUnitSeconds), "s", duty * 100.0);
    return true;
  }

  bool appendBucket(std::size_t i) {
    std::int64_t lower = 0;
    std::int64_t upper = 0;
    const KernelReturn bounds =
        IOReportHistogramGetBucketBounds(channel_, static_cast<std::int32_t>(i), &lower, &upper);
    const std::int64_t hits = checked_.value(i, kBucketHits);
    if (bounds != kKernelSuccess || hits == kInvalidValue) return false;
    if (hits == 0) {
      appendFormat(text_, "%s%20s[%12lld - %12lld %@] = { <no hits>; # 0 }\n", prefix_, name_,
                   lower, upper, unitLabel_);
    } else {
      appendFormat(text_,
                   "%s%20s[%12lld - %12lld %@] = { m %12lld; M %12lld; s %12lld; # %12llu }\n",
                   prefix_, name_, lower, upper, unitLabel_, checked_.value(i, kBucketMinimum),
                   checked_.value(i, kBucketMaximum), checked_.value(i, kBucketSum), hits);
    }
    return true;
  }

  const plist::Dictionary& channel_;
  std::uint8_t format_;
  Elements elements_;
  Elements checked_;  // the same, but empty when accessors would not read them
  const char* prefix_;
  std::string name_;
  plist::Value unitLabel_;
  std::uint64_t unit_ = 0;
  plist::Array stateNames_;
  std::uint64_t totalResidency_ = 0;  // 0 when none is readable, so that there is no duty cycle
  std::string text_;
};

}  // namespace

std::optional<std::string> IOReportChannelCopyDescription(const plist::Dictionary& channel,
                                                          std::uint32_t, const char* linePrefix) {
  std::uint64_t type = 0;
  if (getChannelType(channel, type) != kKernelSuccess) return std::nullopt;
  return madeOrNull([&]() -> std::optional<std::string> {
    return format("%s%@ %@ < %#llx (%@) | G/g %@/%@ | cat %#04x | format %#04x | elts %u >\n",
                  linePrefix ? linePrefix : "", textOrNull(IOReportChannelGetDriverName(channel)),
                  textOrNull(IOReportChannelGetChannelName(channel)),
                  IOReportChannelGetChannelID(channel),
                  textOrNull(IOReportChannelGetUnitLabel(channel)),
                  IOReportChannelGetGroup(channel).value_or("(none)"),
                  IOReportChannelGetSubGroup(channel).value_or("(none)"), categoriesOf(type),
                  formatOf(type), elementCountOf(type));
  });
}

std::optional<std::string> IOReportSampleCopyDescription(const plist::Dictionary& channel,
                                                         std::uint32_t, const char* linePrefix) {
  std::uint64_t type = 0;
  if (getChannelType(channel, type) != kKernelSuccess) return std::nullopt;
  const Elements elements = getRawElements(channel, formatOf(type));
  if (!elements) return std::nullopt;
  return madeOrNull([&] {
    return SampleDescription(channel, formatOf(type), elements, linePrefix ? linePrefix : "")
        .text();
  });
}

KernelReturn IOReportWriteStringUTF8(DescriptorWriter& writer, int descriptor,
                                     std::optional<std::string_view> string) {
  if (!string) return kKernelBadArgument;
  std::string_view text = upToZeroByte(*string);
  std::optional<std::string> repaired;
  if (!isValidUtf8(text)) {
    repaired = madeOrNull([&] { return std::optional(repairedUtf8(text)); });
    if (!repaired) return kKernelNoMemory;
    text = *repaired;
  }
  const std::ptrdiff_t written = writer.write(descriptor, asBytes(text));
  if (written < 0) return kKernelIOError;
  const auto length = static_cast<std::size_t>(written);
  if (length < text.size()) return kKernelUnderrun;
  return length == text.size() ? kKernelSuccess : kKernelError;
}

}  // namespace tavrel
