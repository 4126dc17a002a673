#include "tools/records/folder_watch.h"

#include <cerrno>
#include <sys/inotify.h>
#include <unistd.h>

#include "platform/linux/files/descriptor.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/files/system_error.h"
#include "platform/linux/process/linux_event_loop.h"

namespace tavrel {
namespace {

// Watches the folder or, until it exists, its nearest existing ancestor. Watching a
// folder twice changes nothing.
Status watchNearest(int changes, const std::string& folder) {
  for (std::string at = folder, missing;;) {
    const std::uint32_t mask = IN_CREATE | IN_MOVED_TO | (missing.empty() ? IN_MODIFY : 0);
    if (inotify_add_watch(changes, at.c_str(), mask) >= 0) {
      if (missing.empty() || !FileSystem::status(missing)) return Done{};
      at = folder;  // made in the meantime
      missing.clear();
    } else {
      if (errno != ENOENT || at == "/") return systemError("watch", at);
      missing = at;
      const std::size_t slash = at.rfind('/');
      at.erase(slash == 0 || slash == std::string::npos ? 1 : slash);
      if (slash == std::string::npos) at = "/";
    }
  }
}

}  // namespace

Status watchFolder(const std::string& folder, const std::function<bool()>& look) {
  const Descriptor changes(inotify_init1(IN_CLOEXEC | IN_NONBLOCK));
  if (!changes) return systemError("watch", folder);
  Status watched = Done{};
  bool goesOn = true;
  const auto lookAgain = [&] {
    watched = watchNearest(changes.get(), folder);
    goesOn = watched && look();
    return LinuxEventLoop::Activity::Event;
  };
  LinuxEventLoop loop;
  const auto source = loop.watch(changes.get(), [&] {
    alignas(inotify_event) char events[4096];
    while (read(changes.get(), events, sizeof events) > 0) {
    }
    return lookAgain();
  });
  if (!source) return source.error();
  lookAgain();
  while (goesOn && loop.runSlice(std::chrono::hours(24)) != EventLoop::Slice::Terminated) {
  }
  return watched;
}

}  // namespace tavrel
