// What each subcommand of a program says and how it ends: standard streams, JSON, failures.
#pragma once

#include <cstddef>
#include <iosfwd>
#include <nlohmann/json_fwd.hpp>
#include <optional>
#include <string>
#include <string_view>

#include "tools/shared/command.h"
#include "tools/shared/page.h"

namespace tavrel {

/// JSON whose objects keep the order in which their members were added.
using Json = nlohmann::ordered_json;

/// The version of the JSON forms that the tools print. It grows when a member changes its meaning
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
  /// Whether `error` is read by the journal, which takes the priority of a line from its beginning.
  bool errorIsJournal = false;
  bool inIsTerminal = false;
  /// Whether `out` is a terminal that shows colours to a user who wants them.
  bool outIsColoured = false;
};

/// The streams of this process.
ToolStreams standardStreams();

class ToolOutput {
 public:
  /// `program` begins each line on `error()`; it must outlive this.
  ToolOutput(const char* program, const ToolStreams& streams)
      : program_(program), streams_(streams) {}
  ToolOutput(const ToolOutput&) = delete;
  ToolOutput& operator=(const ToolOutput&) = delete;

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
  Option addJsonOption(Command command);
  bool json() const { return json_; }
  /// Prints `object` as an indented document that begins with the member "format_version".
  void printJson(Json object);

  // -- Ends --------------------------------------------------------------------------------------

  /// Prints "PROGRAM: MESSAGE" as one line on `error()` and makes the exit status 1. The message
  /// says what, where and what to do: "cannot read whitelist: /x: Permission denied: run as root".
  void fail(std::string_view message);
  /// The same with exit status 2, for arguments that only the subcommand can judge.
  void failUsage(std::string_view message);
  /// A line that does not change the exit status.
  void note(std::string_view message);
  /// Fails when what was printed has not arrived.
  void finish();

  int exitStatus() const { return exitStatus_; }
  void setExitStatus(int status) { exitStatus_ = status; }

 private:
  void say(char priority, std::string_view message);

  const char* program_;
  ToolStreams streams_;
  bool json_ = false;
  int exitStatus_ = kExitSuccess;
};

}  // namespace tavrel
