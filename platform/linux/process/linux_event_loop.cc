#include "platform/linux/process/linux_event_loop.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <sys/epoll.h>
#include <sys/signalfd.h>
#include <thread>
#include <unistd.h>

#include "base/format.h"
#include "base/system_text.h"

namespace tavrel {

namespace {

using SteadyClock = std::chrono::steady_clock;

/// The ID of the signal descriptor in epoll events; sources are numbered from 1.
constexpr std::uint64_t kSignalsId = 0;

/// Longer slices are cut to this, so that no sum with the clock can overflow.
constexpr std::chrono::hours kLongestSlice{24 * 365};

sigset_t terminatingSignals() {
  sigset_t set;
  sigemptyset(&set);
  sigaddset(&set, SIGTERM);
  sigaddset(&set, SIGINT);
  return set;
}

/// Rounded up: otherwise waits would end early, and the loop would spin through the last
/// millisecond.
int millisecondsUntil(SteadyClock::time_point deadline) {
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - SteadyClock::now());
  return static_cast<int>(std::clamp<std::int64_t>(left.count(), 0, 1 << 30));
}

}  // namespace

void LinuxEventLoop::Source::stop() {
  if (!loop_) return;
  epoll_ctl(loop_->poll_.get(), EPOLL_CTL_DEL, descriptor_, nullptr);
  loop_->callbacks_.erase(id_);
  loop_ = nullptr;
}

LinuxEventLoop::~LinuxEventLoop() {
  if (!signalsHeld_) return;
  // A second termination signal must not kill a process that is already ending.
  takeSignal();
  pthread_sigmask(SIG_SETMASK, &maskBefore_, nullptr);
}

bool LinuxEventLoop::openPoll() {
  if (!poll_) poll_ = Descriptor(epoll_create1(EPOLL_CLOEXEC));
  return static_cast<bool>(poll_);
}

Expected<LinuxEventLoop::Source> LinuxEventLoop::watch(int descriptor, Callback callback) {
  if (!openPoll()) return Error{format("cannot open an event queue: %s", systemText(errno))};
  const std::uint64_t id = ++lastId_;
  epoll_event interest{};
  interest.events = EPOLLIN;
  interest.data.u64 = id;
  if (epoll_ctl(poll_.get(), EPOLL_CTL_ADD, descriptor, &interest) != 0) {
    return Error{format("cannot wait for descriptor %d: %s", descriptor, systemText(errno))};
  }
  callbacks_.emplace(id, std::make_shared<Callback>(std::move(callback)));
  Source source;
  source.loop_ = this;
  source.descriptor_ = descriptor;
  source.id_ = id;
  return source;
}

void LinuxEventLoop::holdSignals() {
  if (signalsHeld_) return;
  const sigset_t set = terminatingSignals();
  signals_ = Descriptor(signalfd(-1, &set, SFD_CLOEXEC | SFD_NONBLOCK));
  epoll_event interest{};
  interest.events = EPOLLIN;
  interest.data.u64 = kSignalsId;
  if (!signals_ || !openPoll() ||
      epoll_ctl(poll_.get(), EPOLL_CTL_ADD, signals_.get(), &interest) != 0) {
    // The signals keep their default effect: they end the process at once.
    signals_.reset();
    return;
  }
  signalsHeld_ = pthread_sigmask(SIG_BLOCK, &set, &maskBefore_) == 0;
}

bool LinuxEventLoop::takeSignal() {
  signalfd_siginfo signal;
  while (signals_ && read(signals_.get(), &signal, sizeof signal) == sizeof signal) {
    terminated_ = true;
  }
  return terminated_;
}

EventLoop::Slice LinuxEventLoop::runSlice(std::chrono::milliseconds longest) {
  const auto deadline =
      SteadyClock::now() +
      std::clamp<std::chrono::milliseconds>(longest, std::chrono::milliseconds(0), kLongestSlice);
  holdSignals();
  do {
    // Checked first each time, so that many ready sources cannot delay it.
    if (takeSignal()) return Slice::Terminated;

    // One event at a time: this is fair, since the kernel moves a reported source to the end of its
    // list, and leaves no event for a source that a callback has removed.
    epoll_event event;
    const bool isOpen = openPoll();
    const int ready = isOpen ? epoll_wait(poll_.get(), &event, 1, millisecondsUntil(deadline)) : -1;
    if (ready < 0 && (!isOpen || errno != EINTR)) {
      // Waiting for events is impossible, and another attempt would only spin.
      std::this_thread::sleep_until(deadline);
      break;
    }
    if (ready != 1) continue;
    const std::uint64_t source = event.data.u64;  // a copy: the member may not be aligned
    const auto found = callbacks_.find(source);
    if (found == callbacks_.end()) continue;
    // Shared, because the callback may end its own source.
    const std::shared_ptr<Callback> callback = found->second;
    if ((*callback)() == Activity::Event) return Slice::HandledEvent;
  } while (SteadyClock::now() < deadline);
  return takeSignal() ? Slice::Terminated : Slice::TimedOut;
}

}  // namespace tavrel
