#include "tools/overlay/overlay_writes.h"

#include "base/format.h"

namespace tavrel {
namespace {

/// A history that reports how many rows a query had.
class OverlayHistory final : public BHHistory {
 public:
  OverlayHistory(std::unique_ptr<BHHistory> below, const OverlayEvents& events)
      : below_(std::move(below)), events_(events) {}

  bool scalarsForKeyPrefix(std::string_view prefix, std::int64_t minDaysSince1970,
                           std::int64_t maxDaysSince1970,
                           const ScalarRowHandler& rowHandler) override {
    std::uint64_t rows = 0;
    const bool isComplete = below_->scalarsForKeyPrefix(
        prefix, minDaysSince1970, maxDaysSince1970,
        [&](std::string_view key, std::int32_t day, std::int64_t value, bool& stop) {
          ++rows;
          rowHandler(key, day, value, stop);
        });
    deliver("scalars", minDaysSince1970, maxDaysSince1970, rows);
    return isComplete;
  }
  bool distributionsForKeyPrefix(std::string_view prefix, std::int64_t minDaysSince1970,
                                 std::int64_t maxDaysSince1970,
                                 const DistributionRowHandler& rowHandler) override {
    std::uint64_t rows = 0;
    const bool isComplete =
        below_->distributionsForKeyPrefix(prefix, minDaysSince1970, maxDaysSince1970,
                                          [&](std::string_view key, std::int32_t day,
                                              BHHistoryDistributionEnumerator& values, bool& stop) {
                                            ++rows;
                                            rowHandler(key, day, values, stop);
                                          });
    deliver("distributions", minDaysSince1970, maxDaysSince1970, rows);
    return isComplete;
  }

 private:
  void deliver(const char* what, std::int64_t before, std::int64_t last, std::uint64_t rows) const {
    const bool isOneDay = last - 1 == before;
    events_.deliver(OverlayEvent::Kind::Statistics,
                    isOneDay ? format("%s of day %lld", what, last)
                             : format("%s after day %lld up to %lld", what, before, last),
                    rows);
  }

