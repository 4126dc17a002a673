#include "platform/linux/service/file_notifications.h"

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <chrono>
#include <poll.h>
#include <sys/inotify.h>
#include <unistd.h>

#include "base/format.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/files/system_error.h"
#include "platform/linux/service/service_socket.h"

namespace tavrel {

namespace {

/// Longer than any 64-bit number with its line end.
constexpr std::size_t kLongestCounter = 32;

std::uint64_t microsecondsSince1970() {
  using std::chrono::microseconds;
  const auto now = std::chrono::system_clock::now().time_since_epoch();
  return static_cast<std::uint64_t>(std::chrono::duration_cast<microseconds>(now).count());
}

// From `errno`. When the kernel's limit of these is reached, it gives the code of another limit.
Error cannotWatch(const std::string& folder, const char* what) {
  if (errno != EMFILE && errno != ENOSPC) return systemError("watch", folder);
  return Error{format("cannot watch %s: no more inotify %s: raise fs.inotify.max_user_%s (sysctl)",
                      folder, what, what)};
}

}  // namespace

FileNotifications::FileNotifications(const DeviceRoot& root, SystemLog& log)
    : folder_(root.path(std::string(kServiceFolder) + "/notifications")), log_(log) {}

Expected<std::string> FileNotifications::pathOf(std::string_view name) const {
  if (!isServiceName(name)) {
    return Error{
        format("\"%s\" is not the name of a notification: give letters, digits, '.', '-' and '_', "
               "not beginning with '.', at most %zu",
               name, limits::kServiceNameBytes)};
  }
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
  FileSystem files;
  // Not the counter itself: everybody who can read it could lock it and block posters.
  const auto lock = files.lockFile(folder_ + "/.lock");
  if (!lock) return lock.error();

  const auto before = count(name);
  // More than any counter has reached, so that all waiting processes see a change.
  const std::uint64_t now = before ? *before + 1 : microsecondsSince1970();
  const std::string text = format("%llu\n", now);
  if (const auto written = files.replace(*path, asBytes(text), 0644); !written) {
    return written.error();
  }
  if (!before) {
    log_.log(LogLevel::Error, "%s; counting restarts at %llu", before.error().message, now);
  }
  return now;
}

Expected<std::uint64_t> FileNotifications::count(std::string_view name) const {
  const auto path = pathOf(name);
  if (!path) return path.error();
  FileSystem files;
  const auto text = files.readIfPresent(*path, kLongestCounter);
  if (!text) return text.error();
  if (!*text) return std::uint64_t{0};
  const std::string& digits = **text;
  std::uint64_t number = 0;
  const char* end = digits.data() + digits.size();
  const auto [stop, error] = std::from_chars(digits.data(), end, number);
  if (error != std::errc() || std::string_view(stop, end) != "\n") {
    return Error{format("%s does not contain a number and a line end", *path)};
  }
  return number;
}

Expected<std::optional<std::uint64_t>> FileNotifications::waitBeyond(
    std::string_view name, std::uint64_t seen, std::chrono::milliseconds longest) const {
  constexpr std::chrono::hours kLongestWait{24 * 365};
  const auto deadline =
      std::chrono::steady_clock::now() +
      std::clamp<std::chrono::milliseconds>(longest, std::chrono::milliseconds(0), kLongestWait);
  const Descriptor changes(inotify_init1(IN_CLOEXEC | IN_NONBLOCK));
  if (!changes) return cannotWatch(folder_, "instances");
  FileSystem files;
  std::uint64_t before = seen;
  // How often the folder may vanish between being made and being watched.
  constexpr int kMostAttempts = 100;
  int attempts = 0;
  while (true) {
    // Each time: somebody may have removed the folder, and with it the watch.
    if (const auto made = files.makeFolders(folder_); !made) return made.error();
    if (inotify_add_watch(changes.get(), folder_.c_str(), IN_MOVED_TO | IN_DELETE_SELF) < 0) {
      if (errno == ENOENT && ++attempts < kMostAttempts) continue;
      return cannotWatch(folder_, "watches");
    }
    attempts = 0;
    const auto now = count(name);
    if (!now) return now.error();
    if (*now == 0) before = 0;  // counting begins again
    if (*now != before) return std::optional(*now);
    const auto left =
        std::chrono::ceil<std::chrono::milliseconds>(deadline - std::chrono::steady_clock::now());
    if (left.count() <= 0) return std::optional<std::uint64_t>();
    pollfd state{.fd = changes.get(), .events = POLLIN, .revents = 0};
    poll(&state, 1, static_cast<int>(std::min<std::int64_t>(left.count(), 1 << 30)));
    alignas(inotify_event) char events[4096];
    while (read(changes.get(), events, sizeof events) > 0) {
    }
  }
}

}  // namespace tavrel
