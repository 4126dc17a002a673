#include "upload/pause.h"

#include <algorithm>
#include <cmath>

#include "base/limits.h"

namespace tavrel::upload {
namespace {

// How much longer than the server asks a device may wait, as a fraction of that delay.
constexpr double kSpread = 0.1;

}  // namespace

double pauseSeconds(std::int64_t failedTransfers, std::int64_t serverWish, double chance) {
  constexpr double kLongest = limits::kLongestUploadPauseSeconds;
  const int doublings = static_cast<int>(std::clamp<std::int64_t>(failedTransfers - 1, 0, 30));
  const double own = std::min(std::ldexp(limits::kUploadPauseSeconds, doublings), kLongest);
  const auto wish = static_cast<double>(serverWish);
  return std::max(own * (0.5 + 0.5 * chance),
                  std::clamp(wish + wish * kSpread * chance, 0.0, kLongest));
}

bool mustWait(const UploadState& state, plist::Date now) {
  if (!state.nextAttempt) return false;
  const double ahead = *state.nextAttempt - now;
  return ahead > 0 && ahead <= limits::kLongestUploadPauseSeconds;
}

}  // namespace tavrel::upload
