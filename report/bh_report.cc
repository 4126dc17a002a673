#include "report/bh_report.h"

#include "base/arithmetic.h"

namespace tavrel {

BHReport::BHReport(Platform& platform) : platform_(platform), _config(BHConfig::init(platform)) {}

LogOutcome BHReport::writeLogForYesterday(std::int32_t day, const plist::Array& withAppInfo) {
  platform_.log->log(LogLevel::Info, "writing tallied log. yesterday=%d", day);
  collect(day);
  return serializeWithDate(day, withAppInfo);
}

void BHReport::collect(std::int32_t day) {
  const auto history = platform_.statistics->initWithDefaultPath();
  const std::int64_t dayBefore = std::int64_t{day} - 1;
  history->scalarsForKeyPrefix(
      "", dayBefore, day, [this](std::string_view key, std::int32_t, std::int64_t value, bool&) {
        if (const auto options = optionsForScalar(key)) addScalar(value, key, options);
      });
  history->distributionsForKeyPrefix(
      "", dayBefore, day,
      [this](std::string_view key, std::int32_t, BHHistoryDistributionEnumerator& values, bool&) {
        if (const auto options = optionsForDistribution(key)) {
          computeAndAddDistribution(values, key, options);
        }
      });
}

plist::Dictionary BHReport::optionsForScalar(std::string_view key) const {
  return _config ? _config->configOptionsForScalarKey(key) : plist::Dictionary();
}

plist::Dictionary BHReport::optionsForDistribution(std::string_view key) const {
  return _config ? _config->configOptionsForDistributionKey(key) : plist::Dictionary();
}

}  // namespace tavrel
