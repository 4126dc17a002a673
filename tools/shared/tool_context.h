// What each subcommand of tavrelctl gets: the device, and tools/console/tool_output.h.
//
// A group of subcommands registers itself with `void addXxxCommands(Command app, ToolContext&)`:
//
//   const Command list = group.addCommand("list", "List the pending logs");
//   auto options = std::make_shared<ListOptions>();        // lives as long as the callback
//   context.addJsonOption(list);
//   list.onRun([&context, options] {
//     const auto logs = findLogs(context.root());
//     if (!logs) return context.fail(logs.error().message);
//     if (context.json()) return context.printJson({{"logs", toJson(*logs)}});
//     context.out() << ...;
//   });
//
// `runTavrelctl` (tools/tavrelctl.h) owns the context; the streams are the caller's.
#pragma once

#include <memory>
#include <optional>
#include <set>
#include <string>
#include <string_view>

#include "tools/console/tool_output.h"

namespace tavrel {

class DeviceRoot;
class FilePreferences;
class LinuxPlatform;
class SqliteStore;
struct Platform;

class ToolContext : public ToolOutput {
 public:
  explicit ToolContext(const ToolStreams& streams);
  ~ToolContext();

  /// The folder given by `--root`, else by the environment, else "/". Throws std::runtime_error
  /// when the folder does not exist; `runTavrelctl` turns that into a failure.
  const DeviceRoot& root();
  /// Built over `root()` on the first call; include platform/linux/linux_platform.h to use it. Log
  /// lines of its services appear as notes, equal ones once.
  LinuxPlatform& linuxPlatform();
  Platform& platform();
  FilePreferences& preferences();
  /// The device's store, opened read-only: a damaged one stays in place for the next run.
  SqliteStore& storeForReading();
  /// `fail`, but shows a line only once, also when it was a note of a service. For what each
  /// reading of the device finds again.
  void failOnce(std::string_view message);
  /// Whether a service of the device has logged an error.
  bool hasComplaints() const { return hasComplaints_; }
  /// Set by `--root`; takes effect on the first use of the device.
  void setRoot(std::string folder) { rootFolder_ = std::move(folder); }

 private:
  class NotingLog;
  struct Services;

  Services& services();
  bool isNew(std::string_view message) { return shown_.emplace(message).second; }

  std::optional<std::string> rootFolder_;
  std::unique_ptr<DeviceRoot> root_;
  bool hasComplaints_ = false;
  std::set<std::string> shown_;
  std::unique_ptr<Services> services_;  // uses all of the above
};

}  // namespace tavrel
