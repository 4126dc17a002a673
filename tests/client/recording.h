// Programs that record, as children of the test; clocks that the test sets; and a store in memory
// that folds what they leave.
#pragma once

#include <atomic>
#include <cstdint>
#include <fcntl.h>
#include <filesystem>
#include <functional>
#include <gtest/gtest.h>
#include <map>
#include <string>
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

#include "brimhold/client.h"
#include "client/segment_format.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/segments/segment_reader.h"
#include "platform/linux/segments/segment_writer.h"

namespace tavrel {

inline constexpr std::int64_t kToday = 25'000;  // a day after any build

/// What clock_gettime shows in this program, in seconds; 0 leaves a clock alone. In memory that
/// children share.
struct TestClock {
  std::atomic<std::int64_t> realtime;
  std::atomic<std::int64_t> boot;
};
TestClock& testClock();

/// Memory whose changes children see.
template <class T>
T& shared() {
  void* memory =
      mmap(nullptr, sizeof(T), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
  return *new (memory) T{};
}

/// Runs `program` in a child, which ends with status 0 unless it was killed.
inline pid_t start(const std::function<void()>& program) {
  const pid_t child = fork();
  if (child == 0) {
    program();
    _exit(testing::Test::HasFailure() ? 1 : 0);
  }
  return child;
}
inline int waitFor(pid_t child) {
  int status = -1;
  waitpid(child, &status, 0);
  return status;
}
inline void run(const std::function<void()>& program) {
  EXPECT_EQ(waitFor(start(program)), 0);
}

/// A pipe on which one process waits until another has closed or written.
class Gate {
 public:
  Gate() { EXPECT_EQ(pipe2(ends_, O_CLOEXEC), 0); }
  void open() const { EXPECT_EQ(write(ends_[1], "x", 1), 1); }
  void wait() const {
    char byte;
    EXPECT_EQ(read(ends_[0], &byte, 1), 1);
  }

 private:
  int ends_[2];
};

/// A device whose /run is on a tmpfs, and its store.
class Recording : public testing::Test, public SegmentSink {
 protected:
  Recording();
  ~Recording() override;

  void takeScalar(const SegmentScalar& scalar) override {
    auto& sum = scalars[{std::string(scalar.key), scalar.day}];
    sum = scalar.isSet ? scalar.value : sum + scalar.value;
  }
  void takeRecord(const SegmentRecord& record) override {
    records[std::string(record.key)].push_back(record.value);
    seconds.push_back(record.day * std::int64_t{86'400} + record.secondsInDay);
  }

  std::vector<std::string> segments() const;
  /// Reads all segments on from where the last fold ended, acknowledges, and removes those that are
  /// done. Positions go through their bytes.
  void fold();
  SegmentWriter writerOf(const std::string& segment) const;

  std::int64_t& scalar(const char* key, std::int64_t day = kToday) {
    return scalars[{key, static_cast<std::int32_t>(day)}];
  }

  std::filesystem::path root;
  std::filesystem::path folder;
  BootInstant boot = 0;
  std::map<std::pair<std::string, std::int32_t>, std::int64_t> scalars;
  std::map<std::string, std::vector<double>> records;
  std::vector<std::int64_t> seconds;
  std::uint64_t dropped = 0;
  std::uint64_t refused = 0;
  std::map<std::string, std::string> positions;
};

}  // namespace tavrel
