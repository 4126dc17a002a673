// The preferences that a run sees: the content of a tasking cannot change the owner's permission.
//
// 'tavrelctl', which the owner uses, writes preferences without this guard.
#pragma once

#include <string_view>

#include "platform/linux/logs/submission_permission.h"
#include "platform/preferences.h"
#include "platform/system_log.h"

namespace tavrel {

class GuardedPreferences final : public Preferences {
 public:
  /// Both must outlive it.
  GuardedPreferences(Preferences& preferences, SystemLog& log)
      : preferences_(preferences), log_(log) {}

  plist::Value ZTXPreferencesGetValue(std::string_view key, std::string_view domain) override {
    return preferences_.ZTXPreferencesGetValue(key, domain);
  }
  /// Drops a change of the permission, with a log line.
  void ZTXPreferencesSetValue(std::string_view key, const plist::Value& value,
                              std::string_view domain) override {
    if (!isOfPermission(domain, key)) {
      return preferences_.ZTXPreferencesSetValue(key, value, domain);
    }
    log_.log(
        LogLevel::Error,
        "a tasking may not change preference %s of domain %s: only the owner allows submission",
        key, domain);
  }
  bool ZTXPreferencesSynchronize(std::string_view domain) override {
    return preferences_.ZTXPreferencesSynchronize(domain);
  }

 private:
  Preferences& preferences_;
  SystemLog& log_;
};

}  // namespace tavrel
