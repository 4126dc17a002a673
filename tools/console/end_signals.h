// Lets a command end early and keep what it has.
#pragma once

#include <chrono>
#include <csignal>

namespace tavrel {

/// Blocks SIGINT and SIGTERM during its lifetime; those that nobody waited for are discarded.
class EndSignals {
 public:
  EndSignals();
  ~EndSignals();
  EndSignals(const EndSignals&) = delete;
  EndSignals& operator=(const EndSignals&) = delete;

  /// Waits until `end`, or returns true when one of the signals arrives before.
  bool arriveBefore(std::chrono::steady_clock::time_point end);

 private:
  sigset_t signals_;
  sigset_t before_;
};

}  // namespace tavrel
