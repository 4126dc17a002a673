// What the uploader remembers from run to run, in /var/lib/tavrel/upload/state.plist. Absent keys:
// it has not happened yet.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "base/expected.h"
#include "base/plist.h"
#include "platform/linux/files/file_system.h"
#include "platform/property_list_coding.h"
#include "platform/system_log.h"

namespace tavrel::upload {

struct State {
  std::optional<plist::Date> lastAttempt;  // of a run that sent, or tried to send, a log
  std::optional<plist::Date> lastSuccess;
  std::optional<plist::Date> lastFailure;
  std::optional<plist::Date> nextAttempt;  // not before; absent when nothing failed last
  std::string failure;                     // the last one, one line; empty once all went well
  std::int64_t failedAttempts = 0;         // in a row, for whatever reason
  std::int64_t failedTransfers = 0;        // in a row; the pause follows them
  std::int64_t sent = 0;                   // in all
  std::int64_t refused = 0;                // in all
};

inline constexpr const char* kStatePath = "/var/lib/tavrel/upload/state.plist";

/// What is known; a file that cannot be read is a line in the log, and nothing is known.
State readState(FileSystem& files, PropertyListCoding& propertyLists, SystemLog& log,
                const std::string& path);
Status writeState(FileSystem& files, PropertyListCoding& propertyLists, const std::string& path,
                  const State& state);

/// Seconds until the next attempt after so many failed transfers in a row, the last of which may
/// have brought a wish of the server (0: none). `chance`, from 0 to 1, spreads devices that failed
/// together.
double pauseSeconds(std::int64_t failedTransfers, std::int64_t serverWish, double chance);

/// Whether an attempt has to wait. A time that lies farther ahead than any pause was noted with
/// another clock.
bool mustWait(const State& state, plist::Date now);

}  // namespace tavrel::upload
