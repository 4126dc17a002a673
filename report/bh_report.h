// The report of one day: the whitelisted statistics of that day, coarsened, and the daemon's own
// measurements, in one property list for the submission service.
//
//   BHReport(platform).writeLogForYesterday(day, appInfo);
//
// A daily run makes one report, writes it once and drops it.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <string_view>

#include "base/plist.h"
#include "config/bh_config.h"
#include "platform/platform.h"
#include "report/histogram.h"
#include "report/log_outcome.h"

namespace tavrel {

class BHReport {
 public:
  /// Loads the whitelist; without one nothing is collected. The platform must outlive the report.
  explicit BHReport(Platform& platform);

  /// Collects the statistics of a day and serialises them. `withAppInfo` is the list of activated
  /// applications, an empty handle when the caller has none.
  LogOutcome writeLogForYesterday(std::int32_t day, const plist::Array& withAppInfo);

  /// Adds the probes to the collected statistics, builds the log and submits it. Does nothing when
  /// nothing was collected.
  LogOutcome serializeWithDate(std::int32_t day, const plist::Array& andAppInfo);

  // Scalars.

  /// Coarsens `value` as the options say, stores it and returns the stored value.
  std::int64_t addScalar(std::int64_t value, std::string_view forKey,
                         const plist::Dictionary& withOptions);

  /// Adds a scalar that is costly to measure: calls the function only when the key is whitelisted.
  void addScalarForKey(std::string_view key, const std::function<std::int64_t()>& byExecutingBlock);

  // Distributions.

  /// Stores the summary of the values, and their histogram when the options have "intervals". Adds
  /// no entry when some values cannot be read.
  void computeAndAddDistribution(BHHistoryDistributionEnumerator& values, std::string_view forKey,
                                 const plist::Dictionary& withOptions);

  // Probes: the daemon's own measurements. Each scalar is measured only when it is whitelisted.

  /// Counts of all installed applications and of those that the user installed.
  void addInstalledAppInfo();
  /// Languages and region, whatever the whitelist says.
  void addMetadataKeys();
  /// Size of the statistics database in MiB, and how often it was found corrupt since the last
  /// report.
  void reportDatabaseSize();
  /// Minutes since the device started.
  void reportCPUUptime();
  /// Counters of the virtual-memory freezer, and swap.
  void reportVMStats();

 private:
  // False when statistics could not be read.
  bool collect(std::int32_t day);

  // An empty handle for a key that may not be reported.
  plist::Dictionary optionsForScalar(std::string_view key) const;
  plist::Dictionary optionsForDistribution(std::string_view key) const;

  plist::Dictionary logDictionary(std::int32_t day, const plist::Array& appInfo,
                                  const std::string& whitelistDigest);
  plist::Dictionary submissionOptions();
  std::int64_t takeCorruptionCount();
  void noteOSVersion(plist::Dictionary& options);
  void addConfigNumber(plist::Dictionary& options);

  Platform& platform_;
  std::unique_ptr<BHConfig> _config;
  HistogramLabels histogramLabels_;
  plist::Dictionary _scalarsOutput = plist::Dictionary::create();
  plist::Dictionary _distributionsOutput = plist::Dictionary::create();
  plist::Dictionary _histogramsOutput = plist::Dictionary::create();
  plist::Dictionary _metadataOutput = plist::Dictionary::create();
};

}  // namespace tavrel
