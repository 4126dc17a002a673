// The main event loop over epoll.
//
// A source is a descriptor and a callback; a slice ends after the first callback that reports an
// event. Callbacks run inside `runSlice`, one at a time, and may add and remove sources, their own
// included. SIGTERM and SIGINT are held back from the first slice until the loop is destroyed, so
// that they end the wait between two events and never in the middle of one.
//
//   LinuxEventLoop loop;
//   auto source = loop.watch(socket, [&] { return takeMessage() ? Activity::Event : ...; });
//   while (loop.runSlice(10s) == EventLoop::Slice::HandledEvent) {}
//
// Durations follow the monotonic clock: neither a signal nor a change of the clock shortens a
// slice, and time during which the machine sleeps does not count.
#pragma once

#include <csignal>
#include <cstdint>
#include <functional>
#include <memory>
#include <unordered_map>
#include <utility>

#include "base/expected.h"
#include "platform/event_loop.h"
#include "platform/linux/files/descriptor.h"

namespace tavrel {

class LinuxEventLoop final : public EventLoop {
 public:
  /// What a callback handled. After `Nothing` the slice waits for its remaining time.
  enum class Activity { Event, Nothing };
  using Callback = std::function<Activity()>;

  /// Keeps a descriptor watched. The loop must outlive it, the descriptor must stay open.
  class Source {
   public:
    Source() = default;
    Source(Source&& other) noexcept { *this = std::move(other); }
    Source& operator=(Source&& other) noexcept {
      std::swap(loop_, other.loop_);
      std::swap(descriptor_, other.descriptor_);
      std::swap(id_, other.id_);
      return *this;
    }
    ~Source() { stop(); }

    void stop();
    explicit operator bool() const { return loop_ != nullptr; }

   private:
    friend class LinuxEventLoop;
    LinuxEventLoop* loop_ = nullptr;
    int descriptor_ = -1;
    std::uint64_t id_ = 0;
  };

  LinuxEventLoop() = default;
  LinuxEventLoop(const LinuxEventLoop&) = delete;
  LinuxEventLoop& operator=(const LinuxEventLoop&) = delete;
  ~LinuxEventLoop() override;

  /// Calls `callback` whenever `descriptor` is readable or its other end has closed.
  Expected<Source> watch(int descriptor, Callback callback);

  /// Once it has returned `Terminated`, every later call does too.
  Slice runSlice(std::chrono::milliseconds longest) override;

 private:
  bool openPoll();
  void holdSignals();
  bool takeSignal();

  Descriptor poll_;
  Descriptor signals_;
  std::unordered_map<std::uint64_t, std::shared_ptr<Callback>> callbacks_;
  std::uint64_t lastId_ = 0;
  bool signalsHeld_ = false;
  bool terminated_ = false;
  sigset_t maskBefore_{};
};

}  // namespace tavrel
