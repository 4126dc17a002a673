// For work whose failure must not stop what comes behind it, such as that of destructors.
#pragma once

#include <exception>

#include "platform/system_log.h"

namespace tavrel {

/// Runs `action` and logs what it throws, for want of memory most likely, as "cannot WHAT: reason".
template <class Action>
void runGuarded(SystemLog& log, const char* what, Action action) noexcept {
  try {
    try {
      action();
    } catch (const std::exception& failure) {
      log.log(LogLevel::Error, "cannot %s: %s", what, failure.what());
    }
  } catch (...) {
    // Without memory for a line there is nobody left to tell.
  }
}

}  // namespace tavrel
