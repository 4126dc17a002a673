#include "tools/console/tool_output.h"

#include <cstdlib>
#include <fcntl.h>
#include <iostream>
#include <nlohmann/json.hpp>
#include <sys/ioctl.h>
#include <unistd.h>
#include <utility>

#include "base/program.h"
#include "platform/linux/system_log/linux_system_log.h"
#include "tools/console/table.h"

namespace tavrel {
namespace {

// syslog priorities
constexpr char kErrorPriority = '3';
constexpr char kWarningPriority = '4';

// Nothing when standard output is not a terminal; a terminal of unknown width counts as 80 columns.
std::optional<std::size_t> terminalColumns() {
  if (!isatty(STDOUT_FILENO)) return std::nullopt;
  winsize size{};
  if (ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) != 0 || size.ws_col == 0) return 80;
  return size.ws_col;
}

// If a standard stream is closed at the start, no file or socket may take its number and receive
// what is printed. The modes are such that reading and printing fail, as they do without this.
void holdStandardDescriptors() {
  for (const int descriptor : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) {
    if (fcntl(descriptor, F_GETFD) != -1) continue;
    open("/dev/null", descriptor == STDIN_FILENO ? O_WRONLY : O_RDONLY);
  }
}

// Follows NO_COLOR as no-color.org describes it.
bool isColoured() {
  if (!isatty(STDOUT_FILENO)) return false;
  const char* const refusal = std::getenv("NO_COLOR");
  const char* const terminal = std::getenv("TERM");
  return (refusal == nullptr || *refusal == '\0') && terminal != nullptr &&
         std::string_view(terminal) != "dumb";
}

}  // namespace

Json withFormatVersion(Json object) {
  Json document = {{"format_version", kJsonFormatVersion}};
  auto& members = document.get_ref<Json::object_t&>();
  for (auto& [name, value] : object.get_ref<Json::object_t&>()) {
    members.emplace_back(name, std::move(value));
  }
  return document;
}

std::string jsonText(const Json& value, int indent) {
  return value.dump(indent, ' ', false, Json::error_handler_t::replace);
}

ToolStreams standardStreams() {
  holdStandardDescriptors();
  std::ios::sync_with_stdio(false);
  return {.in = std::cin,
          .out = std::cout,
          .error = std::cerr,
          .columns = terminalColumns(),
          .errorIsTerminal = isatty(STDERR_FILENO) == 1,
          .errorIsJournal = LinuxSystemLog().isJournal(),
          .inIsTerminal = isatty(STDIN_FILENO) == 1,
          .outIsColoured = isColoured()};
}

Option ToolOutput::addJsonOption(Command command) {
  const std::string description = format("Print JSON (format_version %d)", kJsonFormatVersion);
  return command.addFlag("--json", json_, description.c_str());
}

void ToolOutput::printJson(Json object) {
  streams_.out << jsonText(withFormatVersion(std::move(object)), 2) << '\n';
}

void ToolOutput::say(char priority, std::string_view message) {
  streams_.out.flush();
  if (streams_.errorIsJournal) streams_.error << '<' << priority << '>';
  streams_.error << program_ << ": " << printable(message) << '\n';
}

void ToolOutput::note(std::string_view message) {
  say(kWarningPriority, message);
}

void ToolOutput::fail(std::string_view message) {
  say(kErrorPriority, message);
  exitStatus_ = failureStatus_;
}

void ToolOutput::failUsage(std::string_view message) {
  say(kErrorPriority, message);
  exitStatus_ = kExitUsage;
}

void ToolOutput::finish() {
  streams_.out.flush();
  if (streams_.out) return;
  const int found = exitStatus_;
  fail(kOutputIsLost);
  if (found != kExitSuccess) exitStatus_ = found;
}

}  // namespace tavrel
