#include "platform/linux/system_log/linux_system_log.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <time.h>
#include <utility>

#include "base/ascii.h"
#include "base/utf8.h"
#include "platform/linux/files/stamp.h"

namespace tavrel {
namespace {

struct LevelNames {
  std::string_view word;
  char priority;  // of syslog
};

LevelNames namesOf(LogLevel level) {
  switch (level) {
    case LogLevel::Debug:
      return {"debug", '7'};
    case LogLevel::Info:
      return {"info", '6'};
    case LogLevel::Default:
      return {"default", '5'};
    case LogLevel::Error:
      return {"error", '3'};
  }
  return {"default", '5'};
}

plist::Date now() {
  timespec time{};
  clock_gettime(CLOCK_REALTIME, &time);
  return plist::Date::since1970(static_cast<double>(time.tv_sec) +
                                static_cast<double>(time.tv_nsec) * 1e-9);
}

/// Adds a field in the journal's form for values that may hold line ends: the name, a line end,
/// the length as 64-bit little-endian, the value, a line end.
void appendField(std::string& out, std::string_view name, std::string_view value) {
  out += name;
  out += '\n';
  for (unsigned shift = 0; shift < 64; shift += 8) {
    out += static_cast<char>(static_cast<unsigned char>(std::uint64_t{value.size()} >> shift));
  }
  out += value;
  out += '\n';
}

/// Adds text with its control characters, DEL and malformed bytes as "\xNN": messages contain names
/// from outside, and a terminal would obey control characters.
void appendPrintable(std::string& out, std::string_view text) {
  while (true) {
    const auto plain = std::ranges::find_if_not(text, isPrintableAscii);
    out.append(text.begin(), plain);
    text.remove_prefix(static_cast<std::size_t>(plain - text.begin()));
    if (text.empty()) return;
    std::string_view rest = text;
    const char32_t codePoint = takeCodePoint(rest);
    const std::string_view taken = text.substr(0, text.size() - rest.size());
    text = rest;
    const bool malformed = codePoint == kReplacementCharacter && taken.size() == 1;
    if (codePoint >= 0x20 && (codePoint < 0x7F || codePoint > 0x9F) && !malformed) {
      out += taken;
      continue;
    }
    for (const char character : taken) {
      out += "\\x";
      appendHexByte(out, character);
    }
  }
}

/// Adds the lines of a message, each printable, with `between` in place of the line ends.
void appendLines(std::string& out, std::string_view message, std::string_view between) {
  while (true) {
    const std::size_t end = message.find('\n');
    appendPrintable(out, message.substr(0, end));
    if (end == std::string_view::npos) return;
    out += between;
    message.remove_prefix(end + 1);
  }
}

/// The last offset up to `at` that does not split a character; `at` when the text is not UTF-8.
std::size_t characterBoundary(std::string_view text, std::size_t at) {
  constexpr std::size_t kContinuationBytes = 3;
  for (std::size_t back = 0; back <= kContinuationBytes && back <= at; ++back) {
    if ((static_cast<unsigned char>(text[at - back]) & 0xC0U) != 0x80U) return at - back;
  }
  return at;
}

bool writeBytes(int descriptor, std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t written = ::write(descriptor, bytes.data(), bytes.size());
    if (written < 0) {
      if (errno == EINTR) continue;
      return false;
    }
    bytes.remove_prefix(static_cast<std::size_t>(written));
  }
  return true;
}

/// An entry too large for a datagram travels in a sealed memory file.
bool sendInMemoryFile(int socket, std::string_view entry) {
  const Descriptor file(memfd_create("tavrel-log", MFD_CLOEXEC | MFD_ALLOW_SEALING));
  if (!file || !writeBytes(file.get(), entry)) return false;
  constexpr int kSeals = F_SEAL_SEAL | F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_WRITE;
  if (fcntl(file.get(), F_ADD_SEALS, kSeals) != 0) return false;

  alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof(int))> control{};
  msghdr message{};
  message.msg_control = control.data();
  message.msg_controllen = control.size();
  cmsghdr* header = CMSG_FIRSTHDR(&message);
  header->cmsg_level = SOL_SOCKET;
  header->cmsg_type = SCM_RIGHTS;
  header->cmsg_len = CMSG_LEN(sizeof(int));
  const int descriptor = file.get();
  std::memcpy(CMSG_DATA(header), &descriptor, sizeof(descriptor));
  return sendmsg(socket, &message, MSG_NOSIGNAL) >= 0;
}

}  // namespace

