// Children that record, clocks controlled by the test, and an in-memory store that folds.
#pragma once

#include <atomic>
#include <csignal>
#include <cstdint>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <functional>
#include <gtest/gtest.h>
#include <map>
#include <string>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

#include "brimhold/client.h"
#include "client/segment_format.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/segments/segment_reader.h"
#include "platform/linux/segments/writer_presence.h"

namespace tavrel {

inline constexpr std::int64_t kToday = 25'000;  // a day after any build

/// The seconds that clock_gettime shows here and in children; 0 leaves a clock alone. Each read of
/// the monotonic clock advances it by ten seconds; it shows a hundredth more than its seconds.
struct TestClock {
  std::atomic<std::int64_t> realtime;
  std::atomic<std::int64_t> boot;
  std::atomic<std::int64_t> monotonic;
  std::atomic<std::int64_t> coarse;  // the monotonic clock too, as libbrimhold reads it for itself
  std::atomic<void (*)()> whenRead;  // called before the real-time clock is shown
};
TestClock& testClock();

/// Called whenever libbrimhold allocates memory.
extern std::function<void()> whileFetching;

/// Why no memory can be mapped; 0 when it can.
extern int mapError;
/// Whether the kernel seems to have pages of 16 KiB.
extern bool largePages;
/// Whether the kernel seems to be older than Linux 5.14.
extern bool isOldKernel;

/// Memory shared with children: they see changes.
template <class T>
T& shared() {
  void* memory =
      mmap(nullptr, sizeof(T), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
  return *new (memory) T{};
}

/// Runs `program` in a child, which exits with 0 unless it is killed. The child does
/// not outlive this process.
inline pid_t start(const std::function<void()>& program) {
  const pid_t child = fork();
  if (child == 0) {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    program();
    _exit(testing::Test::HasFailure() ? 1 : 0);
  }
  return child;
}
/// Waits for the end of a child, to which it first sends the signal, if any.
inline int waitFor(pid_t child, int signal = 0) {
  int status = -1;
  if (signal != 0) kill(child, signal);
  waitpid(child, &status, 0);
  return status;
}
/// Waits until a child stops itself.
inline pid_t untilItStops(pid_t child) {
  waitpid(child, nullptr, WUNTRACED);
  return child;
}
inline void run(const std::function<void()>& program) {
  EXPECT_EQ(waitFor(start(program)), 0);
}

/// What a shell command prints, on both streams. The command must exit with
/// `status`.
std::string outputOf(const std::string& command, int status = 0);

/// Prefix of shell commands that run Python: a sanitized library needs its runtime first.
extern const std::string kPython;

/// A pipe on which one process waits until another has closed it or written to it.
class Gate {
 public:
  Gate() { EXPECT_EQ(pipe2(ends_, O_CLOEXEC), 0); }
  int opener() const { return ends_[1]; }
  void open() const { EXPECT_EQ(write(ends_[1], "x", 1), 1); }
  void wait() const {
    char byte;
    EXPECT_EQ(read(ends_[0], &byte, 1), 1);
  }

 private:
  int ends_[2];
};

struct Keys {
  BHClientScalarKey* count = BHClientScalarForKey("count");
  BHClientScalarKey* gauge = BHClientScalarForKey("gauge");
  BHClientDistributionKey* series = BHClientDistributionForKey("series");
};

/// A device whose /run is on a tmpfs, with its store.
class Recording : public testing::Test, public SegmentSink {
 protected:
  Recording();
  ~Recording() override;

  void takeScalar(const SegmentScalar& scalar) override {
    auto& sum = scalars[{std::string(scalar.key), scalar.day}];
    sum = scalar.isSet ? scalar.value : sum + scalar.value;
    if (scalar.isSet) setTimes.push_back(scalar.setTime);
  }
  void takeRecord(const SegmentRecord& record) override {
    records[*record.key].push_back(record.value);
    seconds.push_back(record.day * std::int64_t{86'400} + record.secondsInDay);
  }

  /// The keys of the programs, once the process has looked them up, and values for them.
  static const Keys& keys();
  static void add(std::int64_t amount) { BHClientScalarAdd(keys().count, amount); }
  static void set(std::int64_t value) { BHClientScalarSet(keys().gauge, value); }
  static void record(double value) { BHClientDistributionRecord(keys().series, value); }

  std::vector<std::string> segments() const;
  /// Reads on in all segments, with encoded positions; acknowledges, and removes what is done.
  void fold();
  WriterPresence writerOf(const std::string& segment) const;

  /// Adds 1 and records a number, in all threads at the same time: all numbers from `first` up.
  static void recordInThreads(int threads, int perThread, int first = 0);
  /// The numbers from 0 up are in the series, each once, except `missing` of them.
  void expectEachOnce(std::size_t count, std::uint64_t missing = 0);

  /// A key's values of all days. Programs use the machine's clock.
  std::int64_t sum(const std::string& key) const {
    std::int64_t all = 0;
    for (const auto& [row, value] : scalars)
      if (row.first == key) all += value;
    return all;
  }
  std::int64_t& scalar(const char* key, std::int64_t day = kToday) {
    return scalars[{key, static_cast<std::int32_t>(day)}];
  }

  std::filesystem::path root;
  std::filesystem::path folder;
  BootInstant boot = 0;
  using Scalars = std::map<std::pair<std::string, std::int32_t>, std::int64_t>;  // by key and day
  Scalars scalars;
  std::map<std::string, std::vector<double>> records;
  std::vector<std::int64_t> seconds;
  std::vector<std::int64_t> setTimes;  // nanoseconds
  std::uint64_t dropped = 0;
  std::map<std::string, std::string> positions;
};

}  // namespace tavrel
