#include "tools/shared/tool_context.h"

#include <stdexcept>

#include "platform/linux/files/device_root.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/preferences/file_preferences.h"
#include "platform/linux/store/sqlite_store.h"

namespace tavrel {

class ToolContext::NotingLog final : public SystemLog {
 public:
  explicit NotingLog(ToolContext& context) : context_(context) {}
  void write(LogLevel level, std::string_view message) override {
    if (level < LogLevel::Default) return;
    if (context_.isNew(message)) context_.note(message);
    context_.hasComplaints_ = context_.hasComplaints_ || level == LogLevel::Error;
  }

 private:
  ToolContext& context_;
};

struct ToolContext::Services {
  explicit Services(ToolContext& context)
      : log(context),
        device(context.root(), {.log = &log}),
        store(context.root(), device.platform().clock, device.preferences(), log,
              limits::kStoreBusyMilliseconds, true) {}

  NotingLog log;
  LinuxPlatform device;
  SqliteStore store;
};

ToolContext::ToolContext(const ToolStreams& streams) : ToolOutput("tavrelctl", streams) {}
ToolContext::~ToolContext() = default;

const DeviceRoot& ToolContext::root() {
  if (!root_) {
    root_ = std::make_unique<DeviceRoot>(rootFolder_ ? DeviceRoot(*rootFolder_)
                                                     : DeviceRoot::fromEnvironment());
    if (const Status usable = root_->check(); !usable) {
      throw std::runtime_error(usable.error().message + " or --root");
    }
  }
  return *root_;
}

LinuxPlatform& ToolContext::linuxPlatform() {
  return services().device;
}

Platform& ToolContext::platform() {
  return linuxPlatform().platform();
}

ToolContext::Services& ToolContext::services() {
  if (!services_) services_ = std::make_unique<Services>(*this);
  return *services_;
}

FilePreferences& ToolContext::preferences() {
  return services().device.preferences();
}

void ToolContext::failOnce(std::string_view message) {
  if (isNew(message)) return fail(message);
  setExitStatus(kExitFailure);
}

SqliteStore& ToolContext::storeForReading() {
  return services().store;
}

}  // namespace tavrel
