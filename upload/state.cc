#include "upload/state.h"

#include <algorithm>
#include <cmath>
#include <utility>

#include "base/limits.h"
#include "platform/linux/files/property_list_file.h"

namespace tavrel::upload {
namespace {

constexpr mode_t kMode = 0600;

constexpr std::pair<const char*, std::optional<plist::Date> State::*> kDates[] = {
    {"LastAttempt", &State::lastAttempt},
    {"LastSuccess", &State::lastSuccess},
    {"LastFailure", &State::lastFailure},
    {"NextAttempt", &State::nextAttempt}};
constexpr std::pair<const char*, std::int64_t State::*> kCounts[] = {
    {"FailedAttempts", &State::failedAttempts},
    {"FailedTransfers", &State::failedTransfers},
    {"Sent", &State::sent},
    {"Refused", &State::refused}};
constexpr const char* kFailureKey = "Failure";

// How much longer than the server asks a device may wait, as a fraction of that delay.
constexpr double kSpread = 0.1;

}  // namespace

State readState(FileSystem& files, PropertyListCoding& propertyLists, SystemLog& log,
                const std::string& path) {
  const plist::Dictionary stored = readDictionaryFile(files, propertyLists, log, path);
  State state;
  for (const auto& [key, member] : kDates)
    state.*member = stored.date(key);
  for (const auto& [key, member] : kCounts) {
    // Leaves room for what a run adds.
    constexpr std::int64_t kMost = std::int64_t{1} << 62;
    const auto number = stored.number(key);
    state.*member = number ? std::clamp<std::int64_t>(number->int64(), 0, kMost) : 0;
  }
  state.failure = stored.string(kFailureKey).value_or("");
  return state;
}

Status writeState(FileSystem& files, PropertyListCoding& propertyLists, const std::string& path,
                  const State& state) {
  plist::Dictionary stored = plist::Dictionary::create();
  for (const auto& [key, member] : kDates)
    if (state.*member) stored.set(key, *(state.*member));
  for (const auto& [key, member] : kCounts)
    stored.set(key, state.*member);
  if (!state.failure.empty()) stored.set(kFailureKey, state.failure);
  const auto bytes = propertyLists.encodeXml(stored);
  if (!bytes) return bytes.error();
  return files.replace(path, asBytes(*bytes), kMode);
}

double pauseSeconds(std::int64_t failedTransfers, std::int64_t serverWish, double chance) {
  constexpr double kLongest = limits::kLongestUploadPauseSeconds;
  const int doublings = static_cast<int>(std::clamp<std::int64_t>(failedTransfers - 1, 0, 30));
  const double own = std::min(std::ldexp(limits::kUploadPauseSeconds, doublings), kLongest);
  const auto wish = static_cast<double>(serverWish);
  return std::max(own * (0.5 + 0.5 * chance),
                  std::clamp(wish + wish * kSpread * chance, 0.0, kLongest));
}

bool mustWait(const State& state, plist::Date now) {
  if (!state.nextAttempt) return false;
  const double ahead = *state.nextAttempt - now;
  return ahead > 0 && ahead <= limits::kLongestUploadPauseSeconds;
}

}  // namespace tavrel::upload
