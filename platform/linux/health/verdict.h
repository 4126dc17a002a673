// The verdict on a drive, from its figures.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "platform/linux/health/reading.h"

namespace tavrel::health {

/// Bits, also in the exit status of `tavrelctl disks`, whose lowest two bits are the tool's own.
enum Problem : std::uint8_t {
  kUnread = 4,   // the drive could not be read, or has not been read yet
  kFailing = 8,  // the drive itself says that it fails
  kWorn = 16,    // its endurance or its reserve is used up
  kErrors = 32,  // it has lost data, or is about to
  kOld = 64,     // the reading is from an earlier boot or older than two days
};

struct Verdict {
  std::uint8_t problems = 0;
  std::vector<std::string> reasons;

  /// "good", or the gravest of "failing", "worn", "errors" and "unknown"; an old reading alone
  /// changes nothing.
  const char* word() const;
};

/// `boot` is the present one, empty when unknown.
Verdict judge(const Reading& reading, std::int64_t nowSeconds, const std::string& boot);

}  // namespace tavrel::health
