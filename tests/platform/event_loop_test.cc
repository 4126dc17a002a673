#include <chrono>
#include <fcntl.h>

#include "platform/linux/process/linux_event_loop.h"
#include "tests/devices/temporary_root.h"

namespace tavrel {
namespace {

using namespace std::chrono_literals;
using Activity = LinuxEventLoop::Activity;
using Slice = EventLoop::Slice;

struct Pipe {
  Pipe() {
    int ends[2] = {-1, -1};
    EXPECT_EQ(pipe2(ends, O_CLOEXEC | O_NONBLOCK), 0);
    reader = Descriptor(ends[0]);
    writer = Descriptor(ends[1]);
  }
  void put() const { EXPECT_EQ(write(writer.get(), "x", 1), 1); }
  Descriptor reader, writer;
};

struct LinuxEventLoopTest : testing::Test {
  LinuxEventLoop loop;
  const Pipe pipe, other;
};

TEST_F(LinuxEventLoopTest, LastsItsFullTimeWithoutEvents) {
  // A source that is ready but has nothing to do does not shorten the slice either.
  pipe.put();
  const auto source = loop.watch(pipe.reader.get(), [] { return Activity::Nothing; });
  ASSERT_TRUE(source);
  const auto begin = std::chrono::steady_clock::now();
  EXPECT_EQ(loop.runSlice(30ms), Slice::TimedOut);
  EXPECT_GE(std::chrono::steady_clock::now() - begin, 30ms);
}

TEST_F(LinuxEventLoopTest, HandlesOneSourceASliceAndAllInTurn) {
  std::string order;
  const auto watch = [&](const Pipe& source, char name) {
    return loop.watch(source.reader.get(), [&order, &source, name] {
      char byte;
      order.append(static_cast<std::size_t>(read(source.reader.get(), &byte, 1)), name);
      return Activity::Event;
    });
  };
  const auto a = watch(pipe, 'a'), b = watch(other, 'b');
  for (int i = 0; i < 3; ++i) {
    pipe.put();
    other.put();
  }
  for (std::size_t i = 1; i <= 6; ++i) {
    EXPECT_EQ(loop.runSlice(1h), Slice::HandledEvent);
    EXPECT_EQ(order, std::string("ababab", i));
  }
  EXPECT_EQ(loop.runSlice(0ms), Slice::TimedOut);
}

TEST_F(LinuxEventLoopTest, SourcesMayEndThemselvesAndOthers) {
  LinuxEventLoop::Source own, others;
  int calls = 0;
  own = *loop.watch(pipe.reader.get(), [&, kept = std::string(99, 'x')] {
    own.stop();
    others.stop();
    calls += kept == std::string(99, 'x') ? 1 : 0;
    return Activity::Event;
  });
  const auto held = std::make_shared<int>(100);
  others = *loop.watch(other.reader.get(), [&calls, held] {
    calls += *held;
    return Activity::Event;
  });
  pipe.put();
  EXPECT_EQ(loop.runSlice(1h), Slice::HandledEvent);
  other.put();
  EXPECT_EQ(loop.runSlice(0ms), Slice::TimedOut);
  EXPECT_EQ(calls, 1);
  EXPECT_EQ(held.use_count(), 1) << "a stopped source keeps its callback";
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
