// Services that a run writes to. Writes stay in memory and are reported; reads return data from the
// device and earlier writes of the run.
#pragma once

#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "platform/forwarding_store.h"
#include "platform/linux/logs/file_crash_reporting.h"
#include "platform/linux/logs/file_submission.h"
#include "platform/platform.h"
#include "tools/overlay/captured_log.h"
#include "tools/overlay/overlay_events.h"

namespace tavrel {

class OverlayLog final : public SystemLog {
 public:
  explicit OverlayLog(const OverlayEvents& events) : events_(events) {}

  void write(LogLevel level, std::string_view message) override;

  std::string lastError;

 private:
  const OverlayEvents& events_;
};

class OverlayStreams final : public StandardStreams {
 public:
  explicit OverlayStreams(const OverlayEvents& events) : events_(events) {}

  void writeOutput(std::string_view text) override;
  void writeError(std::string_view text) override;

 private:
  const OverlayEvents& events_;
};

class OverlayPreferences final : public Preferences {
 public:
  OverlayPreferences(Preferences& below, const OverlayEvents& events)
      : below_(below), events_(events) {}

  plist::Value ZTXPreferencesGetValue(std::string_view key, std::string_view domain) override;
  void ZTXPreferencesSetValue(std::string_view key, const plist::Value& value,
                              std::string_view domain) override;
  bool ZTXPreferencesSynchronize(std::string_view domain) override;

 private:
  Preferences& below_;
  const OverlayEvents& events_;
  std::map<std::pair<std::string, std::string>, plist::Value> written_;  // by domain and key
};

class OverlaySubmission final : public SubmissionService {
 public:
  OverlaySubmission(FileSubmission& below, const OverlayEvents& events)
      : below_(below), events_(events) {}

  bool isDiagnosticSubmissionEnabled() override;
  bool isPermissionReadable() override { return below_.isPermissionReadable(); }
  bool hasInternalDiagnostics(std::string_view identifier) override;
  bool ZTXWriteLogForSubmission(std::string_view logType, std::string_view logName,
                                const plist::Dictionary& options, const LogWriter& writer) override;
  std::string ZTXOSVersion() override;
  plist::Value ZTXGetDATaskingValue(std::string_view key) override;
  void submitDiagnosticLogs() override;

  std::vector<CapturedLog> logs;

 private:
  class CapturedFile final : public LogFile {
   public:
    explicit CapturedFile(std::string& bytes) : bytes_(bytes) {}
    void write(ByteSpan bytes) override { bytes_ += asText(bytes); }

   private:
    std::string& bytes_;
  };

  void deliverDeletion();

  FileSubmission& below_;
  const OverlayEvents& events_;
};

class OverlayStore final : public ForwardingStore {
 public:
  OverlayStore(StatisticsStore& below, const OverlayEvents& events)
      : ForwardingStore(below), events_(events) {}

  bool BHClientCheckpoint() override;
  void BHClientSetValueForScalarKey(std::string_view key, std::int64_t value) override;
  std::unique_ptr<BHHistory> initWithDefaultPath() override;

 private:
  const OverlayEvents& events_;
};

class OverlayCrashReporting final : public CrashReporting {
 public:
  OverlayCrashReporting(FileCrashReporting& below, const OverlayEvents& events)
      : below_(below), events_(events) {}

  void FLLogStructuredData(std::uint32_t logType, const plist::Dictionary& record) override;
  void FLDumpAllOldStructuredDataLogs() override;
  void rollNorvaneCareLogs() override;
  std::string systemIdentifier() override;
  std::string hardwareModel() override;
  std::string osVersion() override;
  std::string incidentIdentifier() override;

 private:
  std::string delivered(const char* fact, std::string text);

  FileCrashReporting& below_;
  const OverlayEvents& events_;
};

class OverlayNotifications final : public Notifications {
 public:
  explicit OverlayNotifications(const OverlayEvents& events) : events_(events) {}
  void post(std::string_view name) override;

 private:
  const OverlayEvents& events_;
};

}  // namespace tavrel
