#include "platform/linux/file_notifications.h"

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <cstdio>
#include <fcntl.h>
#include <poll.h>
#include <sys/file.h>
#include <sys/inotify.h>
#include <unistd.h>

#include "base/format.h"
#include "platform/linux/descriptor.h"
#include "platform/linux/file_layer.h"
#include "platform/linux/service_socket.h"
#include "platform/linux/system_error.h"

namespace tavrel {

namespace {

/// Longer than any 64-bit number with its line end.
constexpr std::size_t kLongestCounter = 32;

Status writeNew(const std::string& path, std::string_view text) {
  const Descriptor file(
      open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC | O_NOFOLLOW, 0644));
  if (!file) return systemError("open", path);
  const ssize_t written = write(file.get(), text.data(), text.size());
  if (written < 0) return systemError("write", path);
  if (static_cast<std::size_t>(written) != text.size()) return systemError("write", path, ENOSPC);
  return Done{};
}

}  // namespace

FileNotifications::FileNotifications(const DeviceRoot& root, SystemLog& log)
    : folder_(root.path(std::string(kServiceFolder) + "/notifications")), log_(log) {}

Expected<std::string> FileNotifications::pathOf(std::string_view name) const {
  if (!isServiceName(name)) return Error{format("%s is not the name of a notification", name)};
  return format("%s/%s", folder_, name);
}

void FileNotifications::post(std::string_view name) {
  if (const auto posted = tryPost(name); !posted) {
    log_.log(LogLevel::Error, "cannot post %s: %s", name, posted.error().message);
  }
}

Expected<std::uint64_t> FileNotifications::tryPost(std::string_view name) {
  const auto path = pathOf(name);
  if (!path) return path.error();
  FileLayer files;
  if (const auto made = files.makeFolders(folder_); !made) return made.error();

  // Not the counter itself: whoever may read that could lock it and hold up everybody.
  const std::string lockPath = folder_ + "/.lock";
  const Descriptor lock(
      open(lockPath.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK, 0600));
  if (!lock) return systemError("open", lockPath);
  while (flock(lock.get(), LOCK_EX) != 0) {
    if (errno != EINTR) return systemError("lock", lockPath);
  }

  const auto before = count(name);
  if (!before) return before.error();
  // Not flushed: what is in /run does not outlive the machine's run.
  const std::string fresh = folder_ + "/.new";
  if (const auto written = writeNew(fresh, format("%llu\n", *before + 1)); !written) {
    return written.error();
  }
  if (std::rename(fresh.c_str(), path->c_str()) != 0) return systemError("replace", *path);
  return *before + 1;
}

Expected<std::uint64_t> FileNotifications::count(std::string_view name) const {
  const auto path = pathOf(name);
  if (!path) return path.error();
  FileLayer files;
  const auto text = files.readIfPresent(*path, kLongestCounter);
  if (!text) return text.error();
  if (!*text) return std::uint64_t{0};
  const std::string& digits = **text;
  std::uint64_t number = 0;
  const char* end = digits.data() + digits.size();
  const auto [stop, error] = std::from_chars(digits.data(), end, number);
  if (error != std::errc() || std::string_view(stop, end) != "\n") {
    return Error{format("%s holds no number and a line end; remove the file", *path)};
  }
  return number;
}

Expected<std::uint64_t> FileNotifications::waitBeyond(std::string_view name, std::uint64_t seen,
                                                      std::chrono::milliseconds longest) const {
  constexpr std::chrono::hours kLongestWait{24 * 365};
  const auto deadline =
      std::chrono::steady_clock::now() +
      std::clamp<std::chrono::milliseconds>(longest, std::chrono::milliseconds(0), kLongestWait);
  FileLayer files;
  if (const auto made = files.makeFolders(folder_); !made) return made.error();
  const Descriptor changes(inotify_init1(IN_CLOEXEC | IN_NONBLOCK));
  if (!changes ||
      inotify_add_watch(changes.get(), folder_.c_str(), IN_MOVED_TO | IN_DELETE_SELF) < 0) {
    return systemError("watch", folder_);
  }
  while (true) {
    const auto now = count(name);
    if (!now || *now != seen) return now;
    const auto left =
        std::chrono::ceil<std::chrono::milliseconds>(deadline - std::chrono::steady_clock::now());
    if (left.count() <= 0) return seen;
    pollfd state{.fd = changes.get(), .events = POLLIN, .revents = 0};
    poll(&state, 1, static_cast<int>(std::min<std::int64_t>(left.count(), 1 << 30)));
    alignas(inotify_event) char events[4096];
    while (read(changes.get(), events, sizeof events) > 0) {
    }
  }
}

}  // namespace tavrel
