#include "platform/linux/logs/submission_permission.h"

#include "base/civil_time.h"
#include "base/format.h"
#include "platform/linux/preferences/file_preferences.h"
#include "platform/persisted_state.h"
#include "platform/preferences.h"

namespace tavrel {
namespace {

std::optional<std::int32_t> firstDayOf(const plist::Value& stored) {
  if (stored.isNull()) return std::nullopt;
  constexpr auto kNoDay = SubmissionPermission::kNoDay;
  const auto number = stored.number();
  const std::int64_t day = number && !number->isFloating() ? number->int64() : kNoDay;
  const bool isDay = day >= std::numeric_limits<std::int32_t>::min() && day <= kNoDay;
  return isDay ? static_cast<std::int32_t>(day) : kNoDay;
}

}  // namespace

SubmissionPermission submissionPermission(Preferences& preferences) {
  bool isSet = false;
  if (!preferences.ZTXPreferencesGetBoolValue(kSubmissionEnabledKey, kDiagnosticsDomain, &isSet)) {
    return {.isGiven = false, .firstDay = {}, .isWithdrawn = isSet};
  }
  return {true, firstDayOf(preferences.ZTXPreferencesGetValue(kSubmissionFirstDayKey,
                                                              kDiagnosticsDomain))};
}

Expected<SubmissionPermission> storedSubmissionPermission(FilePreferences& preferences) {
  const auto values = preferences.storedValues(kDiagnosticsDomain);
  if (!values) return values.error();
  const std::optional<bool> isOn = values->get(kSubmissionEnabledKey).boolean();
  return SubmissionPermission{isOn == true, firstDayOf(values->get(kSubmissionFirstDayKey)),
                              isOn == false};
}

bool isOfPermission(std::string_view domain, std::string_view key) {
  return domain == kDiagnosticsDomain &&
         (key == kSubmissionEnabledKey || key == kSubmissionFirstDayKey);
}

void setSubmissionPermission(Preferences& preferences, const SubmissionPermission& permission) {
  preferences.ZTXPreferencesSetValue(kSubmissionEnabledKey, permission.isGiven, kDiagnosticsDomain);
  preferences.ZTXPreferencesSetValue(
      kSubmissionFirstDayKey,
      permission.firstDay ? plist::Value(*permission.firstDay) : plist::Value(),
      kDiagnosticsDomain);
}

std::string textOf(const SubmissionPermission& permission) {
  if (!permission.isGiven) return "not allowed";
  if (!permission.firstDay) return "allowed";
  if (permission.isHeldBack()) {
    return format("held back: %s is not a day: run 'tavrelctl allow'", kSubmissionFirstDayKey);
  }
  return format("allowed from day %d (%s) on", *permission.firstDay,
                dateText(civilFromDays(*permission.firstDay)));
}

}  // namespace tavrel
