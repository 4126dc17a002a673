#include "tools/device/known_preferences.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <limits>

#include "base/format.h"
#include "platform/linux/logs/submission_permission.h"
#include "platform/persisted_state.h"
#include "platform/statistics_store.h"
#include "storage/parse/nand_log_writer.h"
#include "tools/console/value_text.h"

namespace tavrel {
namespace {

struct Form {
  const char* text;     // "a boolean"
  const char* example;  // the value at the end of a command line
  bool (*fits)(const plist::Value& value);
};

// A day since 1970, or a number of days or other things: the daemon reads all
// of them as 32-bit numbers.
bool isCount(const plist::Value& value) {
  const auto number = value.number();
  return number && !number->isFloating() && number->int64() >= 0 &&
         number->int64() <= std::numeric_limits<std::int32_t>::max();
}

bool isAmplification(const plist::Value& value) {
  const auto number = value.number();
  return number && number->isFloating() && number->real() > 0 && number->real() < 10;
}

constexpr Form kBoolean{"a boolean", "true|false --bool",
                        [](const plist::Value& value) { return value.boolean().has_value(); }};
constexpr Form kCount{"an integer of 0 to 2147483647", "3 --int", isCount};
constexpr Form kFirstDay{"an integer of 0 to 2147483646", "", [](const plist::Value& value) {
                           return isCount(value) &&
                                  value.number()->int64() != SubmissionPermission::kNoDay;
                         }};
constexpr Form kString{"a string", "TEXT --string",
                       [](const plist::Value& value) { return value.string().has_value(); }};
constexpr Form kDate{"a date", "2026-11-27T18:02:18Z --date",
                     [](const plist::Value& value) { return value.date().has_value(); }};
constexpr Form kDictionary{"a dictionary", "@FILE --plist", [](const plist::Value& value) {
                             return static_cast<bool>(value.dictionary());
                           }};
constexpr Form kArray{"an array", "@FILE --plist",
                      [](const plist::Value& value) { return static_cast<bool>(value.array()); }};
constexpr Form kAmplification{"a real above 0 and below 10", "2.5 --float", isAmplification};

struct KnownPreference {
  std::string_view domain;
  std::string_view key;  // empty: every other key of the domain
  const Form& form;
};

// The list of docs/files.md. In two domains, the other keys are named after what they switch.
constexpr std::array kKnown = {
    KnownPreference{kDiagnosticsDomain, kSubmissionEnabledKey, kBoolean},
    KnownPreference{kDiagnosticsDomain, kSubmissionFirstDayKey, kFirstDay},
    KnownPreference{kDiagnosticsDomain, "", kBoolean},
    KnownPreference{kTaskingDomain, kAggressiveDaysKey, kCount},
    KnownPreference{kTaskingDomain, "", kBoolean},
    KnownPreference{kScheduleDomain, kScheduledTaskingKey, kDictionary},
    KnownPreference{kTavrelDomain, kLastRunDayKey, kCount},
    KnownPreference{kTavrelDomain, kLastLogOutcomeKey, kString},
    KnownPreference{kTavrelDomain, kLastOSVersionKey, kString},
    KnownPreference{kTavrelDomain, kLastOSUpdateKey, kDictionary},
    KnownPreference{kTavrelDomain, kTaskingIDKey, kString},
    KnownPreference{kTavrelDomain, kTaskingOSKey, kString},
    KnownPreference{kTavrelDomain, kTaskingPayloadKey, kArray},
    KnownPreference{kStoreCorruptionsDomain, kStoreCorruptionsKey, kCount},
    KnownPreference{kNandInfoDomain, kUserAmplificationKey, kAmplification},
    KnownPreference{kDefaultPreferenceDomain, kNandLogLastLoggedKey, kDate},
    KnownPreference{kDemoDomain, kStoreDemoModeKey, kBoolean},
};

}  // namespace

std::optional<PreferenceFault> faultOfPreference(std::string_view domain, std::string_view key,
                                                 const plist::Value& value) {
  const auto* const known =
      std::find_if(kKnown.begin(), kKnown.end(), [&](const KnownPreference& entry) {
        return entry.domain == domain && (entry.key.empty() || entry.key == key);
      });
  if (known == kKnown.end() || value.isNull() || known->form.fits(value)) return std::nullopt;
  const bool isLong = value.dictionary() || value.array() || value.data();
  // Give no example that would grant the permission when copied.
  return PreferenceFault{
      format("preference %s of domain %s is %s, not %s", key, domain, known->form.text,
             isLong ? kindWithArticle(value) : inlineText(value)),
      isOfPermission(domain, key)
          ? "use 'tavrelctl allow' or 'tavrelctl deny'"
          : format("give 'tavrelctl prefs set %s %s %s'", domain, key, known->form.example)};
}

}  // namespace tavrel
