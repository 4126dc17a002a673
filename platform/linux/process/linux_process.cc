#include "platform/linux/process/linux_process.h"

#include <unistd.h>

namespace tavrel {

std::string LinuxProcess::name() {
  return program_invocation_short_name;
}

std::int32_t LinuxProcess::identifier() {
  return ::getpid();
}

}  // namespace tavrel
