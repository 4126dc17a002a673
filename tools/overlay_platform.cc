#include "tools/overlay_platform.h"

#include <map>
#include <utility>

#include "base/limits.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/sqlite_store.h"

namespace tavrel {
namespace {

class OverlayLog final : public SystemLog {
 public:
  void write(LogLevel level, std::string_view message) override {
    if (level == LogLevel::Error) lastError = message;
    if (handler) handler({level, std::string(message)});
  }

  OverlayPlatform::LineHandler handler;
  std::string lastError;
};

class OverlayPreferences final : public Preferences {
 public:
  explicit OverlayPreferences(Preferences& below) : below_(below) {}

  plist::Value ZTXPreferencesGetValue(std::string_view key, std::string_view domain) override {
    const auto at = written_.find(std::pair(std::string(domain), std::string(key)));
    return at == written_.end() ? below_.ZTXPreferencesGetValue(key, domain) : deepCopy(at->second);
  }
  void ZTXPreferencesSetValue(std::string_view key, const plist::Value& value,
                              std::string_view domain) override {
    written_[std::pair(std::string(domain), std::string(key))] = deepCopy(value);
  }
  bool ZTXPreferencesSynchronize(std::string_view) override { return true; }

 private:
  Preferences& below_;
  std::map<std::pair<std::string, std::string>, plist::Value> written_;  // by domain and key
};

class OverlayFiles final : public Files {
 public:
  explicit OverlayFiles(Files& below) : below_(below) {}

  Expected<std::string> read(std::string_view path, std::size_t largest) override {
    const auto at = replaced.find(path);
    if (at == replaced.end()) return below_.read(path, largest);
    if (at->second.size() > largest) return Error{std::string(path) + ": the file is too large"};
    return at->second;
  }
  std::optional<std::int64_t> size(std::string_view path) override {
    const auto at = replaced.find(path);
    if (at == replaced.end()) return below_.size(path);
    return static_cast<std::int64_t>(at->second.size());
  }

  std::map<std::string, std::string, std::less<>> replaced;

 private:
  Files& below_;
};

class CapturedFile final : public LogFile {
 public:
  explicit CapturedFile(std::string& bytes) : bytes_(bytes) {}
  void write(ByteSpan bytes) override { bytes_ += asText(bytes); }

 private:
  std::string& bytes_;
};

class OverlaySubmission final : public SubmissionService {
 public:
  explicit OverlaySubmission(SubmissionService& below) : below_(below) {}

  bool isDiagnosticSubmissionEnabled() override { return below_.isDiagnosticSubmissionEnabled(); }
  bool hasInternalDiagnostics(std::string_view identifier) override {
    return below_.hasInternalDiagnostics(identifier);
  }
  bool ZTXWriteLogForSubmission(std::string_view logType, std::string_view logName,
                                const plist::Dictionary& options,
                                const LogWriter& writer) override {
    CapturedLog log{std::string(logType), std::string(logName), options, {}};
    CapturedFile file(log.bytes);
    writer(file);
    logs.push_back(std::move(log));
    return true;
  }
  std::string ZTXOSVersion() override { return below_.ZTXOSVersion(); }
  plist::Value ZTXGetDATaskingValue(std::string_view key) override {
    return below_.ZTXGetDATaskingValue(key);
  }
  void submitDiagnosticLogs() override {}

  std::vector<CapturedLog> logs;

 private:
  SubmissionService& below_;
};

class OverlayStore final : public StatisticsStore {
 public:
  explicit OverlayStore(StatisticsStore& below) : below_(below) {}

  std::int32_t BHDaysSince1970() override { return below_.BHDaysSince1970(); }
  plist::Date dateForDaysSince1970(std::int32_t day) override {
    return below_.dateForDaysSince1970(day);
  }
  void BHClientCheckpoint() override {}
  void BHClientSetValueForScalarKey(std::string_view, std::int64_t) override {}
  std::unique_ptr<BHHistory> initWithDefaultPath() override { return below_.initWithDefaultPath(); }

 private:
  StatisticsStore& below_;
};

class OverlayCrashReporting final : public CrashReporting {
 public:
  explicit OverlayCrashReporting(CrashReporting& below) : below_(below) {}

