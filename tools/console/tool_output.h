// A subcommand's output and exit status: standard streams, JSON, failures.
#pragma once

#include <cstddef>
#include <iosfwd>
#include <nlohmann/json_fwd.hpp>
#include <optional>
#include <string>
#include <string_view>

#include "tools/console/command.h"
#include "tools/console/page.h"

namespace tavrel {

/// JSON whose objects keep the order in which their members were added.
using Json = nlohmann::ordered_json;

/// The version of the JSON that the tools print. It increases when a member is removed or changes
/// its meaning; new members do not change it.
inline constexpr int kJsonFormatVersion = 1;

/// `object` with "format_version" as its first member.
Json withFormatVersion(Json object);
/// `value` as text, indented by `indent` spaces, or on a single line when `indent` is -1. Malformed
/// UTF-8 is repaired.
std::string jsonText(const Json& value, int indent);

enum ExitStatus : int { kExitSuccess = 0, kExitFailure = 1, kExitUsage = 2 };

/// The standard streams, and the properties of their terminal.
struct ToolStreams {
  std::istream& in;
  std::ostream& out;
  std::ostream& error;
  /// The width of the terminal that `out` writes to; nothing when it is not a terminal, and
  /// lines are then never cut.
  std::optional<std::size_t> columns = std::nullopt;
  bool errorIsTerminal = false;
  /// Whether the journal reads `error`: it takes the priority of a line from its first characters.
  bool errorIsJournal = false;
  bool inIsTerminal = false;
  /// Whether `out` is a terminal that shows colours and the user wants them.
  bool outIsColoured = false;
};

/// The streams of this process.
ToolStreams standardStreams();

class ToolOutput {
 public:
  /// `program` begins each line on `error()`; the string must outlive this object.
  ToolOutput(const char* program, const ToolStreams& streams)
      : program_(program), streams_(streams) {}
  ToolOutput(const ToolOutput&) = delete;
  ToolOutput& operator=(const ToolOutput&) = delete;

  // -- Streams -----------------------------------------------------------------------------------

  std::istream& in() { return streams_.in; }
  std::ostream& out() { return streams_.out; }
  std::ostream& error() { return streams_.error; }
  /// `out()` with what is known about its terminal.
  Page page() { return {streams_.out, streams_.columns, streams_.outIsColoured}; }
  /// Nothing in a pipe.
  std::optional<std::size_t> columns() const { return streams_.columns; }
  /// Whether to show the progress of long work on `error()`.
  bool showsProgress() const { return streams_.errorIsTerminal; }
  /// Whether a person can read a question and answer it.
  bool canAsk() const { return streams_.inIsTerminal && streams_.errorIsTerminal; }

  // -- JSON --------------------------------------------------------------------------------------

  /// Adds `--json` to a subcommand that prints data.
  Option addJsonOption(Command command);
  bool json() const { return json_; }
  /// Prints `object` as an indented document that begins with the member "format_version".
  void printJson(Json object);

  // -- Ends --------------------------------------------------------------------------------------

  /// Prints "PROGRAM: MESSAGE" as one line on `error()` and sets the exit status to 1, or that of
  /// `setFailureStatus`. The message says what, where and what to do: "cannot read whitelist: /x:
  /// Permission denied: run as root".
  void fail(std::string_view message);
  /// The same with exit status 2, for faulty arguments that only the subcommand can detect.
  void failUsage(std::string_view message);
  /// Prints a line without changing the exit status.
  void note(std::string_view message);
  /// Fails when the output could not be written. An exit status other than 0 stays: it says more.
  void finish();

  int exitStatus() const { return exitStatus_; }
  void setExitStatus(int status) { exitStatus_ = status; }
  /// For a subcommand whose exit status 1 is not a failure.
  void setFailureStatus(int status) { failureStatus_ = status; }

 private:
  void say(char priority, std::string_view message);

  const char* program_;
  ToolStreams streams_;
  bool json_ = false;
  int exitStatus_ = kExitSuccess;
  int failureStatus_ = kExitFailure;
};

}  // namespace tavrel
