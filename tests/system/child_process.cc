#include "tests/system/child_process.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/ptrace.h>
#include <sys/wait.h>
#include <unistd.h>

namespace tavrel {

int forkProcess(const std::function<void()>& body, const std::string& errorFile) {
  const int child = ::fork();
  if (child != 0) return child;
  const int errors = ::open(errorFile.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
  ::dup2(errors, STDERR_FILENO);
  body();
  ::_exit(0);
}

int waitFor(int process) {
  int status = 0;
  ::waitpid(process, &status, 0);
  return WIFSIGNALED(status) ? -WTERMSIG(status) : WEXITSTATUS(status);
}

bool runUntilSystemCall(std::size_t calls, const std::function<void()>& body) {
  const int child = forkProcess([&] {
    ::ptrace(PTRACE_TRACEME, 0, nullptr, nullptr);
    ::raise(SIGSTOP);
    body();
  });
  int status = 0;
  ::waitpid(child, &status, 0);
  // Every call stops the process twice: before it and behind it.
  for (std::size_t stop = 0; stop < 2 * calls + 1; ++stop) {
    ::ptrace(PTRACE_SYSCALL, child, nullptr, nullptr);
    ::waitpid(child, &status, 0);
    if (WIFEXITED(status) || WIFSIGNALED(status)) return false;
  }
  ::kill(child, SIGKILL);
  ::waitpid(child, &status, 0);
  return true;
}

}  // namespace tavrel
