// The main event loop.
#pragma once

#include <chrono>

namespace tavrel {

class EventLoop {
 public:
  enum class Slice {
    HandledEvent,  // an event source was handled before the time ran out
    TimedOut,      // the slice ran its full time without an event
    Terminated,    // the system asked the process to end
  };

  virtual ~EventLoop() = default;

  /// Waits until an event has been handled or the time is up. Without event sources, waits the full
  /// time.
  virtual Slice runSlice(std::chrono::milliseconds longest) = 0;
};

}  // namespace tavrel
