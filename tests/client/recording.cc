#include "recording.h"

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstdlib>
#include <ctime>
#include <sys/stat.h>
#include <thread>

namespace {
constexpr std::size_t kLargePage = 16'384;
}

extern "C" {
// Where time_t and off_t are wider than long, the C library's calls have other names.
int realClock(clockid_t clock, timespec* now) __asm__("__real_" TAVREL_CLOCK_CALL);
int wrappedClock(clockid_t clock, timespec* now) __asm__("__wrap_" TAVREL_CLOCK_CALL);
void* realMap(void* from, std::size_t bytes, int access, int flags, int file,
              off_t offset) __asm__("__real_" TAVREL_MAP_CALL);
void* wrappedMap(void* from, std::size_t bytes, int access, int flags, int file,
                 off_t offset) __asm__("__wrap_" TAVREL_MAP_CALL);
int __real_madvise(void* from, std::size_t bytes, int advice);
int __wrap_madvise(void* from, std::size_t bytes, int advice);
long __real_sysconf(int name);
long __wrap_sysconf(int name);

int __wrap_madvise(void* from, std::size_t bytes, int advice) {
  if (tavrel::whileFetching) tavrel::whileFetching();
  constexpr int kPopulateWrite = 23;
  if ((tavrel::largePages && reinterpret_cast<std::uintptr_t>(from) % kLargePage != 0) ||
      (tavrel::isOldKernel && advice == kPopulateWrite)) {
    errno = EINVAL;
    return -1;
  }
  return __real_madvise(from, bytes, advice);
}

long __wrap_sysconf(int name) {
  return name == _SC_PAGESIZE && tavrel::largePages ? long{kLargePage} : __real_sysconf(name);
}

void* wrappedMap(void* from, std::size_t bytes, int access, int flags, int file, off_t offset) {
  if (tavrel::mapError != 0) {
    errno = tavrel::mapError;
    return MAP_FAILED;
  }
  if (tavrel::largePages && from == nullptr) {
    void* const room =
        realMap(nullptr, bytes + kLargePage, PROT_NONE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    from = static_cast<char*>(room) + -reinterpret_cast<std::uintptr_t>(room) % kLargePage;
    flags |= MAP_FIXED;
  }
  return realMap(from, bytes, access, flags, file, offset);
}

int wrappedClock(clockid_t clock, timespec* now) {
  const bool isReal = clock == CLOCK_REALTIME || clock == CLOCK_REALTIME_COARSE;
  if (auto* const whenRead = tavrel::testClock().whenRead.load(); isReal && whenRead) whenRead();
  const bool isBoot = clock == CLOCK_BOOTTIME;
  const bool isSteady = clock == CLOCK_MONOTONIC && tavrel::testClock().monotonic != 0;
  const bool isCoarse = clock == CLOCK_MONOTONIC_COARSE;
  const std::int64_t seconds = isReal     ? tavrel::testClock().realtime.load()
                               : isCoarse ? tavrel::testClock().coarse.load()
                               : isBoot   ? tavrel::testClock().boot.load()
                               : isSteady ? tavrel::testClock().monotonic += 10
                                          : 0;
  if (seconds == 0) return realClock(clock, now);
  *now = {seconds, isSteady ? static_cast<long>(seconds * 10'000'000) : 0};
  return 0;
}
}

namespace tavrel {

std::function<void()> whileFetching;
int mapError = 0;
bool largePages = false;
bool isOldKernel = false;

TestClock& testClock() {
  static TestClock& clock = shared<TestClock>();
  return clock;
}

std::string outputOf(const std::string& command, int status) {
  FILE* const pipe = popen(("{ " + command + "; } 2>&1").c_str(), "r");
  std::string output;
  char part[4096];
  while (const std::size_t size = fread(part, 1, sizeof part, pipe))
    output.append(part, size);
  EXPECT_EQ(WEXITSTATUS(pclose(pipe)), status) << command << "\n" << output;
  return output;
}

const std::string kPython =
    *TAVREL_LINK_FLAGS == '\0'
        ? ""
        : "ASAN_OPTIONS=detect_leaks=0 LD_PRELOAD=$(cc -print-file-name=libasan.so) ";

Recording::Recording() {
  umask(022);  // files that other users may write are not trusted
  std::string made = "/dev/shm/tavrel-XXXXXX";
  root = mkdtemp(made.data());
  folder = root / "run/tavrel/stat";
  std::filesystem::create_directories(folder);
  setenv("TAVREL_ROOT", root.c_str(), 1);
  testClock().realtime = kToday * 86'400 + 3600;
  testClock().boot = 0;
  testClock().monotonic = 0;
  testClock().coarse = 0;
}

Recording::~Recording() {
  std::filesystem::remove_all(root);
}

const Keys& Recording::keys() {
  static const Keys keys;
  return keys;
}

void Recording::recordInThreads(int threads, int perThread, int first) {
  std::vector<std::jthread> all;
  for (int thread = 0; thread < threads; ++thread)
    all.emplace_back([=] {
      for (int i = 0; i < perThread; ++i) {
        add(1);
        record(first + thread * perThread + i);
      }
    });
}

void Recording::expectEachOnce(std::size_t count, std::uint64_t missing) {
  auto& values = records["series"];
  std::sort(values.begin(), values.end());
  ASSERT_EQ(values.size() + missing, count);
  ASSERT_EQ(std::ranges::adjacent_find(values), values.end());
  ASSERT_TRUE(std::ranges::all_of(values, [&](double value) {
    return value >= 0 && value < static_cast<double>(count) && value == std::trunc(value);
  }));
}

std::vector<std::string> Recording::segments() const {
  std::vector<std::string> paths;
  for (const auto& entry : std::filesystem::directory_iterator(folder))
    if (entry.path().extension() == ".segment") paths.push_back(entry.path());
  std::sort(paths.begin(), paths.end());
  return paths;
}

WriterPresence Recording::writerOf(const std::string& segment) const {
  const Descriptor file(open(segment.c_str(), O_RDONLY));
  return findSegmentWriter(file.get(), SegmentFile(file.get()).facts());
}

void Recording::fold() {
  for (const std::string& path : segments()) {
    const Descriptor file(open(path.c_str(), O_RDONLY));
    // When threads begin a segment at the same time, only one keeps its own.
    if (!file && errno == ENOENT) continue;
    SegmentReader reader(file.get());
    const bool isGone = findSegmentWriter(file.get(), reader.facts()) == WriterPresence::Gone;
    const auto state = reader.state();
    ASSERT_TRUE(state) << state.error().message;
    SegmentProgress progress;
    if (*state == SegmentReader::State::Begun) {
      std::string& bytes = positions[path];
      SegmentPosition position;
      if (!bytes.empty()) position = *SegmentPosition::decode(bytes);
      progress = reader.read(position, boot, isGone, *this);
      dropped += progress.dropped;
      bytes = position.encode();
    }
    if (isGone && progress.isComplete) {
      std::filesystem::remove(path);
    } else if (!isGone && *state == SegmentReader::State::Begun) {
      const Descriptor writable(open(path.c_str(), O_WRONLY));
      if (!writable && errno == ENOENT) continue;
      ASSERT_TRUE(acknowledge(writable.get(), progress));
    }
  }
}

}  // namespace tavrel
