#include "report/bh_report.h"

namespace tavrel {

BHReport::BHReport(Platform& platform) : platform_(platform), _config(BHConfig::init(platform)) {}

LogOutcome BHReport::writeLogForYesterday(std::int32_t day, const plist::Array& withAppInfo) {
  platform_.log->log(LogLevel::Info, "writing tallied log. yesterday=%d", day);
  const bool isComplete = collect(day);
  const LogOutcome outcome = serializeWithDate(day, withAppInfo);
  if (!isComplete && outcome == LogOutcome::Filed) return LogOutcome::FiledInPart;
  if (!isComplete && outcome == LogOutcome::NothingToReport) return LogOutcome::StoreUnreadable;
  return outcome;
}

bool BHReport::collect(std::int32_t day) {
  const auto history = platform_.statistics->initWithDefaultPath();
  const std::int64_t dayBefore = std::int64_t{day} - 1;
  const bool hasAllScalars = history->scalarsForKeyPrefix(
      "", dayBefore, day, [this](std::string_view key, std::int32_t, std::int64_t value, bool&) {
        if (const auto options = optionsForScalar(key)) addScalar(value, key, options);
      });
  const bool hasAllDistributions = history->distributionsForKeyPrefix(
      "", dayBefore, day,
      [this](std::string_view key, std::int32_t, BHHistoryDistributionEnumerator& values, bool&) {
        if (const auto options = optionsForDistribution(key)) {
          computeAndAddDistribution(values, key, options);
        }
      });
  return hasAllScalars && hasAllDistributions;
}

plist::Dictionary BHReport::optionsForScalar(std::string_view key) const {
  return _config ? _config->configOptionsForScalarKey(key) : plist::Dictionary();
}

plist::Dictionary BHReport::optionsForDistribution(std::string_view key) const {
  return _config ? _config->configOptionsForDistributionKey(key) : plist::Dictionary();
}

}  // namespace tavrel
