// Recording through libbrimhold next to the minimum, in one program: an atomic add on a shared
// page, a read of the coarse clock and a comparison of days; for records, also a store of 16 bytes.
// Both include the cost of a page of memory and exclude folding.
#include <atomic>
#include <benchmark/benchmark.h>
#include <cstdlib>
#include <ctime>
#include <fcntl.h>
#include <filesystem>
#include <mutex>
#include <string>
#include <sys/mman.h>
#include <unistd.h>

#include "brimhold/client.h"
#include "client/segment_format.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/segments/segment_reader.h"

namespace {

using namespace tavrel;

constexpr int kBatch = 20'000;

struct NoSink : SegmentSink {
  void takeScalar(const SegmentScalar&) override {}
  void takeRecord(const SegmentRecord&) override {}
};

/// A device in memory, with its fold.
class Device {
 public:
  Device() {
    std::string made = "/dev/shm/tavrel-bench-XXXXXX";
    root_ = mkdtemp(made.data());
    std::filesystem::create_directories(root_ / "run/tavrel/stat");
    setenv("TAVREL_ROOT", root_.c_str(), 1);
  }
  ~Device() { std::filesystem::remove_all(root_); }

  /// Aborts when values were dropped, or the library made no segment, because the figures would
  /// then measure something different.
  void fold() {
    const std::scoped_lock lock(mutex_);
    bool hasSegment = false;
    for (const auto& entry : std::filesystem::directory_iterator(root_ / "run/tavrel/stat")) {
      if (entry.path().extension() != ".segment") continue;
      hasSegment = true;
      const Descriptor file(open(entry.path().c_str(), O_RDWR | O_CLOEXEC));
      NoSink sink;
      const SegmentProgress progress = SegmentReader(file.get()).read(position_, 0, false, sink);
      if (!acknowledge(file.get(), progress) || progress.dropped != 0) std::abort();
    }
    if (!hasSegment) std::abort();
  }

 private:
  std::mutex mutex_;
  std::filesystem::path root_;
  SegmentPosition position_;
};

Device& device() {
  static Device device;
  return device;
}

std::uint64_t coarseSeconds() {
  timespec now{};
  clock_gettime(CLOCK_REALTIME_COARSE, &now);
  return static_cast<std::uint64_t>(now.tv_sec);
}

/// A populated shared mapping on a page boundary.
template <class T>
T* sharedPages(std::size_t bytes) {
  void* memory = mmap(nullptr, bytes, PROT_READ | PROT_WRITE,
                      MAP_SHARED | MAP_ANONYMOUS | MAP_POPULATE, -1, 0);
  if (memory == MAP_FAILED) std::abort();
  return static_cast<T*>(memory);
}

struct FloorCell {
  std::atomic<std::uint64_t> start;
  std::atomic<std::int64_t> value;
};

__attribute__((noinline)) void floorAdd(FloorCell* cell, std::int64_t amount) {
  if (coarseSeconds() - cell->start.load(std::memory_order_relaxed) >= kBHSecondsPerDay) {
    cell->start = coarseSeconds() / kBHSecondsPerDay * kBHSecondsPerDay;
  }
  cell->value.fetch_add(amount, std::memory_order_relaxed);
}

void addFloor(benchmark::State& state) {
  static FloorCell* const cell = sharedPages<FloorCell>(4096);
  for (auto _ : state)
    floorAdd(cell, 1);
}

void add(benchmark::State& state) {
  device();
  static BHClientScalarKey* const key = BHClientScalarForKey("bench.add");
  for (auto _ : state)
    BHClientScalarAdd(key, 1);
  device().fold();
}

void set(benchmark::State& state) {
  device();
  static BHClientScalarKey* const key = BHClientScalarForKey("bench.set");
  for (auto _ : state)
    BHClientScalarSet(key, 1);
  device().fold();
}

struct FloorRecord {
  double value;
  std::atomic<std::uint64_t> mark;
};
struct FloorLog {
  std::atomic<std::uint64_t> start;
  std::atomic<std::uint64_t> next;
  FloorRecord records[1 << 16];
};

__attribute__((noinline)) void floorRecord(FloorLog* log, double value) {
  const std::uint64_t now = coarseSeconds();
  if (now - log->start.load(std::memory_order_relaxed) >= kBHSecondsPerDay) {
    log->start = now / kBHSecondsPerDay * kBHSecondsPerDay;
  }
  const std::uint64_t at = log->next.fetch_add(1, std::memory_order_relaxed) % (1 << 16);
  log->records[at].value = value;
  log->records[at].mark.store(now, std::memory_order_release);
}

// One log per thread, as in the library.
void recordFloor(benchmark::State& state) {
  FloorLog* const log = sharedPages<FloorLog>(sizeof(FloorLog));
  double value = 0;
  while (state.KeepRunningBatch(kBatch)) {
    for (int i = 0; i < kBatch; ++i)
      floorRecord(log, value += 1);
  }
  munmap(log, sizeof(FloorLog));
}

void record(benchmark::State& state) {
  static BHClientDistributionKey* const key =
      (device(), BHClientDistributionForKey("bench.record"));
  double value = 0;
  int batches = 0;
  while (state.KeepRunningBatch(kBatch)) {
    for (int i = 0; i < kBatch; ++i)
      BHClientDistributionRecord(key, value += 1);
    if (++batches % 3 != 0) continue;
    state.PauseTiming();
    device().fold();
    state.ResumeTiming();
  }
  device().fold();
}

BENCHMARK(addFloor)->Name("client/addFloor");
BENCHMARK(add)->Name("client/add");
BENCHMARK(addFloor)->Name("client/addFloor")->Threads(2);
BENCHMARK(add)->Name("client/add")->Threads(2);
BENCHMARK(set)->Name("client/set");
BENCHMARK(recordFloor)->Name("client/recordFloor");
BENCHMARK(record)->Name("client/record");
BENCHMARK(recordFloor)->Name("client/recordFloor")->Threads(2);
BENCHMARK(record)->Name("client/record")->Threads(2);

}  // namespace
