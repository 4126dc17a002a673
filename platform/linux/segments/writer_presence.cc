#include "platform/linux/segments/writer_presence.h"

#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <string>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

#include "platform/linux/files/descriptor.h"
#include "platform/linux/files/process_stat.h"

namespace tavrel {
namespace {

enum class Lookup : unsigned char { Found, Absent, Failed };

Lookup startOf(std::uint32_t pid, std::uint64_t& start) {
  const std::string path = "/proc/" + std::to_string(pid) + "/stat";
  const Descriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC));
  if (!file) return errno == ENOENT ? Lookup::Absent : Lookup::Failed;
  char text[1024];
  const ssize_t length = ::read(file.get(), text, sizeof text);
  if (length < 0) return errno == ESRCH ? Lookup::Absent : Lookup::Failed;
  const auto found = startInStat({text, static_cast<std::size_t>(length)});
  if (!found) return Lookup::Failed;
  start = *found;
  return Lookup::Found;
}

// The mount option hidepid= keeps processes of other users out of /proc.
bool exists(std::uint32_t pid) {
  return std::in_range<pid_t>(pid) && (kill(static_cast<pid_t>(pid), 0) == 0 || errno != ESRCH);
}

}  // namespace

WriterPresence findSegmentProcess(const SegmentFacts& facts) {
  struct stat own {};
  if (facts.pid == 0 || facts.processStart == 0 || facts.pidNamespace == 0 ||
      stat("/proc/self/ns/pid", &own) != 0 || own.st_ino != facts.pidNamespace) {
    return WriterPresence::Unknown;
  }
  std::uint64_t start = 0;
  switch (startOf(facts.pid, start)) {
    case Lookup::Found:
      return start == facts.processStart ? WriterPresence::Present : WriterPresence::Gone;
    case Lookup::Absent:
      if (!exists(facts.pid)) return WriterPresence::Gone;
      break;
    case Lookup::Failed:
      break;
  }
  return WriterPresence::Unknown;
}

WriterPresence findSegmentWriter(int descriptor, const SegmentFacts& facts) {
  // If somebody opens the file for writing during the lease, the kernel sends SIGURG, which is
  // ignored by default, instead of SIGIO, which would end the process.
  if (fcntl(descriptor, F_SETSIG, SIGURG) == 0) {
    if (fcntl(descriptor, F_SETLEASE, F_RDLCK) == 0) {
      fcntl(descriptor, F_SETLEASE, F_UNLCK);
      return WriterPresence::Gone;
    }
    if (errno == EAGAIN) return WriterPresence::Present;
  }
  return findSegmentProcess(facts);
}

}  // namespace tavrel
