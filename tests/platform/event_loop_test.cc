#include <array>
#include <chrono>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <string>
#include <unistd.h>

#include "platform/linux/process/linux_event_loop.h"

namespace tavrel {
namespace {

using namespace std::chrono_literals;
using Activity = LinuxEventLoop::Activity;
using Slice = EventLoop::Slice;

struct Pipe {
  Pipe() {
    std::array<int, 2> ends{};
    EXPECT_EQ(pipe2(ends.data(), O_CLOEXEC | O_NONBLOCK), 0);
    reader = Descriptor(ends[0]);
    writer = Descriptor(ends[1]);
  }
  void put() const { EXPECT_EQ(write(writer.get(), "x", 1), 1); }
  char take() const {
    char byte = 0;
    return read(reader.get(), &byte, 1) == 1 ? byte : '\0';
  }
  Descriptor reader;
  Descriptor writer;
};

TEST(LinuxEventLoop, LastsItsFullTimeWithoutEvents) {
  // Nor does a source that is ready but has nothing to do shorten the slice.
  LinuxEventLoop loop;
  const Pipe pipe;
  pipe.put();
  const auto source = loop.watch(pipe.reader.get(), [] { return Activity::Nothing; });
  ASSERT_TRUE(source);
  const auto begin = std::chrono::steady_clock::now();
  EXPECT_EQ(loop.runSlice(30ms), Slice::TimedOut);
  EXPECT_GE(std::chrono::steady_clock::now() - begin, 30ms);
}

TEST(LinuxEventLoop, HandlesOneSourceASliceAndAllInTurn) {
  LinuxEventLoop loop;
  const Pipe first, second;
  std::string order;
  const auto watch = [&](const Pipe& pipe, char name) {
    return loop.watch(pipe.reader.get(), [&order, &pipe, name] {
      pipe.take();
      order += name;
      return Activity::Event;
    });
  };
  const auto a = watch(first, 'a');
  const auto b = watch(second, 'b');
  for (int i = 0; i < 3; ++i) {
    first.put();
    second.put();
  }
  for (int i = 0; i < 6; ++i) {
    const std::size_t before = order.size();
    EXPECT_EQ(loop.runSlice(1h), Slice::HandledEvent);
    EXPECT_EQ(order.size(), before + 1);
  }
  EXPECT_EQ(order, "ababab");
  EXPECT_EQ(loop.runSlice(0ms), Slice::TimedOut);
}

TEST(LinuxEventLoop, SourcesMayEndThemselvesAndOthers) {
  LinuxEventLoop loop;
  const Pipe pipe, other;
  LinuxEventLoop::Source own, others;
  int calls = 0;
  auto watched =
      loop.watch(pipe.reader.get(), [&own, &others, &calls, kept = std::string(99, 'x')] {
        own.stop();
        others.stop();
        calls += kept == std::string(99, 'x') ? 1 : 0;
        return Activity::Event;
      });
  own = *std::move(watched);
  others = *loop.watch(other.reader.get(), [&calls] {
    calls += 100;
    return Activity::Event;
  });
  pipe.put();
  EXPECT_EQ(loop.runSlice(1h), Slice::HandledEvent);
  other.put();
  EXPECT_EQ(loop.runSlice(0ms), Slice::TimedOut);
  EXPECT_EQ(calls, 1);
}

TEST(LinuxEventLoop, SignalsEndTheWaitBetweenEvents) {
  for (const int signal : {SIGTERM, SIGINT}) {
    {
      LinuxEventLoop loop;
      const Pipe pipe;
      bool finished = false;
      const auto source = loop.watch(pipe.reader.get(), [&] {
        raise(signal);
        finished = true;
        return Activity::Event;
      });
      pipe.put();
      EXPECT_EQ(loop.runSlice(1h), Slice::HandledEvent);
      EXPECT_TRUE(finished);
      EXPECT_EQ(loop.runSlice(1h), Slice::Terminated) << "although the source is ready";
      EXPECT_EQ(loop.runSlice(1h), Slice::Terminated);
      raise(signal);  // swallowed: the process is ending already
    }
    sigset_t mask;
    ASSERT_EQ(pthread_sigmask(SIG_SETMASK, nullptr, &mask), 0);
    EXPECT_EQ(sigismember(&mask, signal), 0);
  }
}

}  // namespace
}  // namespace tavrel
