#include "tools/console/end_signals.h"

#include <algorithm>
#include <cerrno>

namespace tavrel {

EndSignals::EndSignals() {
  sigemptyset(&signals_);
  sigaddset(&signals_, SIGINT);
  sigaddset(&signals_, SIGTERM);
  pthread_sigmask(SIG_BLOCK, &signals_, &before_);
}

EndSignals::~EndSignals() {
  // Signals that arrived since asked for the end that this is.
  while (arriveBefore({})) {
  }
  pthread_sigmask(SIG_SETMASK, &before_, nullptr);
}

bool EndSignals::arriveBefore(std::chrono::steady_clock::time_point end) {
  for (;;) {
    const auto now = std::chrono::steady_clock::now();
    const auto left = std::max(end, now) - now;
    const auto seconds = std::chrono::floor<std::chrono::seconds>(left);
    const auto rest = std::chrono::nanoseconds(left - seconds).count();
    const timespec wait{.tv_sec = seconds.count(), .tv_nsec = static_cast<long>(rest)};
    if (sigtimedwait(&signals_, nullptr, &wait) > 0) return true;
    if (errno != EINTR) return false;
  }
}

}  // namespace tavrel
