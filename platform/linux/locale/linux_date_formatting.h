// Dates as text, in the time zone of the device.
//
// The zone comes from /etc/localtime, under the device root or else on the machine, and defaults to
// UTC. Of the Unicode date-field patterns it supports yyyy, MM, dd, HH, mm, ss and Z; other letters
// stay unchanged. All fields are digits, so all locales print alike.
#pragma once

#include "platform/date_formatting.h"
#include "platform/linux/files/device_root.h"

namespace tavrel {

class LinuxDateFormatting final : public DateFormatting {
 public:
  explicit LinuxDateFormatting(const DeviceRoot& root) : root_(root) {}

  std::string format(plist::Date date, std::string_view pattern, std::string_view locale) override;

 private:
  const DeviceRoot& root_;
};

}  // namespace tavrel
