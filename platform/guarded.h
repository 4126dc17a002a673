// For work whose failure must not stop what follows, for example in destructors.
#pragma once

#include <exception>

#include "platform/system_log.h"

namespace tavrel {

/// Runs `action` and logs what it throws, most likely because memory is short, as "cannot WHAT:
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
    // Not even the line found memory.
  }
}

}  // namespace tavrel
