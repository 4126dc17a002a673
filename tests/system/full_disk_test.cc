// The daemon as a process on a small file system that is nearly full.
#include <sys/statvfs.h>

#include "base/format.h"
#include "child_process.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/store/sqlite_store.h"
#include "tests/devices/temporary_root.h"

namespace tavrel {
namespace {

bool succeeds(const std::string& command) {
  return std::system((command + " >/dev/null 2>&1").c_str()) == 0;
}

/// A file system of 16 MiB with blocks of 1 KiB, in a file.
struct SmallDisk {
  SmallDisk() {
    std::filesystem::create_directory(path);
    isMounted = ::geteuid() == 0 && succeeds("truncate -s 16M " + image) &&
                succeeds("mkfs.ext4 -q -b 1024 -m 0 " + image) &&
                succeeds("mount -o loop " + image + " " + path);
  }
  ~SmallDisk() {
    if (isMounted) succeeds("umount " + path);
  }
  SmallDisk(const SmallDisk&) = delete;
  SmallDisk& operator=(const SmallDisk&) = delete;

  void leaveFree(std::int64_t kibibytes) const {
    const Descriptor file(::open(filler.c_str(), O_WRONLY | O_CREAT, 0600));
    std::int64_t size = 0;
    for (int attempt = 0; attempt < 8; ++attempt) {  // by then, the cost of the filler itself shows
      struct statvfs status {};
      ASSERT_EQ(::statvfs(path.c_str(), &status), 0);
      const std::int64_t excess = static_cast<std::int64_t>(status.f_bavail) - kibibytes;
      if (excess == 0) return;
      size += excess * 1024;
      ASSERT_EQ(excess > 0 ? ::posix_fallocate(file.get(), 0, size) : ::ftruncate(file.get(), size),
                0);
    }
  }

  const TemporaryRoot folder;
  const std::string image = folder.root.path("/image"), path = folder.root.path("/disk");
  const std::string filler = path + "/filler";
  bool isMounted = false;
};

// At some of these sizes, SQLite would write into a hole of its index and be killed by SIGBUS.
TEST(FullDiskTest, NoSignalEndsARunAndNothingIsLost) {
  constexpr int kEvents = 2;
  int kept = 0;
  for (const int free : {0, 4, 16, 36, 60, 77, 78, 79, 80, 81, 110, 150, 400}) {
    SCOPED_TRACE(format("%d KiB free", free));
    const SmallDisk disk;
    if (!disk.isMounted) GTEST_SKIP() << "needs root, mkfs.ext4 and loop devices";
    const DeviceRoot root(disk.path);
    const std::string queue = root.path("/var/lib/tavrel/ecc-events");
    std::filesystem::create_directories(queue);
    for (int i = 0; i < kEvents; ++i)
      std::ofstream(format("%s/%d.event", queue, i)) << std::string(72, '\0');
    std::filesystem::create_directories(root.path("/sys/devices/system/edac/mc"));
    disk.leaveFree(free);

    const auto run = [&] { return waitFor(forkProcess([&] { executeBelow(disk.path, "-d"); })); };
    const auto scalars = [&root] {
      LinuxPlatform linuxPlatform(root);
      StatisticsStore& store = linuxPlatform.platform().statistics;
      int count = 0;
      store.initWithDefaultPath()->scalarsForKeyPrefix("com.norvane.lumenhall.DiskUsage", 0,
                                                       store.BHDaysSince1970(),
                                                       [&](auto, auto, auto, auto&) { ++count; });
      return count;
    };
    EXPECT_EQ(run(), 0);
    EXPECT_EQ(waitFor(forkProcess([&] { scalars(); })), 0) << "reading";
    if (std::filesystem::exists(LinuxPlatform(root).store().path() + "-kept")) ++kept;
    std::filesystem::remove(disk.filler);
    EXPECT_EQ(run(), 0);
    LinuxPlatform(root).platform().statistics->BHClientCheckpoint();  // as the next day's run does
    EXPECT_EQ(scalars(), 2);
    std::ptrdiff_t events = 0;  // waiting or filed
    for (const auto& entry : std::filesystem::recursive_directory_iterator(root.path("/var"))) {
      const std::string name = entry.path().filename();
      if (name.ends_with(".event")) ++events;
      if (!name.starts_with("172-")) continue;
      std::ifstream records(entry.path());
      events += std::count(std::istreambuf_iterator(records), {}, '\n');
    }
    EXPECT_EQ(events, kEvents);
  }
  EXPECT_GT(kept, 0);
}

}  // namespace
}  // namespace tavrel
