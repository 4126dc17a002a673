#include "tools/noting_platform.h"

#include "platform/linux/file_preferences.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/recorded_registry.h"
#include "platform/linux/recorded_snapshots.h"

namespace tavrel {
namespace {

class NotingLog final : public SystemLog {
 public:
  explicit NotingLog(ToolContext& context) : context_(context) {}
  void write(LogLevel level, std::string_view message) override {
    if (level >= LogLevel::Default) context_.note(message);
    hasErrors |= level == LogLevel::Error;
  }

  bool hasErrors = false;

 private:
  ToolContext& context_;
};

}  // namespace

void NotingStreams::writeOutput(std::string_view text) {
  while (text.ends_with('\n'))
    text.remove_suffix(1);
  if (text.empty()) return;
  hasPrinted_ = true;
  context_.note(text);
}

struct NotingPlatform::Services {
  explicit Services(ToolContext& context)
      : below(context.platform()),
        log(context),
        streams(context),
        registry(context.root(), context.linuxPlatform().fileLayer(), below.propertyLists, log),
        snapshots(context.root(), context.linuxPlatform().fileLayer(), log),
        platform{
            .applications = below.applications,
            .clock = below.clock,
            .crashReporting = below.crashReporting,
            .dateFormatting = below.dateFormatting,
            .deviceAnswers = below.deviceAnswers,
            .digest = below.digest,
            .drivers = registry,
            .dynamicLoader = below.dynamicLoader,
            .eventLoop = below.eventLoop,
            .files = below.files,
            .locale = below.locale,
            .log = log,
            .namedServices = below.namedServices,
            .notifications = below.notifications,
            .preferences = context.preferences(),
            .process = below.process,
            .propertyLists = below.propertyLists,
            .stackSnapshots = snapshots,
            .standardStreams = streams,
            .statistics = below.statistics,
            .submission = below.submission,
            .systemControls = below.systemControls,
            .systemVersion = below.systemVersion,
            .state = below.state,
        } {}

  Platform& below;
  NotingLog log;
  NotingStreams streams;
  RecordedRegistry registry;
  RecordedSnapshots snapshots;
  Platform platform;
};

NotingPlatform::NotingPlatform(ToolContext& context)
    : services_(std::make_unique<Services>(context)) {}
NotingPlatform::~NotingPlatform() = default;

Platform& NotingPlatform::platform() {
  return services_->platform;
}

RecordedRegistry& NotingPlatform::registry() {
  return services_->registry;
}

bool NotingPlatform::hasPrinted() const {
  return services_->streams.hasPrinted();
}

bool NotingPlatform::hasErrors() const {
  return services_->log.hasErrors;
}

}  // namespace tavrel
