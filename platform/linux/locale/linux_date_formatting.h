// Dates as text, in the time zone of the device.
//
// The zone is what /etc/localtime says, under the device root when it is there, else on the
// machine, else UTC. Of the Unicode date-field patterns it knows yyyy, MM, dd, HH, mm, ss and Z;
// other letters are left as they are. All of them are digits, so that one locale prints as another.
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
