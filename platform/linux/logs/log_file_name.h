// Files of submitted logs: "<name>-<stamp>-<unique>", followed by ".log" or ".metadata.plist".
//
// So a log's name and the second in which it was filed are known without its metadata.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/plist.h"

namespace tavrel {

/// A log's name as the beginning of a file's name.
std::string plainLogName(std::string_view logName);

/// A name, without ending, for a log that is filed now. Each call gives another.
std::string newLogFileName(std::string_view logName, plist::Date now);

struct LogFileName {
  /// In the form that `plainLogName` gives.
  std::string_view logName;
  std::int64_t seconds;  // since 1970, UTC

  bool operator==(const LogFileName&) const = default;
};

/// Reads a name without ending, which the result borrows. Nothing for names of another form.
std::optional<LogFileName> parseLogFileName(std::string_view name);

}  // namespace tavrel
