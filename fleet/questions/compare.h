// Which statistics differ between two versions of the system.
//
// The values of a scalar, or the means of a distribution, are taken log by log; logs whose mean is
// not finite are left out and counted. A device that reports on several days yields several logs.
// These are not independent of each other, and nothing shows which belong together. So the mean
// covers all logs, but counts as only as many independent values as the numbers of logs per day
// guarantee: its true uncertainty is no larger, whatever the logs of a device have in common.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "fleet/engine/engine.h"
#include "fleet/questions/ledger.h"
#include "fleet/questions/log_table.h"

namespace tavrel::fleet {

inline constexpr double kConfidenceLevel = 0.95;

struct CompareRequest {
  std::string oldVersion;
  std::string newVersion;
  DayRange days;
};

struct ComparedSide {
  std::size_t logs = 0;
  std::size_t logsWithoutMean = 0;  // not among `logs`
  std::size_t devices = 0;          // the largest number of logs on one day
  double mean = 0;
  std::optional<double> deviation;  // standard deviation over logs
};

struct Comparison {
  Key key;
  ComparedSide before;
  ComparedSide after;
  double difference = 0;           // of the means: after - before
  std::optional<double> relative;  // to the magnitude of the mean before; nothing when that is 0
  /// In standard deviations (the root of the mean variance of both sides). Nothing when the means
  /// differ although neither side varies: no effect is stronger.
  std::optional<double> effect;
  /// Half the width of the interval around `difference` that covers the true one with probability
  /// `kConfidenceLevel`, for this key by itself.
  double margin = 0;
  double pValue = 0;          // probability of such a difference by chance, for this key by itself
  double adjustedPValue = 0;  // the same after Holm's correction for all keys of the answer

  bool isSignificant() const { return adjustedPValue < 1 - kConfidenceLevel; }
};

struct CompareAnswer {
  CompareRequest request;
  std::size_t devicesAtLeast = 0;
  /// The keys that differ come first; within each part, the strongest come first.
  std::vector<Comparison> comparisons;
  /// Keys that one version has in logs of enough devices, but not both, or that are too close to
  /// what was shown. Keys of fewer devices are not even counted.
  std::size_t leftOut = 0;
  std::size_t unfit = 0;  // keys for which one version has no mean or no measurable deviation
};

/// Reads the keys one by one, in two threads. Throws EngineError.
CompareAnswer compare(Engine& engine, Ledger& ledger, const CompareRequest& request);

/// The two newest versions, by number, that each have enough devices on these
/// days; the older one first.
std::optional<std::pair<std::string, std::string>> newestVersions(const Ledger& ledger,
                                                                  const DayRange& days);

}  // namespace tavrel::fleet
