// Which statistics differ between two versions of the system.
//
// The values of a scalar, or the means of a distribution, are taken log by log; logs whose mean is
// no finite number are left out and counted. A device that reports on several days gives several
// logs, which are not independent of each other, and nobody can tell which. So the mean is that of
// all logs, but it counts as if it were of as few independent values as the numbers of logs a day
// allow: its true uncertainty is not larger, whatever the logs of a device have in common.
#pragma once

#include <cstdint>
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
  std::size_t logsWithoutMean = 0;  ///< not among `logs`
  std::size_t devices = 0;          ///< the largest number of logs on one day
  double mean = 0;
  std::optional<double> deviation;  ///< standard deviation over logs
};

struct Comparison {
  Key key;
  ComparedSide before;
  ComparedSide after;
  double difference = 0;           ///< of the means: after - before
  std::optional<double> relative;  ///< to the magnitude of the mean before; nothing when that is 0
  /// In standard deviations (the root of the mean variance of both sides). Nothing when neither
  /// side varies but they differ: then it is as strong as can be.
  std::optional<double> effect;
  /// Half the width of the interval around `difference` that covers the true one with probability
  /// `kConfidenceLevel`, for this key by itself.
  double margin = 0;
  double pValue = 0;  ///< probability of such a difference by chance, for this key by itself
  double adjustedPValue = 0;  ///< the same by Holm's rule, for all keys of the answer

  bool isSignificant() const { return adjustedPValue < 1 - kConfidenceLevel; }
};

struct CompareAnswer {
  CompareRequest request;
  std::size_t devicesAtLeast = 0;
  /// The keys that differ come first; both parts are sorted by strength, the strongest first.
  std::vector<Comparison> comparisons;
  std::size_t missing = 0;  ///< keys that only one version, or none, has
  std::size_t tooFew = 0;   ///< keys that one version has of too few devices
  std::size_t unfit = 0;    ///< keys without logs that have a mean, in one version
};

/// Reads the keys one by one, in two threads. Throws EngineError.
CompareAnswer compare(Engine& engine, Ledger& ledger, const CompareRequest& request);

/// The two newest versions of which each has enough devices on these days: by their numbers, the
/// older one first.
std::optional<std::pair<std::string, std::string>> newestVersions(const Ledger& ledger,
                                                                  const DayRange& days);

}  // namespace tavrel::fleet
