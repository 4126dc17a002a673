// A log that the platform in memory keeps instead of submitting it.
#pragma once

#include <string>

#include "base/plist.h"

namespace tavrel {

/// A log that was handed to the submission service.
struct CapturedLog {
  std::string type;
  std::string name;
  plist::Dictionary options;  // an empty handle for none
  std::string bytes;
};

}  // namespace tavrel
