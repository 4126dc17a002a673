// Names of submitted logs' files: "<name>-<stamp>-<unique>" and ".log" or ".metadata.plist".
//
// They show a log's name and the second in which it was filed without its metadata.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/plist.h"

namespace tavrel {

/// A log's name in the form in which a file name begins.
std::string plainLogName(std::string_view logName);

/// A file name, without ending, for a log filed now. Each call returns a new one.
std::string newLogFileName(std::string_view logName, plist::Date now);

struct LogFileName {
  /// In the form that `plainLogName` gives.
  std::string_view logName;
  std::int64_t seconds;  // since 1970, UTC

  bool operator==(const LogFileName&) const = default;
};

/// Parses a name without ending; the result borrows from it. Nothing for names of another form.
std::optional<LogFileName> parseLogFileName(std::string_view name);

}  // namespace tavrel
