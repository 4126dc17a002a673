#include "report/log_outcome.h"

#include <algorithm>
#include <cstddef>
#include <iterator>

#include "platform/persisted_state.h"

namespace tavrel {
namespace {

struct OutcomeTexts {
  std::string_view name;
  std::string_view reason;
};

// One row per outcome, in enumeration order. The reasons are worded for past and future runs.
constexpr OutcomeTexts kTexts[] = {
    {"filed", ""},
    {"filed-in-part", ""},
    {"not-permitted", "no permission for that day"},
    {"permission-unknown", "the permission cannot be read"},
    {"no-whitelist", "no usable whitelist; see 'tavrelctl whitelist check'"},
    {"nothing-to-report", "no value found for any whitelisted key"},
    {"store-unreadable", "not all statistics could be read; see the system log"},
    {"not-filed", "filing failed; see the system log"},
};
static_assert(std::size(kTexts) == static_cast<std::size_t>(LogOutcome::NotFiled) + 1);

const OutcomeTexts& textsOf(LogOutcome outcome) {
  return kTexts[static_cast<std::size_t>(outcome)];
}

}  // namespace

std::string_view whyNoLog(LogOutcome outcome) {
  return textsOf(outcome).reason;
}

std::string logOutcomeText(LogOutcome outcome, std::string_view day) {
  if (outcome == LogOutcome::Filed) return format("a log for day %s", day);
  if (outcome == LogOutcome::FiledInPart) {
    return format("a log for day %s without statistics that could not be read; see the system log",
                  day);
  }
  return format("no log for day %s: %s", day, whyNoLog(outcome));
}

std::string_view nameOf(LogOutcome outcome) {
  return textsOf(outcome).name;
}

std::optional<LogOutcome> lastLogOutcome(Preferences& preferences) {
  const plist::Value stored = preferences.ZTXPreferencesGetValue(kLastLogOutcomeKey, kTavrelDomain);
  const auto* found = std::ranges::find(kTexts, stored.string(), &OutcomeTexts::name);
  if (found == std::end(kTexts)) return std::nullopt;
  return static_cast<LogOutcome>(found - std::begin(kTexts));
}

void rememberLogOutcome(Preferences& preferences, LogOutcome outcome) {
  if (lastLogOutcome(preferences) == outcome) return;
  preferences.ZTXPreferencesSetValue(kLastLogOutcomeKey, nameOf(outcome), kTavrelDomain);
}

}  // namespace tavrel
