// The statistics store: whether it is readable and sound, and has room.
#include <algorithm>
#include <cerrno>
#include <cmath>
#include <filesystem>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include "base/quantity_text.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/files/system_error.h"
#include "platform/linux/limits/device_limits.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/store/sqlite_store.h"
#include "tools/check/checks.h"
#include "tools/check/read_only.h"
#include "tools/console/table.h"

namespace tavrel {
namespace {

constexpr CheckFigureKind kSize{"size_bytes", "tavrel_store_size_bytes", "bytes",
                                "Size of the statistics store with its log."};
constexpr CheckFigureKind kFree{"free_bytes", "tavrel_store_free_bytes", "bytes",
                                "Free space of the file system that holds the store."};
constexpr CheckFigureKind kSetAside{"set_aside", "tavrel_store_set_aside", "",
                                    "Damaged stores that were set aside and are still there."};

// With less than this, a run may find no room for its log and the store's.
constexpr double kLittleSpace = 4 << 20;

// How far the store may exceed its limit: by its log, which is emptied beyond 1 MiB.
constexpr double kBeyondLimit = 4 << 20;

void checkSize(CheckScene& scene, const std::string& path, Check& check) {
  double size = 0;
  for (const char* ending : {"", "-wal"}) {
    const auto status = FileSystem::status(path + ending);
    if (status) size += static_cast<double>(status->st_size);
  }
  check.figures.push_back({&kSize, size});
  addFinding(check, CheckState::Ok, sizeText(size));
  LinuxPlatform& device = scene.context.linuxPlatform();
  const auto limits = DeviceLimits::read(scene.context.root(), device.fileSystem(),
                                         device.platform().propertyLists);
  // A fault in the limits has its own line.
  const double limit = limits ? static_cast<double>(limits->of(Kept::Store).bytes) : HUGE_VAL;
  if (size > limit + kBeyondLimit) {
    addFinding(check, CheckState::Warning, "more than the limit of " + sizeText(limit));
  }
  struct statvfs space {};
  if (statvfs(path.c_str(), &space) != 0) return;
  const double free = static_cast<double>(space.f_bavail) * static_cast<double>(space.f_frsize);
  check.figures.push_back({&kFree, free});
  if (free < kLittleSpace) {
    addFinding(check, CheckState::Critical,
               "only " + sizeText(free) + " are free: free some space in its file system");
  }
}

void examine(CheckScene& scene, const std::string& path, Check& check) {
  const auto history = scene.context.storeForReading().openHistory();
  const auto found = history ? (*history)->examine(scene.examination)
                             : Expected<SqliteHistory::Examination>(history.error());
  if (!found) {
    return addFinding(check,
                      FileSystem::isClosed(path) ? CheckState::Unknown : CheckState::Critical,
                      found.error().message);
  }
  if (!found->fault.empty()) {
    return addFinding(check, CheckState::Critical, "damaged: " + found->fault);
  }
  addFinding(check, CheckState::Ok,
             found->isWhole ? "no damage" : "no damage in the part that was checked in time");
}

// Files next to the store that need attention.
void checkCompanions(CheckScene& scene, const std::string& path, Check& check) {
  const std::filesystem::path file(path);
  const auto names = scene.context.linuxPlatform().fileSystem().list(file.parent_path().string());
  if (!names) return;
  const std::string name = file.filename().string();
  const auto damaged = std::ranges::count_if(*names, [&](const std::string& other) {
    return other.starts_with(name + ".corrupt-") && !other.ends_with("-wal") &&
           !other.ends_with("-shm");
  });
  check.figures.push_back({&kSetAside, static_cast<double>(damaged)});
  if (damaged > 0) {
    addFinding(check, CheckState::Warning,
               counted(static_cast<std::uint64_t>(damaged), "damaged store") + " set aside in " +
                   file.parent_path().string());
  }
  if (FileSystem::status(path + "-kept")) {
    addFinding(check, CheckState::Warning, "values wait in " + path + "-kept for a commit");
  }
}

// After errors, the kernel makes a file system read-only: nothing is recorded or filed any more.
void checkWritable(CheckScene& scene, const std::string& storePath, Check& check) {
  for (const std::string& path : {storePath, scene.context.root().path("/var/lib/tavrel")}) {
    if (!isOnReadOnlyFileSystem(path)) continue;
    return addFinding(check, CheckState::Critical,
                      "the file system of " + path +
                          " is read-only: look for its errors in the kernel's log, repair it and "
                          "mount it again");
  }
}

}  // namespace

void checkStore(CheckScene& scene) {
  Check check{"store"};
  const std::string& path = scene.context.storeForReading().path();
  struct stat status {};
  if (lstat(path.c_str(), &status) == 0) {  // a link without a target is not "none yet"
    checkSize(scene, path, check);
    examine(scene, path, check);
  } else if (errno == ENOENT || errno == ENOTDIR) {
    addFinding(check, CheckState::Ok, "none yet");
  } else {
    addFinding(check, CheckState::Unknown, systemError("check", path).message);
  }
  checkWritable(scene, path, check);
  checkCompanions(scene, path, check);
  scene.checks.push_back(std::move(check));
}

}  // namespace tavrel
