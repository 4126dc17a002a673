#include "platform/linux/segments/segment_writer.h"

#include <cerrno>
#include <charconv>
#include <csignal>
#include <fcntl.h>
#include <string>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/linux/files/descriptor.h"

namespace tavrel {
namespace {

enum class Lookup : unsigned char { Found, Absent, Failed };

// Field 22 of /proc/PID/stat. The second one is the program's name in parentheses.
Lookup startOf(std::uint32_t pid, std::uint64_t& start) {
  const std::string path = "/proc/" + std::to_string(pid) + "/stat";
  const Descriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC));
  if (!file) return errno == ENOENT ? Lookup::Absent : Lookup::Failed;
  char text[1024];
  const ssize_t length = ::read(file.get(), text, sizeof text);
  if (length < 0) return errno == ESRCH ? Lookup::Absent : Lookup::Failed;
  std::string_view rest(text, static_cast<std::size_t>(length));
  rest.remove_prefix(std::min(rest.rfind(')'), rest.size()));
  for (int field = 2; field < 22; ++field) {
    const std::size_t space = rest.find(' ');
    if (space == std::string_view::npos) return Lookup::Failed;
    rest.remove_prefix(space + 1);
  }
  const auto [end, error] = std::from_chars(rest.data(), rest.data() + rest.size(), start);
  return error == std::errc{} ? Lookup::Found : Lookup::Failed;
}

}  // namespace

SegmentWriter findSegmentProcess(const SegmentFacts& facts) {
  struct stat own {};
  if (facts.pid == 0 || facts.processStart == 0 || facts.pidNamespace == 0 ||
      stat("/proc/self/ns/pid", &own) != 0 || own.st_ino != facts.pidNamespace) {
    return SegmentWriter::Unknown;
  }
  std::uint64_t start = 0;
  switch (startOf(facts.pid, start)) {
    case Lookup::Found:
      return start == facts.processStart ? SegmentWriter::Present : SegmentWriter::Gone;
    case Lookup::Absent:
      return SegmentWriter::Gone;
    case Lookup::Failed:
      break;
  }
  return SegmentWriter::Unknown;
}

SegmentWriter findSegmentWriter(int descriptor, const SegmentFacts& facts) {
  // When somebody opens the file for writing during the lease, the kernel sends this signal, which
  // is ignored unless handled, instead of SIGIO, which ends the process.
  if (fcntl(descriptor, F_SETSIG, SIGURG) == 0) {
    if (fcntl(descriptor, F_SETLEASE, F_RDLCK) == 0) {
      fcntl(descriptor, F_SETLEASE, F_UNLCK);
      return SegmentWriter::Gone;
    }
    if (errno == EAGAIN) return SegmentWriter::Present;
  }
  return findSegmentProcess(facts);
}

}  // namespace tavrel
