// How much counters have grown since the previous daily run.
//
// The reader remembers each drive by its identity, so a drive moved to another port goes on
// counting, and a new one in its place starts from zero. Between two readings a counter grows by
// their difference. A counter that the kernel keeps restarts at 0 in every boot, and whenever it
// goes back. A counter of the drive that goes back has no growth until the next daily run: nobody
// knows what was lost.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <set>
#include <string>

#include "base/bytes.h"
#include "base/expected.h"
#include "platform/linux/health/figure.h"

namespace tavrel::health {

struct DriveMemory {
  std::string boot;
  std::int64_t seen = 0;               // seconds since 1970
  std::optional<std::int64_t> runDay;  // the last daily run before the last reading
  bool isCounting = false;             // a daily run has passed between two readings
  std::map<std::string, std::int64_t, std::less<>> last;
  std::map<std::string, std::int64_t, std::less<>> grown;
  std::set<std::string, std::less<>> lost;  // counters whose growth is unknown
};

/// Facts common to the readings of one moment.
struct Moment {
  std::int64_t seconds = 0;            // since 1970
  std::string boot;                    // its ID
  std::optional<std::int64_t> runDay;  // the day of the last daily run
};

/// Adds a reading to the memory; returns the growth of its counters, as figures of the same kinds.
Figures takeGrowth(DriveMemory& memory, const Figures& figures, const Moment& moment);

/// All that the reader remembers.
struct Memory {
  std::map<std::string, DriveMemory, std::less<>> drives;  // by identity
  std::map<std::string, bool, std::less<>> hasOcpLog;      // by model and firmware

  /// Drops drives last seen more than `limits::kDriveMemorySeconds` ago. True when there were any.
  bool forgetOld(std::int64_t now);
};

Expected<std::string> encodeMemory(const Memory& memory);
Expected<Memory> decodeMemory(ByteSpan document);

}  // namespace tavrel::health
