#include <algorithm>
#include <cerrno>
#include <sys/file.h>
#include <time.h>
#include <unistd.h>

#include "platform/linux/files/file_opening.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/files/system_error.h"

namespace tavrel {
namespace {

constexpr const char* kLockName = "/.lock";
constexpr mode_t kLockMode = 0600;

std::int64_t monotonicMilliseconds() {
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC, &now);
  return std::int64_t{now.tv_sec} * 1000 + now.tv_nsec / 1'000'000;
}

}  // namespace

Expected<Descriptor> FileSystem::openLock(const std::string& path) {
  Expected<Descriptor> descriptor = openOrMake(path, O_RDWR, kLockMode);
  if (!descriptor) return descriptor;
  return keepFromOthers(*std::move(descriptor), path);
}

Expected<Descriptor> FileSystem::lockFile(const std::string& path, const LockPatience& patience) {
  Expected<Descriptor> descriptor = openLock(path);
  if (!descriptor) return descriptor;
  if (Status locked = lock(descriptor->get(), path, patience); !locked) return locked.error();
  return descriptor;
}

Expected<std::optional<Descriptor>> FileSystem::lockFileIfFree(const std::string& path) {
  Expected<Descriptor> descriptor = openLock(path);
  if (!descriptor) return descriptor.error();
  const auto isLocked = tryLock(descriptor->get(), path);
  if (!isLocked) return isLocked.error();
  if (!*isLocked) return std::optional<Descriptor>();
  return std::optional(*std::move(descriptor));
}

Expected<Descriptor> FileSystem::openFolderLock(const std::string& folder) {
  const std::string path = folder + kLockName;
  Descriptor lock(openFile(path.c_str(), O_RDWR | O_CREAT | O_NOFOLLOW | kOpenSafely, kLockMode));
  if (lock) return keepFromOthers(std::move(lock), path);
  if (errno != ENOSPC && errno != EDQUOT) return cannotOpen("lock", path);
  // The disk has no room for an empty file, not for other processes either. Work that frees room
  // must go on: lock the folder itself, even though others could lock it too.
  Descriptor open(openFile(folder.c_str(), O_RDONLY | O_DIRECTORY, 0));
  if (!open) return systemError("lock", folder);
  return open;
}

Expected<Descriptor> FileSystem::lockFolder(const std::string& folder,
                                            const LockPatience& patience) {
  Expected<Descriptor> descriptor = openFolderLock(folder);
  if (!descriptor) return descriptor;
  const Status locked = lock(descriptor->get(), folder + kLockName, patience);
  if (!locked) return locked.error();
  return descriptor;
}

// Whoever can open a file can lock it. Users who may create files in the folder are trusted, such
// as the uploader's own user and members of the folder's group, unless everybody may.
Expected<Descriptor> FileSystem::keepFromOthers(Descriptor lock, const std::string& path) {
  struct stat found {};
  const auto folder = status(folderOf(path));
  if (fstat(lock.get(), &found) != 0 || !folder) return systemError("lock", path);
  if (!S_ISREG(found.st_mode)) return notRegular(path, found.st_mode);
  if ((folder->st_mode & S_IWOTH) != 0 && found.st_uid != 0 && found.st_uid != geteuid() &&
      found.st_uid != folder->st_uid) {
    return Error{"cannot lock " + path + ": user " + std::to_string(found.st_uid) +
                 " owns it; remove it, and do not let all users write to its folder"};
  }
  if ((found.st_mode & (S_IRWXG | S_IRWXO)) != 0 && fchmod(lock.get(), kLockMode) != 0) {
    return systemError("set the mode of", path);
  }
  return lock;
}

Expected<bool> FileSystem::tryLock(int descriptor, const std::string& path) {
  while (flock(descriptor, LOCK_EX | LOCK_NB) != 0) {
    if (errno == EWOULDBLOCK) return false;
    if (errno != EINTR) return systemError("lock", path);
  }
  return true;
}

Status FileSystem::lock(int descriptor, const std::string& path, const LockPatience& patience) {
  constexpr long kLongestPause = 32'000'000;  // so that a long wait hardly wakes the processor
  timespec pause{0, 2'000'000};
  const std::int64_t end = monotonicMilliseconds() + patience.milliseconds;
  while (true) {
    const auto isLocked = tryLock(descriptor, path);
    if (!isLocked) return isLocked.error();
    if (*isLocked) return Done{};
    if (monotonicMilliseconds() > end) {
      const std::string held = patience.milliseconds == 0
                                   ? "has it locked; "
                                   : "has had it locked for " +
                                         std::to_string(patience.milliseconds / 1000) +
                                         " seconds; ";
      return Error{"cannot lock " + path + ": another process " + held +
                   std::string(patience.advice)};
    }
    nanosleep(&pause, nullptr);
    pause.tv_nsec = std::min(2 * pause.tv_nsec, kLongestPause);
  }
}

}  // namespace tavrel
