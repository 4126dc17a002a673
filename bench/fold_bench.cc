// A fold of real segments next to SQLite inserting the same packed values: a million measurements
// of a thousand keys, recorded by five processes. Both write one transaction into a new file.
#include <benchmark/benchmark.h>
#include <cstdlib>
#include <filesystem>
#include <sqlite3.h>
#include <string>
#include <sys/wait.h>
#include <unistd.h>

#include "platform/distribution_values.h"
#include "platform/linux/folding/segment_fold.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/store/sqlite_store.h"

namespace {

using namespace tavrel;

constexpr int kProcesses = 5;
constexpr int kKeys = 1000;
constexpr int kPerProcess = 200'000;

/// Segments and the store, both in memory to exclude the disk.
class Device {
 public:
  Device() {
    std::string made = "/dev/shm/tavrel-bench-XXXXXX";
    root = mkdtemp(made.data());
    std::filesystem::create_directories(root / "run/tavrel/stat");
  }
  ~Device() { std::filesystem::remove_all(root); }
  Device(const Device&) = delete;
  Device& operator=(const Device&) = delete;

  /// By other programs: libbrimhold of this one may have begun in another root.
  void record() const {
    const std::string recorder =
        std::filesystem::read_symlink("/proc/self/exe").parent_path() / "tavrel_record_values";
    for (int process = 0; process < kProcesses; ++process) {
      const pid_t child = fork();
      if (child == 0) {
        setenv("TAVREL_ROOT", root.c_str(), 1);
        execl(recorder.c_str(), recorder.c_str(), std::to_string(kKeys).c_str(),
              std::to_string(kPerProcess).c_str(), nullptr);
        _exit(1);
      }
      waitpid(child, nullptr, 0);
    }
  }

  std::filesystem::path root;
};

void foldOfSegments(benchmark::State& state) {
  std::uintmax_t bytes = 0;
  for (auto _ : state) {
    state.PauseTiming();
    const Device device;
    device.record();
    LinuxPlatform platform(DeviceRoot(device.root));
    state.ResumeTiming();
    const FoldReport report = platform.fold().run();
    state.PauseTiming();
    if (report.values != std::uint64_t{kProcesses} * kPerProcess || report.failure) std::abort();
    bytes = std::filesystem::file_size(platform.store().path());
    state.ResumeTiming();
  }
  state.SetItemsProcessed(state.iterations() * kProcesses * kPerProcess);
  state.counters["bytes"] = static_cast<double>(bytes);
}
BENCHMARK(foldOfSegments)->Name("fold/1,000,000 values of segments")->Unit(benchmark::kMillisecond);

void insertOfPackedValues(benchmark::State& state) {
  constexpr std::size_t kPerKey = kProcesses * kPerProcess / kKeys;
  const std::string values(kPerKey * kPackedValueBytes, 'v');
  const std::string offsets(kPerKey * kPackedOffsetBytes, 'o');
  for (auto _ : state) {
    state.PauseTiming();
    const Device device;
    state.ResumeTiming();
    sqlite3* handle = nullptr;
    sqlite3_stmt* insert = nullptr;
    sqlite3_open((device.root / "plain").c_str(), &handle);
    sqlite3_exec(handle,
                 "PRAGMA journal_mode = WAL; PRAGMA synchronous = FULL; BEGIN;"
                 "CREATE TABLE chunks (chunk INTEGER PRIMARY KEY, vals BLOB, offsets BLOB)",
                 nullptr, nullptr, nullptr);
    sqlite3_prepare_v2(handle, "INSERT INTO chunks VALUES (?, ?, ?)", -1, &insert, nullptr);
    for (int key = 0; key < kKeys; ++key) {
      sqlite3_bind_int(insert, 1, key);
      sqlite3_bind_blob64(insert, 2, values.data(), values.size(), SQLITE_STATIC);
      sqlite3_bind_blob64(insert, 3, offsets.data(), offsets.size(), SQLITE_STATIC);
      if (sqlite3_step(insert) != SQLITE_DONE) std::abort();
      sqlite3_reset(insert);
    }
    sqlite3_finalize(insert);
    if (sqlite3_exec(handle, "COMMIT", nullptr, nullptr, nullptr) != SQLITE_OK) std::abort();
    sqlite3_close_v2(handle);
  }
  state.SetItemsProcessed(state.iterations() * kProcesses * kPerProcess);
}
BENCHMARK(insertOfPackedValues)
    ->Name("fold/the same values packed into SQLite")
    ->Unit(benchmark::kMillisecond);

}  // namespace
