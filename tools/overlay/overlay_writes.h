// Services that a run writes to. Writes stay in memory and are reported; reads return data from the
// device and earlier writes of the run.
#pragma once

#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "base/format.h"
#include "platform/linux/logs/file_crash_reporting.h"
#include "platform/linux/logs/file_submission.h"
#include "platform/platform.h"
#include "tools/overlay/overlay_events.h"

namespace tavrel {

/// A log that was handed to the submission service.
struct CapturedLog {
  std::string type;
  std::string name;
  plist::Dictionary options;  // an empty handle for none
  std::string bytes;
};

class OverlayLog final : public SystemLog {
 public:
  explicit OverlayLog(const OverlayEvents& events) : events_(events) {}

  void write(LogLevel level, std::string_view message) override {
    constexpr const char* kNames[] = {"debug", "info", "default", "error"};
    if (level == LogLevel::Error) lastError = message;
    events_.tell(OverlayEvent::Kind::LogLine, kNames[static_cast<std::size_t>(level)],
                 std::string(message));
  }

  std::string lastError;

 private:
  const OverlayEvents& events_;
};

class OverlayStreams final : public StandardStreams {
 public:
  explicit OverlayStreams(const OverlayEvents& events) : events_(events) {}

  void writeOutput(std::string_view text) override {
    events_.tell(OverlayEvent::Kind::OutputText, "on standard output", std::string(text));
  }
  void writeError(std::string_view text) override {
    events_.tell(OverlayEvent::Kind::ErrorText, "on standard error", std::string(text));
  }

 private:
  const OverlayEvents& events_;
};

class OverlayPreferences final : public Preferences {
 public:
  OverlayPreferences(Preferences& below, const OverlayEvents& events)
      : below_(below), events_(events) {}

  plist::Value ZTXPreferencesGetValue(std::string_view key, std::string_view domain) override {
    const auto at = written_.find(std::pair(std::string(domain), std::string(key)));
    plist::Value value =
        at == written_.end() ? below_.ZTXPreferencesGetValue(key, domain) : deepCopy(at->second);
    events_.tell(OverlayEvent::Kind::Preference, format("%s %s", domain, key), value);
    return value;
  }
  void ZTXPreferencesSetValue(std::string_view key, const plist::Value& value,
                              std::string_view domain) override {
    written_[std::pair(std::string(domain), std::string(key))] = deepCopy(value);
    events_.tell(value ? OverlayEvent::Kind::SetPreference : OverlayEvent::Kind::RemovePreference,
                 format("%s %s", domain, key), value);
  }
  bool ZTXPreferencesSynchronize(std::string_view domain) override {
    events_.tell(OverlayEvent::Kind::WritePreferences, std::string(domain));
    return true;
  }

 private:
  Preferences& below_;
  const OverlayEvents& events_;
  std::map<std::pair<std::string, std::string>, plist::Value> written_;  // by domain and key
};

class OverlaySubmission final : public SubmissionService {
 public:
  OverlaySubmission(FileSubmission& below, const OverlayEvents& events)
      : below_(below), events_(events) {}

  bool isDiagnosticSubmissionEnabled() override {
    const bool isEnabled = below_.isDiagnosticSubmissionEnabled();
    if (!isEnabled) tellDeletion();
    return isEnabled;
  }
  bool hasInternalDiagnostics(std::string_view identifier) override {
    return below_.hasInternalDiagnostics(identifier);
  }
  bool ZTXWriteLogForSubmission(std::string_view logType, std::string_view logName,
                                const plist::Dictionary& options,
                                const LogWriter& writer) override {
    CapturedLog log{std::string(logType), std::string(logName), options, {}};
    CapturedFile file(log.bytes);
    writer(file);
    plist::Dictionary what{{"type", log.type}, {"bytes", std::uint64_t{log.bytes.size()}}};
    if (options) what.set("options", options);
    const auto place = below_.placeOfNewLog(logType);
    if (place && *place == FileSubmission::Place::Withheld) what.set("withheld", true);
    what.set("content", log.bytes);
    events_.tell(OverlayEvent::Kind::Submission, log.name, what);
    logs.push_back(std::move(log));
    return true;
  }
  std::string ZTXOSVersion() override {
    std::string version = below_.ZTXOSVersion();
    events_.tell(OverlayEvent::Kind::Fact, "OS version", version);
    return version;
  }
  plist::Value ZTXGetDATaskingValue(std::string_view key) override {
    return below_.ZTXGetDATaskingValue(key);
  }
  void submitDiagnosticLogs() override {
    events_.tell(OverlayEvent::Kind::SendOn,
                 below_.maySendOn() ? "the pending logs" : "nothing: submission is not allowed");
  }

  std::vector<CapturedLog> logs;

 private:
  class CapturedFile final : public LogFile {
   public:
    explicit CapturedFile(std::string& bytes) : bytes_(bytes) {}
    void write(ByteSpan bytes) override { bytes_ += asText(bytes); }

   private:
    std::string& bytes_;
  };

