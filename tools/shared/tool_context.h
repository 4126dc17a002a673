// What each subcommand of tavrelctl gets: the device, the streams, and ways to end.
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

#include <cstddef>
#include <iosfwd>
#include <memory>
#include <nlohmann/json_fwd.hpp>
#include <optional>
#include <string>
#include <string_view>

#include "tools/shared/command.h"
#include "tools/shared/page.h"

namespace tavrel {

class DeviceRoot;
class FilePreferences;
class LinuxPlatform;
class SqliteStore;
struct Platform;

/// JSON whose objects keep the order in which their members were added.
using Json = nlohmann::ordered_json;

/// The version of the JSON forms that the tool prints. It grows when a member changes its meaning
/// or is removed; new members do not change it.
inline constexpr int kJsonFormatVersion = 1;

/// `object` with "format_version" as its first member.
Json withFormatVersion(Json object);
/// `value` as text, indented by so many spaces, or on one line for -1. Malformed UTF-8 in it is
/// repaired.
std::string jsonText(const Json& value, int indent);

enum ExitStatus : int { kExitSuccess = 0, kExitFailure = 1, kExitUsage = 2 };

/// Standard streams, and the properties of their terminal.
struct ToolStreams {
  std::istream& in;
  std::ostream& out;
  std::ostream& error;
  /// Columns of the terminal to which `out` writes; nothing when it is not a terminal, and lines
  /// are then never cut.
  std::optional<std::size_t> columns = std::nullopt;
  bool errorIsTerminal = false;
  bool inIsTerminal = false;
  /// Whether `out` is a terminal that shows colours to a user who wants them.
  bool outIsColoured = false;
};

class ToolContext {
 public:
  explicit ToolContext(const ToolStreams& streams);
  ToolContext(const ToolContext&) = delete;
  ToolContext& operator=(const ToolContext&) = delete;
  ~ToolContext();

  // -- The device --------------------------------------------------------------------------------

  /// The folder that `--root` names, otherwise the one of the environment, otherwise "/". Throws
  /// std::runtime_error when the folder does not exist; `runTavrelctl` turns that into a failure.
  const DeviceRoot& root();
  /// Built over `root()` on the first call; include platform/linux/linux_platform.h to use it. Log
  /// lines of its services appear as notes.
  LinuxPlatform& linuxPlatform();
  Platform& platform();
  FilePreferences& preferences();
  /// The device's store, for reading only: a damaged one stays in place for the next run.
  SqliteStore& storeForReading();
  /// Whether a service of the device has logged an error.
  bool hasComplaints() const { return hasComplaints_; }
  /// Set by `--root`; takes effect on the first use of the device.
  void setRoot(std::string folder) { rootFolder_ = std::move(folder); }

  // -- Streams -----------------------------------------------------------------------------------

  std::istream& in() { return streams_.in; }
  std::ostream& out() { return streams_.out; }
  std::ostream& error() { return streams_.error; }
  /// `out()` with what is known of its terminal.
  Page page() { return {streams_.out, streams_.columns, streams_.outIsColoured}; }
  /// Nothing in a pipe.
  std::optional<std::size_t> columns() const { return streams_.columns; }
  /// Whether to show progress of long work, on `error()`.
  bool showsProgress() const { return streams_.errorIsTerminal; }
  /// Whether somebody can read a question and answer it.
  bool canAsk() const { return streams_.inIsTerminal && streams_.errorIsTerminal; }

  // -- JSON --------------------------------------------------------------------------------------

  /// Adds `--json` to a subcommand that prints data.
  void addJsonOption(Command command);
  bool json() const { return json_; }
  /// Prints `object` as an indented document that begins with the member "format_version".
  void printJson(Json object);

  // -- Ends --------------------------------------------------------------------------------------

  /// Prints "tavrelctl: MESSAGE" as one line on `error()` and makes the exit status 1. The message
  /// says what, where and what to do: "cannot read whitelist: /x: Permission denied: run as root".
  void fail(std::string_view message);
  /// The same with exit status 2, for arguments that only the subcommand can judge.
  void failUsage(std::string_view message);
  /// A line that does not change the exit status.
  void note(std::string_view message);

  int exitStatus() const { return exitStatus_; }
  void setExitStatus(int status) { exitStatus_ = status; }

 private:
  class NotingLog;
  struct Services;

  void printLine(std::string_view message);
  Services& services();

  ToolStreams streams_;
  std::optional<std::string> rootFolder_;
  std::unique_ptr<DeviceRoot> root_;
  bool json_ = false;
  bool hasComplaints_ = false;
  int exitStatus_ = kExitSuccess;
  std::unique_ptr<Services> services_;  // uses all of the above
};

}  // namespace tavrel
