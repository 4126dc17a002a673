#include "daemon/tasking.h"

#include <cstdlib>
#include <set>
#include <string>

#include "platform/persisted_state.h"

namespace tavrel {
namespace {

constexpr std::string_view kTaskingChanged = "com.norvane.da.tasking_changed";
constexpr std::string_view kAggressiveDaysValue = "AggressiveSubmissionDays";

/// Writes preferences and remembers the domains, each of which is synchronised once.
class PreferenceWriter {
 public:
  explicit PreferenceWriter(Preferences& preferences) : preferences_(preferences) {}

  /// A null value removes the key.
  void set(std::string_view domain, std::string_view key, const plist::Value& value) {
    preferences_.ZTXPreferencesSetValue(key, value, domain);
    domains_.emplace(domain);
  }
  void remove(std::string_view domain, std::string_view key) { set(domain, key, {}); }

  void synchronize() {
    const bool touchedOwnDomain = domains_.erase(std::string(kTavrelDomain)) != 0;
    for (const std::string& domain : domains_)
      preferences_.ZTXPreferencesSynchronize(domain);
    if (touchedOwnDomain) preferences_.ZTXPreferencesSynchronize(kTavrelDomain);
  }

 private:
  Preferences& preferences_;
  std::set<std::string> domains_;
};

/// Calls `visit` with the domain and key of each setting that has both.
template <class Visit>
void forEachSetting(const plist::Array& payload, Visit visit) {
  for (const plist::Value& element : payload) {
    const plist::Dictionary setting = element.dictionary();
    const auto domain = setting.string("Domain");
    const auto key = setting.string("Key");
    if (domain && key) visit(setting, *domain, *key);
  }
}

class Tracker {
 public:
  explicit Tracker(Platform& platform)
      : platform_(platform),
        today_(platform.statistics->BHDaysSince1970()),
        build_(platform.systemVersion->systemVersionDictionary().get(kProductBuildVersionKey)),
        lastUpdate_(own(kLastOSUpdateKey).dictionary()) {}

  void trackOSChange() {
    const plist::Value version = lastUpdate_.get("version");
    if (build_.isNull() || build_ == version) return;
    platform_.log->log(LogLevel::Default, "OS change since last run (%{public}@ -> %{public}@)",
                       version, build_);
    lastUpdate_ = {{"version", build_}, {"day", today_}};
    platform_.preferences->ZTXPreferencesSetValue(kLastOSUpdateKey, lastUpdate_, kTavrelDomain);
  }

  /// False when no tasking is scheduled.
  bool trackTasking() {
    const plist::Dictionary scheduled =
        platform_.preferences->ZTXPreferencesGetValue(kScheduledTaskingKey, kScheduleDomain)
            .dictionary();
    if (!scheduled.string(kTaskingIDKey)) return false;

    const plist::Value newID = scheduled.get(kTaskingIDKey);
    const plist::Value appliedID = own(kTaskingIDKey);
    const plist::Value appliedOS = own(kTaskingOSKey);
    if (appliedID == newID && appliedOS == build_) return true;

    if (!canBeRemembered(scheduled)) return true;
    PreferenceWriter writer(platform_.preferences);
    if (appliedID) {
      platform_.log->log(LogLevel::Default,
                         "Tasking update (%{public}@ -> %{public}@, %{public}@ -> %{public}@)",
                         appliedID, newID, appliedOS, build_);
      undo(writer);
    }
    apply(scheduled, writer);
    writer.synchronize();
    platform_.notifications->post(kTaskingChanged);
    return true;
  }

  void submitAggressively() {
    const auto value = platform_.submission->ZTXGetDATaskingValue(kAggressiveDaysValue).number();
    const std::int32_t days = value ? value->int32() : 0;
    const auto updateDay = lastUpdate_.number("day");
    const std::int64_t sinceUpdate =
        std::abs(std::int64_t{today_} - (updateDay ? updateDay->int32() : 0));
    if (sinceUpdate >= days) return;
    platform_.log->log(LogLevel::Default,
                       "Aggressive submission day %d of %d; triggering log submission",
                       static_cast<std::int32_t>(sinceUpdate), days);
    platform_.submission->submitDiagnosticLogs();
  }

 private:
  plist::Value own(std::string_view key) {
    return platform_.preferences->ZTXPreferencesGetValue(key, kTavrelDomain);
  }

  /// Says so when it cannot. Settings that are applied and not remembered could never be undone.
  bool canBeRemembered(const plist::Dictionary& scheduled) {
    if (!scheduled.array(kTaskingPayloadKey)) return true;  // nothing is
    auto kept = plist::Dictionary::create();
    for (const auto key : {kTaskingIDKey, kTaskingDigestKey, kTaskingPayloadKey})
      kept.set(key, scheduled.get(key));
    const auto xml = platform_.propertyLists->encodeXml(kept);
    if (xml && xml->size() <= Preferences::kLargestChange) return true;
    platform_.log->log(LogLevel::Error,
                       "cannot apply %s of domain %s: %s; schedule one that preferences can hold",
                       kScheduledTaskingKey, kScheduleDomain,
                       xml ? format("it needs %zu bytes and may have %zu", xml->size(),
                                    Preferences::kLargestChange)
                           : xml.error().message);
    return false;
  }

  void undo(PreferenceWriter& writer) {
    forEachSetting(own(kTaskingPayloadKey).array(),
                   [&](const plist::Dictionary&, std::string_view domain, std::string_view key) {
                     writer.remove(domain, key);
                   });
    for (const auto key : {kTaskingIDKey, kTaskingDigestKey, kTaskingPayloadKey}) {
      writer.remove(kTavrelDomain, key);
    }
  }

  void apply(const plist::Dictionary& scheduled, PreferenceWriter& writer) {
    const plist::Array payload = scheduled.array(kTaskingPayloadKey);
    if (!payload) return;
    forEachSetting(payload,
                   [&](const plist::Dictionary& setting, std::string_view domain,
                       std::string_view key) { writer.set(domain, key, setting.get("Value")); });
    writer.set(kTavrelDomain, kTaskingIDKey, scheduled.get(kTaskingIDKey));
    writer.set(kTavrelDomain, kTaskingOSKey, build_);
    writer.set(kTavrelDomain, kTaskingDigestKey, scheduled.get(kTaskingDigestKey));
    writer.set(kTavrelDomain, kTaskingPayloadKey, payload);
  }

  Platform& platform_;
  const std::int32_t today_;
  const plist::Value build_;  // null when it is not known
  plist::Dictionary lastUpdate_;
};

}  // namespace

void trackOSChangeAndTasking(Platform& platform) {
  Tracker tracker(platform);
  tracker.trackOSChange();
  if (tracker.trackTasking()) tracker.submitAggressively();
}

}  // namespace tavrel
