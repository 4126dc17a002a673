// The system that the device runs.
#pragma once

#include <string_view>

#include "base/plist.h"

namespace tavrel {

inline constexpr std::string_view kProductNameKey = "ProductName";
inline constexpr std::string_view kProductVersionKey = "ProductVersion";
inline constexpr std::string_view kProductBuildVersionKey = "ProductBuildVersion";

class SystemVersion {
 public:
  virtual ~SystemVersion() = default;
  /// Strings under the keys above; unknown ones are absent.
  virtual plist::Dictionary systemVersionDictionary() = 0;
};

}  // namespace tavrel