  void FLLogStructuredData(std::uint32_t, const plist::Dictionary&) override {}
  void FLDumpAllOldStructuredDataLogs() override {}
  void rollNorvaneCareLogs() override {}
  std::string systemIdentifier() override { return below_.systemIdentifier(); }
  std::string hardwareModel() override { return below_.hardwareModel(); }
  std::string osVersion() override { return below_.osVersion(); }
  std::string incidentIdentifier() override { return below_.incidentIdentifier(); }

 private:
  CrashReporting& below_;
};

class OverlayNotifications final : public Notifications {
 public:
  void post(std::string_view) override {}
};

// Functions of libraries that reach preferences reach those of the overlay.
class OverlayLibrary final : public DynamicLibrary {
 public:
  OverlayLibrary(std::unique_ptr<DynamicLibrary> below, Preferences& preferences)
      : below_(std::move(below)), preferences_(preferences) {}

  LibraryFunction find(std::string_view function) override {
    const LibraryFunction found = below_->find(function);
    Preferences& preferences = preferences_;
    if (std::holds_alternative<IntegerPreferenceGetter>(found)) {
      return IntegerPreferenceGetter([&preferences](std::string_view key, std::string_view domain) {
        return preferences.ZTXPreferencesGetIntegerValue(key, domain);
      });
    }
    if (std::holds_alternative<PreferenceSetter>(found)) {
      return PreferenceSetter(
          [&preferences](std::string_view key, const plist::Value& value, std::string_view domain) {
            preferences.ZTXPreferencesSetValue(key, value, domain);
          });
    }
    return found;
  }

 private:
  std::unique_ptr<DynamicLibrary> below_;
  Preferences& preferences_;
};

class OverlayLoader final : public DynamicLoader {
 public:
  OverlayLoader(DynamicLoader& below, Preferences& preferences)
      : below_(below), preferences_(preferences) {}

  std::unique_ptr<DynamicLibrary> load(std::string_view path) override {
    auto library = below_.load(path);
    if (!library) return nullptr;
    return std::make_unique<OverlayLibrary>(std::move(library), preferences_);
  }

 private:
  DynamicLoader& below_;
  Preferences& preferences_;
};

}  // namespace

// The store is a second reader of the device's file, so that what it has to say and to count goes
// to the overlay too.
struct OverlayPlatform::Services {
  explicit Services(LinuxPlatform& linuxBelow)
      : below(linuxBelow.platform()),
        preferences(below.preferences),
        files(below.files),
        submission(below.submission),
        crashReporting(below.crashReporting),
        loader(below.dynamicLoader, preferences),
        reader(linuxBelow.root(), below.clock, preferences, log, limits::kStoreBusyMilliseconds,
               true),
        store(reader) {}

  Platform& below;
  OverlayLog log;
  OverlayPreferences preferences;
  OverlayFiles files;
  OverlaySubmission submission;
  OverlayCrashReporting crashReporting;
  OverlayNotifications notifications;
  OverlayLoader loader;
  SqliteStore reader;
  OverlayStore store;
  ProcessState state;
  Platform platform{
      .applications = below.applications,
      .clock = below.clock,
      .crashReporting = crashReporting,
      .dateFormatting = below.dateFormatting,
      .deviceAnswers = below.deviceAnswers,
      .digest = below.digest,
      .drivers = below.drivers,
      .dynamicLoader = loader,
      .eventLoop = below.eventLoop,
      .files = files,
      .locale = below.locale,
      .log = log,
      .namedServices = below.namedServices,
      .notifications = notifications,
      .preferences = preferences,
      .process = below.process,
      .propertyLists = below.propertyLists,
      .stackSnapshots = below.stackSnapshots,
      .standardStreams = below.standardStreams,
      .statistics = store,
      .submission = submission,
      .systemControls = below.systemControls,
      .systemVersion = below.systemVersion,
      .state = state,
  };
};

OverlayPlatform::OverlayPlatform(LinuxPlatform& below)
    : services_(std::make_unique<Services>(below)) {}
OverlayPlatform::~OverlayPlatform() = default;

Platform& OverlayPlatform::platform() {
  return services_->platform;
}

void OverlayPlatform::setLineHandler(LineHandler handler) {
  services_->log.handler = std::move(handler);
}

void OverlayPlatform::replaceFile(std::string path, std::string content) {
  services_->files.replaced[std::move(path)] = std::move(content);
}

const std::vector<CapturedLog>& OverlayPlatform::logs() const {
  return services_->submission.logs;
}

std::string_view OverlayPlatform::lastError() const {
  return services_->log.lastError;
}

}  // namespace tavrel
