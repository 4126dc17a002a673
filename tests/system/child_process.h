// Processes that a test starts, watches and kills.
#pragma once

#include <cstddef>
#include <functional>
#include <string>

namespace tavrel {

/// Runs `body` in a forked process that then ends. Its standard error goes to `errorFile`. Yields
/// the process.
int forkProcess(const std::function<void()>& body, const std::string& errorFile = "/dev/null");

/// The exit status of a process once it has ended, or minus the signal that ended it.
int waitFor(int process);

/// Runs `body` in a forked process that is killed before its system call number `calls`. False when
/// it ended before that.
bool runUntilSystemCall(std::size_t calls, const std::function<void()>& body);

}  // namespace tavrel
