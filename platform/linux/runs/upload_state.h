// What the uploader remembers between runs, in /var/lib/tavrel/upload/state.plist. An absent key
// means that it has not happened yet.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/expected.h"
#include "base/plist.h"
#include "platform/linux/files/file_system.h"
#include "platform/property_list_coding.h"
#include "platform/system_log.h"

namespace tavrel {

struct UploadState {
  std::optional<plist::Date> lastAttempt;  // of a run that sent a log, or tried to
  std::optional<plist::Date> lastSuccess;
  std::optional<plist::Date> lastFailure;
  std::optional<plist::Date> nextAttempt;  // the earliest; absent after a failure is over
  std::string failure;                     // the latest, one line; empty once it is over
  std::int64_t failedAttempts = 0;         // in a row, for whatever reason
  std::int64_t failedTransfers = 0;        // in a row; determines the pause
  std::int64_t sent = 0;                   // in total
  std::int64_t refused = 0;                // in total

  bool hasFailure() const { return !failure.empty() || failedAttempts > 0 || nextAttempt; }
};

inline constexpr std::string_view kUploadStateFile = "/var/lib/tavrel/upload/state.plist";

UploadState uploadStateOf(const plist::Dictionary& stored);
/// The stored state. When the file is unreadable, logs a line and returns an empty state.
UploadState readUploadState(FileSystem& files, PropertyListCoding& propertyLists, SystemLog& log,
                            const std::string& path);
Status writeUploadState(FileSystem& files, PropertyListCoding& propertyLists,
                        const std::string& path, const UploadState& state);

}  // namespace tavrel
