// Forked processes, some of which are killed before a system call.
#pragma once

#include <cstddef>
#include <cstdlib>
#include <fcntl.h>
#include <functional>
#include <gtest/gtest.h>
#include <signal.h>
#include <string>
#include <sys/ptrace.h>
#include <sys/wait.h>
#include <unistd.h>

namespace tavrel {

/// Runs `body` in a forked process with standard error in `errorFile`; returns the process id.
inline int forkProcess(const std::function<void()>& body,
                       const std::string& errorFile = "/dev/null") {
  const int child = ::fork();
  if (child != 0) return child;
  const int errors = ::open(errorFile.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
  ::dup2(errors, STDERR_FILENO);
  body();
  ::_exit(0);
}

/// Runs `body` in a forked process that is killed before its system call number `calls`. With
/// `meanwhile`, it is not killed: it pauses there while `meanwhile` runs, and then continues to its
/// end. False when it ended before that call; it must not end with a failure.
inline bool runUntilSystemCall(std::size_t calls, const std::function<void()>& body,
                               const std::function<void()>& meanwhile = {}) {
  const int child = forkProcess([&] {
    // LeakSanitizer fails in a traced process.
    ::setenv("ASAN_OPTIONS", "detect_leaks=0", 1);
    ::ptrace(PTRACE_TRACEME, 0, nullptr, nullptr);
    ::raise(SIGSTOP);
    body();
  });
  int status = 0;
  ::waitpid(child, &status, 0);
  // Every call stops the process twice: before and after.
  for (std::size_t stop = 0; stop < 2 * calls + 1; ++stop) {
    const int signal = stop == 0 || WSTOPSIG(status) == SIGTRAP ? 0 : WSTOPSIG(status);
    ::ptrace(PTRACE_SYSCALL, child, nullptr, signal);
    ::waitpid(child, &status, 0);
    if (WIFEXITED(status) || WIFSIGNALED(status)) {
      EXPECT_EQ(status, 0) << "the process failed before system call " << calls;
      return false;
    }
  }
  if (meanwhile) {
    meanwhile();
    ::ptrace(PTRACE_DETACH, child, nullptr, nullptr);
    ::waitpid(child, &status, 0);
    EXPECT_EQ(status, 0) << "the process failed after system call " << calls;
  } else {
    ::kill(child, SIGKILL);
    ::waitpid(child, &status, 0);
  }
  return true;
}

}  // namespace tavrel