  void tellDeletion() {
    const std::size_t waiting = below_.countOfWaiting();
    if (waiting == 0) return;
    events_.tell(OverlayEvent::Kind::CleanUp, "logs that wait without permission", waiting);
  }

  FileSubmission& below_;
  const OverlayEvents& events_;
};

/// A history that reports how many rows a query had.
class OverlayHistory final : public BHHistory {
 public:
  OverlayHistory(std::unique_ptr<BHHistory> below, const OverlayEvents& events)
      : below_(std::move(below)), events_(events) {}

  void scalarsForKeyPrefix(std::string_view prefix, std::int64_t minDaysSince1970,
                           std::int64_t maxDaysSince1970,
                           const ScalarRowHandler& rowHandler) override {
    std::uint64_t rows = 0;
    below_->scalarsForKeyPrefix(
        prefix, minDaysSince1970, maxDaysSince1970,
        [&](std::string_view key, std::int32_t day, std::int64_t value, bool& stop) {
          ++rows;
          rowHandler(key, day, value, stop);
        });
    tell("scalars", minDaysSince1970, maxDaysSince1970, rows);
  }
  void distributionsForKeyPrefix(std::string_view prefix, std::int64_t minDaysSince1970,
                                 std::int64_t maxDaysSince1970,
                                 const DistributionRowHandler& rowHandler) override {
    std::uint64_t rows = 0;
    below_->distributionsForKeyPrefix(prefix, minDaysSince1970, maxDaysSince1970,
                                      [&](std::string_view key, std::int32_t day,
                                          BHHistoryDistributionEnumerator& values, bool& stop) {
                                        ++rows;
                                        rowHandler(key, day, values, stop);
                                      });
    tell("distributions", minDaysSince1970, maxDaysSince1970, rows);
  }

 private:
  void tell(const char* what, std::int64_t before, std::int64_t last, std::uint64_t rows) const {
    const bool isOneDay = last - 1 == before;
    events_.tell(OverlayEvent::Kind::Statistics,
                 isOneDay ? format("%s of day %lld", what, last)
                          : format("%s after day %lld up to %lld", what, before, last),
                 rows);
  }

  std::unique_ptr<BHHistory> below_;
  const OverlayEvents& events_;
};

class OverlayStore final : public StatisticsStore {
 public:
  OverlayStore(StatisticsStore& below, const OverlayEvents& events)
      : below_(below), events_(events) {}

  std::int32_t BHDaysSince1970() override { return below_.BHDaysSince1970(); }
  plist::Date dateForDaysSince1970(std::int32_t day) override {
    return below_.dateForDaysSince1970(day);
  }
  bool BHClientCheckpoint() override {
    events_.tell(OverlayEvent::Kind::Checkpoint, "the statistics store");
    return true;
  }
  void BHClientSetValueForScalarKey(std::string_view key, std::int64_t value) override {
    events_.tell(OverlayEvent::Kind::SetScalar, std::string(key), value);
  }
  std::unique_ptr<BHHistory> initWithDefaultPath() override {
    return std::make_unique<OverlayHistory>(below_.initWithDefaultPath(), events_);
  }

 private:
  StatisticsStore& below_;
  const OverlayEvents& events_;
};

class OverlayCrashReporting final : public CrashReporting {
 public:
  OverlayCrashReporting(FileCrashReporting& below, const OverlayEvents& events)
      : below_(below), events_(events) {}

  void FLLogStructuredData(std::uint32_t logType, const plist::Dictionary& record) override {
    events_.tell(OverlayEvent::Kind::Record, format("type %u", logType), record);
  }
  void FLDumpAllOldStructuredDataLogs() override {
    plist::Array names = plist::Array::create();
    for (const std::string& name : below_.oldRecordFiles())
      names.append(name);
    events_.tell(OverlayEvent::Kind::CleanUp, "old files of structured records", names);
  }
  void rollNorvaneCareLogs() override {
    events_.tell(OverlayEvent::Kind::RollOver,
                 below_.hasSupportLog() ? "the support log"
                                        : "nothing: the support log is empty or missing");
  }
  std::string systemIdentifier() override {
    return told("system identifier", below_.systemIdentifier());
  }
  std::string hardwareModel() override { return told("hardware model", below_.hardwareModel()); }
  std::string osVersion() override { return told("OS version", below_.osVersion()); }
  std::string incidentIdentifier() override { return below_.incidentIdentifier(); }

 private:
  std::string told(const char* fact, std::string text) {
    events_.tell(OverlayEvent::Kind::Fact, fact, text);
    return text;
  }

  FileCrashReporting& below_;
  const OverlayEvents& events_;
};

class OverlayNotifications final : public Notifications {
 public:
  explicit OverlayNotifications(const OverlayEvents& events) : events_(events) {}
  void post(std::string_view name) override {
    events_.tell(OverlayEvent::Kind::Notification, std::string(name));
  }

 private:
  const OverlayEvents& events_;
};

}  // namespace tavrel
