// The record of the last run that did the tasks of a day, or that logged an error:
//
//   /var/lib/tavrel/last-run.plist
//     Time (date, when it began), Task ("daily", "forced", "today" or "service"; absent when
//     the process was not started for tasks), Day (integer, absent when no day's tasks began),
//     Finished (boolean), Ended (date), LastFinished (date, kept over runs that did not finish),
//     Errors (array of strings, the first ones), ErrorCount (integer), and Process, Started, Boot,
//     which identify the process
//
// docs/status.md describes it.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"
#include "base/plist.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/run_kind.h"

namespace tavrel {

inline constexpr std::string_view kLastRunFile = "/var/lib/tavrel/last-run.plist";

/// Identifies a process of this machine among all others, including those of earlier boots.
struct ProcessIdentity {
  std::int64_t process = 0;
  std::int64_t started = 0;  // ticks since boot
  std::string boot;          // its ID

  static ProcessIdentity ofThis();
  bool isRunning() const;
};

struct LastRun {
  static constexpr std::size_t kErrors = 10;
  static constexpr std::size_t kErrorBytes = 300;

  plist::Date began = plist::Date::since1970(0);
  std::optional<RunKind> kind;
  std::optional<std::int64_t> day;
  bool isFinished = false;
  std::optional<plist::Date> ended;
  std::optional<plist::Date> lastFinished;
  std::vector<std::string> errors;
  std::int64_t errorCount = 0;
  ProcessIdentity process;

  /// Keeps the first errors, each cut to its beginning; counts the others.
  void addError(std::string_view message);

  static Expected<std::optional<LastRun>> read(const DeviceRoot& root, FileSystem& files);
  Status write(const DeviceRoot& root, FileSystem& files) const;
};

}  // namespace tavrel
