// Processes that a test starts, observes and kills.
#pragma once

#include <cstdlib>
#include <string>
#include <sys/wait.h>
#include <unistd.h>

#include "tests/helpers/killed_process.h"

namespace tavrel {

/// Turns this process into a built program, on the device below `root`.
[[noreturn]] inline void executeBelow(const std::string& root, const char* argument,
                                      const char* program = TAVREL_BINARY) {
  ::setenv("TAVREL_ROOT", root.c_str(), 1);
  ::execl(program, program, argument, nullptr);
  ::_exit(127);
}

/// The exit status of a process once it has ended, or minus the signal that ended it.
inline int waitFor(int process) {
  int status = 0;
  ::waitpid(process, &status, 0);
  return WIFSIGNALED(status) ? -WTERMSIG(status) : WEXITSTATUS(status);
}

}  // namespace tavrel
