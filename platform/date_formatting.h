// Dates as text by an explicit pattern and locale, in the device's time zone.
#pragma once

#include <string>
#include <string_view>

#include "base/plist.h"

namespace tavrel {

class DateFormatting {
 public:
  virtual ~DateFormatting() = default;
  /// `pattern` holds Unicode date-field patterns, such as "yyyy-MM-dd HH:mm:ss Z".
  virtual std::string format(plist::Date date, std::string_view pattern,
                             std::string_view locale) = 0;
};

}  // namespace tavrel
