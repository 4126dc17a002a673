// The device-answers query: facts about the device, looked up by the name of the question.
#pragma once

#include <string_view>

#include "base/plist.h"

namespace tavrel {

/// Keys of the answer to "DiskUsage", in bytes.
inline constexpr std::string_view kSQQDiskUsageTotalDiskCapacity = "TotalDiskCapacity";
inline constexpr std::string_view kSQQDiskUsageTotalDataAvailable = "TotalDataAvailable";

class DeviceAnswers {
 public:
  virtual ~DeviceAnswers() = default;

  /// Null when the device has no answer. The answer is the caller's own.
  virtual plist::Value SQCopyAnswer(std::string_view question) = 0;

  /// The answer when it is a boolean, otherwise false.
  bool SQGetBoolAnswer(std::string_view question) {
    return SQCopyAnswer(question).boolean().value_or(false);
  }
};

}  // namespace tavrel