  std::unique_ptr<BHHistory> below_;
  const OverlayEvents& events_;
};

}  // namespace

void OverlayLog::write(LogLevel level, std::string_view message) {
  constexpr const char* kNames[] = {"debug", "info", "default", "error"};
  if (level == LogLevel::Error) lastError = message;
  events_.deliver(OverlayEvent::Kind::LogLine, kNames[static_cast<std::size_t>(level)],
                  std::string(message));
}

void OverlayStreams::writeOutput(std::string_view text) {
  events_.deliver(OverlayEvent::Kind::OutputText, "on standard output", std::string(text));
}

void OverlayStreams::writeError(std::string_view text) {
  events_.deliver(OverlayEvent::Kind::ErrorText, "on standard error", std::string(text));
}

plist::Value OverlayPreferences::ZTXPreferencesGetValue(std::string_view key,
                                                        std::string_view domain) {
  const auto at = written_.find(std::pair(std::string(domain), std::string(key)));
  plist::Value value =
      at == written_.end() ? below_.ZTXPreferencesGetValue(key, domain) : deepCopy(at->second);
  events_.deliver(OverlayEvent::Kind::Preference, format("%s %s", domain, key), value);
  return value;
}

void OverlayPreferences::ZTXPreferencesSetValue(std::string_view key, const plist::Value& value,
                                                std::string_view domain) {
  written_[std::pair(std::string(domain), std::string(key))] = deepCopy(value);
  events_.deliver(value ? OverlayEvent::Kind::SetPreference : OverlayEvent::Kind::RemovePreference,
                  format("%s %s", domain, key), value);
}

bool OverlayPreferences::ZTXPreferencesSynchronize(std::string_view domain) {
  events_.deliver(OverlayEvent::Kind::WritePreferences, std::string(domain));
  return true;
}

bool OverlaySubmission::isDiagnosticSubmissionEnabled() {
  const bool isEnabled = below_.isDiagnosticSubmissionEnabled();
  if (!isEnabled) deliverDeletion();
  return isEnabled;
}

bool OverlaySubmission::hasInternalDiagnostics(std::string_view identifier) {
  return below_.hasInternalDiagnostics(identifier);
}

bool OverlaySubmission::ZTXWriteLogForSubmission(std::string_view logType, std::string_view logName,
                                                 const plist::Dictionary& options,
                                                 const LogWriter& writer) {
  CapturedLog log{std::string(logType), std::string(logName), options, {}};
  CapturedFile file(log.bytes);
  writer(file);
  plist::Dictionary what{{"type", log.type}, {"bytes", std::uint64_t{log.bytes.size()}}};
  if (options) what.set("options", options);
  const auto place = below_.placeOfNewLog(logType);
  if (place && *place == FileSubmission::Place::Withheld) what.set("withheld", true);
  what.set("content", log.bytes);
  events_.deliver(OverlayEvent::Kind::Submission, log.name, what);
  logs.push_back(std::move(log));
  return true;
}

std::string OverlaySubmission::ZTXOSVersion() {
  std::string version = below_.ZTXOSVersion();
  events_.deliver(OverlayEvent::Kind::Fact, "OS version", version);
  return version;
}

plist::Value OverlaySubmission::ZTXGetDATaskingValue(std::string_view key) {
  return below_.ZTXGetDATaskingValue(key);
}

void OverlaySubmission::submitDiagnosticLogs() {
  const Status permitted = below_.checkPermission();
  events_.deliver(OverlayEvent::Kind::SendOn,
                  permitted ? "the pending logs" : "nothing: " + permitted.error().message);
}

void OverlaySubmission::deliverDeletion() {
  const std::size_t waiting = below_.countOfWaiting();
  if (waiting == 0) return;
  events_.deliver(OverlayEvent::Kind::CleanUp, "logs that wait without permission", waiting);
}

bool OverlayStore::BHClientCheckpoint() {
  events_.deliver(OverlayEvent::Kind::Checkpoint, "the statistics store");
  return true;
}

void OverlayStore::BHClientSetValueForScalarKey(std::string_view key, std::int64_t value) {
  events_.deliver(OverlayEvent::Kind::SetScalar, std::string(key), value);
}

std::unique_ptr<BHHistory> OverlayStore::initWithDefaultPath() {
  return std::make_unique<OverlayHistory>(ForwardingStore::initWithDefaultPath(), events_);
}

void OverlayCrashReporting::FLLogStructuredData(std::uint32_t logType,
                                                const plist::Dictionary& record) {
  events_.deliver(OverlayEvent::Kind::Record, format("type %u", logType), record);
}

void OverlayCrashReporting::FLDumpAllOldStructuredDataLogs() {
  plist::Array names = plist::Array::create();
  for (const std::string& name : below_.oldRecordFiles())
    names.append(name);
  events_.deliver(OverlayEvent::Kind::CleanUp, "old files of structured records", names);
}

void OverlayCrashReporting::rollNorvaneCareLogs() {
  events_.deliver(
      OverlayEvent::Kind::RollOver,
      below_.hasSupportLog() ? "the support log" : "nothing: the support log is empty or missing");
}

std::string OverlayCrashReporting::systemIdentifier() {
  return delivered("system identifier", below_.systemIdentifier());
}

std::string OverlayCrashReporting::hardwareModel() {
  return delivered("hardware model", below_.hardwareModel());
}

std::string OverlayCrashReporting::osVersion() {
  return delivered("OS version", below_.osVersion());
}

std::string OverlayCrashReporting::incidentIdentifier() {
  return below_.incidentIdentifier();
}

std::string OverlayCrashReporting::delivered(const char* fact, std::string text) {
  events_.deliver(OverlayEvent::Kind::Fact, fact, text);
  return text;
}

void OverlayNotifications::post(std::string_view name) {
  events_.deliver(OverlayEvent::Kind::Notification, std::string(name));
}

}  // namespace tavrel