LinuxSystemLog::LinuxSystemLog(int errorStream, std::string journalSocket)
    : errorStream_(errorStream), journalPath_(std::move(journalSocket)) {}

void LinuxSystemLog::write(LogLevel level, std::string_view message) {
  if (level == LogLevel::Debug || message.size() <= kLongestMessage) {
    return writeWhole(level, message);
  }
  const std::size_t shown = characterBoundary(message, kLongestMessage);
  std::string cut(message.substr(0, shown));
  cut += "… and " + std::to_string(message.size() - shown) + " bytes more";
  writeWhole(level, cut);
  writeWhole(LogLevel::Debug, message);
}

bool LinuxSystemLog::isJournal() {
  decideWay();
  return streamIsJournal_;
}

void LinuxSystemLog::decideWay() {
  if (way_ != Way::Undecided) return;
  streamIsJournal_ = isStreamTheJournal();
  way_ = streamIsJournal_ && connectToJournal() ? Way::Journal : Way::Stream;
}

void LinuxSystemLog::writeWhole(LogLevel level, std::string_view message) {
  decideWay();
  if (way_ == Way::Journal && sendToJournal(level, message)) return;
  writeToStream(level, message);
}

bool LinuxSystemLog::isStreamTheJournal() const {
  const char* stream = std::getenv("JOURNAL_STREAM");
  if (!stream) return false;
  struct stat status {};
  if (fstat(errorStream_, &status) != 0) return false;
  return std::to_string(status.st_dev) + ":" + std::to_string(status.st_ino) == stream;
}

bool LinuxSystemLog::connectToJournal() {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  if (journalPath_.size() >= sizeof(address.sun_path)) return false;
  std::memcpy(address.sun_path, journalPath_.c_str(), journalPath_.size());
  journal_ = Descriptor(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  return journal_ &&
         connect(journal_.get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address)) == 0;
}

bool LinuxSystemLog::sendToJournal(LogLevel level, std::string_view message) {
  std::string entry = "PRIORITY=";
  entry += namesOf(level).priority;
  entry += "\nSYSLOG_IDENTIFIER=";
  entry += program_invocation_short_name;
  entry += '\n';
  std::string lines;
  appendLines(lines, message, "\n");
  appendField(entry, "MESSAGE", lines);
  while (send(journal_.get(), entry.data(), entry.size(), MSG_NOSIGNAL) < 0) {
    if (errno == EINTR) continue;
    if (errno == EMSGSIZE || errno == ENOBUFS) return sendInMemoryFile(journal_.get(), entry);
    // The journal may have restarted; until it is back, entries go to the stream.
    connectToJournal();
    return false;
  }
  return true;
}

void LinuxSystemLog::writeToStream(LogLevel level, std::string_view message) const {
  const LevelNames names = namesOf(level);
  std::string line;
  std::string_view continuation = "\n  ";
  std::string prefix;
  if (streamIsJournal_) {
    // The journal adds the time itself, and takes the level from this prefix of each line.
    prefix = {'\n', '<', names.priority, '>'};
    continuation = prefix;
    line = prefix.substr(1);
  } else {
    line = preciseStamp(now());
    line += ' ';
    line += names.word;
    line += ' ';
  }
  appendLines(line, message, continuation);
  line += '\n';
  writeBytes(errorStream_, line);
}

}  // namespace tavrel
