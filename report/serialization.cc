#include <string>

#include "base/utf8.h"
#include "platform/persisted_state.h"
#include "platform/tallied_log.h"
#include "report/bh_report.h"

namespace tavrel {
namespace {

constexpr std::string_view kInternalDiagnosticsIdentifier = "com.norvane.zentrix.tallied.tavrel";

constexpr std::int32_t kLogVersion = 1;

// The text before the first NUL of `bytes`, or nothing when it is not UTF-8.
std::optional<std::string_view> terminatedText(ByteSpan bytes) {
  const std::string_view text = asText(bytes);
  const std::string_view terminated = text.substr(0, text.find('\0'));
  if (!isValidUtf8(terminated)) return std::nullopt;
  return terminated;
}

plist::Value orDefault(const plist::Value& value, const plist::Value& fallback) {
  return value.isNull() ? fallback : value;
}

}  // namespace

LogOutcome BHReport::serializeWithDate(std::int32_t day, const plist::Array& andAppInfo) {
  if (_scalarsOutput.empty() && _distributionsOutput.empty() && _histogramsOutput.empty()) {
    return _config ? LogOutcome::NothingToReport : LogOutcome::NoWhitelist;
  }

  addInstalledAppInfo();
  addMetadataKeys();
  reportDatabaseSize();
  reportCPUUptime();
  reportVMStats();

  const std::string whitelistDigest = _config ? _config->configFileDigest() : std::string();
  _config.reset();

  const auto encoded =
      platform_.propertyLists->encodeXml(logDictionary(day, andAppInfo, whitelistDigest));
  if (!encoded) {
    platform_.log->log(LogLevel::Error, "Could not create tallied plist: %@",
                       encoded.error().message);
    return LogOutcome::NotFiled;
  }

  const bool submitted = platform_.submission->ZTXWriteLogForSubmission(
      kTalliedLogType, kTalliedLogName, submissionOptions(),
      [&](LogFile& file) { file.write(asBytes(*encoded)); });
  if (submitted) return LogOutcome::Filed;
  platform_.log->log(LogLevel::Error, "Failed to write tallied log");
  return LogOutcome::NotFiled;
}

plist::Dictionary BHReport::logDictionary(std::int32_t day, const plist::Array& appInfo,
                                          const std::string& whitelistDigest) {
  Preferences& preferences = platform_.preferences;
  const auto taskingID = preferences.ZTXPreferencesGetValue(kTaskingIDKey, kTavrelDomain);
  const auto taskingDigest = preferences.ZTXPreferencesGetValue(kTaskingDigestKey, kTavrelDomain);
  const auto taskingPayload = preferences.ZTXPreferencesGetValue(kTaskingPayloadKey, kTavrelDomain);

  plist::Dictionary log{
      {kVersionMember, kLogVersion},
      {kStartDateMember, platform_.statistics->dateForDaysSince1970(day)},
      {kCreationDateMember, platform_.clock->now()},
      {kMetadataMember, _metadataOutput},
      {kScalarsMember, _scalarsOutput},
      {kDistributionsMember, _distributionsOutput},
      {kHistogramsMember, _histogramsOutput},
      {kTaskingMember, orDefault(taskingPayload, plist::Array::create())},
      {kTaskIDMember, orDefault(taskingID, kNoTaskingID)},
      {kTaskDigestMember, orDefault(taskingDigest, "(no tasking digest)")},
      {kWhitelistDigestMember, whitelistDigest},
  };
  if (appInfo) log.set(kApplicationsMember, appInfo);
  return log;
}

// An empty handle when there are none.
plist::Dictionary BHReport::submissionOptions() {
  plist::Dictionary options;
  noteOSVersion(options);
  addConfigNumber(options);
  return options;
}

void BHReport::noteOSVersion(plist::Dictionary& options) {
  Preferences& preferences = platform_.preferences;
  const plist::Value stored = preferences.ZTXPreferencesGetValue(kLastOSVersionKey, kTavrelDomain);
  const std::string current = platform_.submission->ZTXOSVersion();
  // A version that is unknown for one run would look like two updates.
  if (current == kUnknownOSVersion || plist::Value(current) == stored) return;
  preferences.ZTXPreferencesSetValue(kLastOSVersionKey, current, kTavrelDomain);
  preferences.ZTXPreferencesSynchronize(kTavrelDomain);
  options.set(kPreviousOSVersionOption, stored.string().value_or(kUnknownText));
}

void BHReport::addConfigNumber(plist::Dictionary& options) {
  if (!platform_.submission->hasInternalDiagnostics(kInternalDiagnosticsIdentifier)) return;
  const auto answer = platform_.deviceAnswers->SQCopyAnswer("ConfigNumber").data();
  if (!answer) return;
  if (const auto text = terminatedText(answer.bytes())) options.set(kConfigNumberOption, *text);
}

}  // namespace tavrel
