// For destructors that still have work to do.
#pragma once

#include <exception>

#include "platform/system_log.h"

namespace tavrel {

/// Runs `action` and logs what it throws: an exception that left a destructor would end the process
/// in the middle of its other work.
template <class Action>
void endGuarded(SystemLog& log, const char* what, Action action) noexcept {
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
