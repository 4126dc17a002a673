#include "daemon/tasking.h"

#include <cstdlib>
#include <set>
#include <string>

#include "platform/persisted_state.h"

namespace tavrel {
namespace {

constexpr std::string_view kTaskingChanged = "com.norvane.da.tasking_changed";

/// Writes preferences, and synchronises each changed domain once.
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
    const auto domain = setting.string(kSettingDomain);
    const auto key = setting.string(kSettingKey);
    if (domain && key) visit(setting, *domain, *key);
  }
}

plist::Value ownPreference(Platform& platform, std::string_view key) {
  return platform.preferences->ZTXPreferencesGetValue(key, kTavrelDomain);
}

/// The OS build; null when unknown.
plist::Value systemBuild(Platform& platform) {
  return platform.systemVersion->systemVersionDictionary().get(kProductBuildVersionKey);
}

/// The scheduled and the applied tasking.
struct TaskingPlan {
  TaskingPlan(Platform& platform, const plist::Value& build)
      : scheduled(
            platform.preferences->ZTXPreferencesGetValue(kScheduledTaskingKey, kScheduleDomain)
                .dictionary()) {
    if (!isScheduled()) return;
    appliedID = ownPreference(platform, kTaskingIDKey);
    appliedOS = ownPreference(platform, kTaskingOSKey);
    if (appliedID == scheduled.get(kTaskingIDKey) && appliedOS == build) return;
    refusal = whyNotRemembered(platform.propertyLists);
    change = !refusal.empty() ? TaskingChange::Refuse
             : appliedID      ? TaskingChange::Replace
                              : TaskingChange::Apply;
  }

  bool isScheduled() const { return scheduled.string(kTaskingIDKey).has_value(); }

  plist::Dictionary scheduled;
  plist::Value appliedID;
  plist::Value appliedOS;
  TaskingChange change = TaskingChange::None;
  std::string refusal;

 private:
  /// Empty when the tasking can be remembered. Settings that were applied without that could never
  /// be undone.
  std::string whyNotRemembered(PropertyListCoding& propertyLists) const {
    if (!scheduled.array(kTaskingPayloadKey)) return {};  // no settings to remember
    auto kept = plist::Dictionary::create();
    for (const auto key : {kTaskingIDKey, kTaskingDigestKey, kTaskingPayloadKey})
      kept.set(key, scheduled.get(key));
    const auto xml = propertyLists.encodeXml(kept);
    if (!xml) return xml.error().message;
    if (xml->size() <= Preferences::kLargestChange) return {};
    return format("it needs %zu bytes; the limit is %zu", xml->size(), Preferences::kLargestChange);
  }
};

class Tracker {
 public:
  explicit Tracker(Platform& platform)
      : platform_(platform),
        today_(platform.statistics->BHDaysSince1970()),
        build_(systemBuild(platform)),
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
    const TaskingPlan plan(platform_, build_);
    if (!plan.isScheduled()) return false;
    if (plan.change == TaskingChange::None) return true;
    if (plan.change == TaskingChange::Refuse) {
      platform_.log->log(
          LogLevel::Error,
          "cannot apply %s of domain %s: %s; schedule one that preferences can store",
          kScheduledTaskingKey, kScheduleDomain, plan.refusal);
      return true;
    }
    PreferenceWriter writer(platform_.preferences);
    if (plan.change == TaskingChange::Replace) {
      platform_.log->log(LogLevel::Default,
                         "Tasking update (%{public}@ -> %{public}@, %{public}@ -> %{public}@)",
                         plan.appliedID, plan.scheduled.get(kTaskingIDKey), plan.appliedOS, build_);
      undo(writer);
    }
    apply(plan.scheduled, writer);
    writer.synchronize();
    platform_.notifications->post(kTaskingChanged);
    return true;
  }

  void submitAggressively() {
    const auto value = platform_.submission->ZTXGetDATaskingValue(kAggressiveDaysKey).number();
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
  plist::Value own(std::string_view key) { return ownPreference(platform_, key); }

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
    forEachSetting(payload, [&](const plist::Dictionary& setting, std::string_view domain,
                                std::string_view key) {
      writer.set(domain, key, setting.get(kSettingValue));
    });
    try {
      writer.set(kTavrelDomain, kTaskingIDKey, scheduled.get(kTaskingIDKey));
      writer.set(kTavrelDomain, kTaskingOSKey, build_);
      writer.set(kTavrelDomain, kTaskingDigestKey, scheduled.get(kTaskingDigestKey));
      writer.set(kTavrelDomain, kTaskingPayloadKey, payload);
    } catch (...) {
      // Half remembered, the tasking would be neither applied again nor undone.
      writer.remove(kTavrelDomain, kTaskingIDKey);
      throw;
    }
  }

  Platform& platform_;
  const std::int32_t today_;
  const plist::Value build_;
  plist::Dictionary lastUpdate_;
};

}  // namespace

TaskingChange nextTaskingChange(Platform& platform) {
  return TaskingPlan(platform, systemBuild(platform)).change;
}

void trackOSChangeAndTasking(Platform& platform) {
  Tracker tracker(platform);
  tracker.trackOSChange();
  if (tracker.trackTasking()) tracker.submitAggressively();
}

}  // namespace tavrel
