// For work whose failure must not stop what follows, for example in destructors, or ends a program.
#pragma once

#include <exception>

#include "platform/system_log.h"

namespace tavrel {

/// Runs `action`. Logs an exception, which most likely means that memory ran out, as "cannot WHAT:
/// reason".
template <class Action>
void runGuarded(SystemLog& log, const char* what, Action action) noexcept {
  try {
    try {
      action();
    } catch (const std::exception& failure) {
      log.log(LogLevel::Error, "cannot %s: %s", what, failure.what());
    }
  } catch (...) {
    // There was no memory even for the log line.
  }
}

/// The exit status that `body` returns; 1 when it throws, which is logged as "WHAT ended early:
/// reason".
template <class Body>
int loggedStatusOf(SystemLog& log, const char* what, Body body) {
  try {
    return body();
  } catch (const std::exception& failure) {
    log.log(LogLevel::Error, "%s ended early: %s", what, failure.what());
  }
  return 1;
}

}  // namespace tavrel
