// For work whose failure must not stop what follows, for example in destructors.
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

}  // namespace tavrel
