#include "fleet/questions/compare.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <bit>
#include <cmath>
#include <exception>
#include <functional>
#include <limits>
#include <mutex>
#include <thread>

#include "fleet/questions/exact_moments.h"
#include "fleet/questions/grouping.h"
#include "fleet/questions/merged_numbers.h"
#include "fleet/questions/student.h"

namespace tavrel::fleet {

namespace {

constexpr std::size_t kThreads = 2;

enum class Side : std::uint8_t { Before, After, Neither };

std::vector<Side> sidesOf(const LogTable& table, const CompareRequest& request) {
  const auto before = table.number(Attribute::Os, request.oldVersion);
  const auto after = table.number(Attribute::Os, request.newVersion);
  std::vector<Side> sides(table.size(), Side::Neither);
  for (LogIndex log = 0; log < table.size(); ++log) {
    if (!request.days.contains(table.day(log))) continue;
    const std::uint32_t version = table.attribute(Attribute::Os, log);
    if (version == before) sides[log] = Side::Before;
    if (version == after) sides[log] = Side::After;
  }
  return sides;
}

/// The logs of one side that have one key, and their moments.
struct Sample {
  explicit Sample(const LogTable& logTable) : table(logTable), logs(logTable) {}

  void add(LogIndex log, std::int64_t value) {
    logs.insert(log);
    isEmpty = false;
    moments.add(value);
    note(std::bit_cast<std::uint64_t>(value));
  }
  void add(LogIndex log, const FiveNumbers& numbers) {
    logs.insert(log);
    isEmpty = false;
    if (hasMean(numbers)) {
      moments.add(numbers.mean);
      note(std::bit_cast<std::uint64_t>(numbers.mean + 0.0));  // 0 has one sign
    } else {
      if (!withoutMean) withoutMean.emplace(table);
      withoutMean->insert(log);
    }
  }

  void note(std::uint64_t value) {
    if (!first) first = value;
    varies = varies || value != *first;
  }

  const LogTable& table;
  LogMarks logs;
  std::optional<LogMarks> withoutMean;
  bool isEmpty = true;
  ExactMoments moments;
  std::optional<std::uint64_t> first;  // the bits of the first value
  bool varies = false;
};

/// If devices have m1, m2, ... logs, the mean of all n logs is at least as certain as that of n² /
/// Σ m² independent values, and exactly as certain when the logs of each device are all alike. The
/// m are unknown. Given the number of logs of each day, Σ m² is largest when the devices of a day
/// are also among those of every day with more logs. With these numbers in descending order, it is
/// then Σ (2t - 1) × (logs of day t), for t = 1, 2, ...
double independentValues(std::vector<std::size_t> logsByDay) {
  std::sort(logsByDay.begin(), logsByDay.end(), std::greater<>());
  double logs = 0;
  double squares = 0;
  double weight = 1;
  for (const std::size_t count : logsByDay) {
    logs += static_cast<double>(count);
    squares += weight * static_cast<double>(count);
    weight += 2;
  }
  return logs * logs / squares;
}

struct Measured {
  ComparedSide side;
  double squaredError = 0;  // of the mean
  double independent = 0;   // values that the mean counts as
  double variance = 0;
};

/// What remains of a sample once its rows are read.
struct SideResult {
  std::shared_ptr<const LogSet> logs;
  std::shared_ptr<const LogSet> withMean;  // the same set when all logs have a mean
  std::optional<Measured> measured;
};
struct KeyResult {
  std::array<SideResult, 2> sides;
  double difference;  // of the means: after - before; 0 when one is not measured
};

std::optional<Measured> measure(const Sample& sample, const LogSet& logSet,
                                const LogSet& withMean) {
  Measured result;
  ComparedSide& side = result.side;
  side.logs = withMean.logs();
  side.logsWithoutMean = logSet.logs() - side.logs;
  side.devices = withMean.devices(sample.table);
  side.mean = sample.moments.mean();
  const double squared = sample.moments.squaredDeviations();
  if (side.logs == 0 || !std::isfinite(squared)) return std::nullopt;
  const auto logs = static_cast<double>(side.logs);
  result.independent = independentValues(withMean.logsByDay(sample.table));
  if (result.independent <= 1) return std::nullopt;
  result.variance = squared / logs * (result.independent / (result.independent - 1));
  result.squaredError = result.variance / result.independent;
  // Deviations below the smallest double would make the mean look certain.
  if (result.squaredError == 0 && sample.varies) return std::nullopt;
  side.deviation = std::sqrt(result.variance);
  return result;
}

/// The squared error of the difference of two means, if both sides have the same variance.
double pooledSquaredError(const Measured& a, const Measured& b) {
  const double degreesOfFreedom = a.independent + b.independent - 2;
  const auto part = [&](const Measured& one) {
    return one.variance * ((one.independent - 1) / degreesOfFreedom);
  };
  return (part(a) + part(b)) * (1 / a.independent + 1 / b.independent);
}

/// Welch's test: the variances of the two sides may differ. But when a side with few values has the
/// smaller variance, that may be chance, as with a rare event that none of its devices had. So the
/// error is not taken for smaller than it is if the sides do not differ at all.
Comparison comparisonOf(const Key& key, double difference, const Measured& before,
                        const Measured& after) {
  Comparison result;
  result.key = key;
  result.before = before.side;
  result.after = after.side;
  result.difference = difference;
  if (before.side.mean != 0) result.relative = result.difference / std::abs(before.side.mean);
  const double squaredError = before.squaredError + after.squaredError;
  if (squaredError == 0) {
    if (result.difference == 0) result.effect = 0;
    result.pValue = result.difference == 0 ? 1 : 0;
    return result;
  }
  const auto term = [&](const Measured& one) {
    const double share = one.squaredError / squaredError;
    return share * share / (one.independent - 1);
  };
  const double degreesOfFreedom = 1 / (term(before) + term(after));
  const double error = std::sqrt(std::max(squaredError, pooledSquaredError(before, after)));
  result.effect = result.difference / std::sqrt((before.variance + after.variance) / 2);
  result.margin = studentQuantile(1 - kConfidenceLevel, degreesOfFreedom) * error;
  result.pValue = studentTwoSided(result.difference / error, degreesOfFreedom);
  return result;
}

class Comparer {
 public:
  Comparer(const Ledger& ledger, const CompareRequest& request, std::vector<Key> keys)
      : ledger_(ledger),
        sides_(sidesOf(ledger.table(), request)),
        keys_(std::move(keys)),
        results_(keys_.size()) {}

  /// Takes keys that no thread has taken until none is left or a thread has failed.
  void work(Engine& engine) {
    try {
      for (std::size_t key = next_++; key < keys_.size() && !hasFailed_; key = next_++) {
        results_[key] = read(engine, keys_[key]);
      }
    } catch (...) {
      if (!hasFailed_.exchange(true)) failure_ = std::current_exception();
    }
  }

  void run(Engine& engine) {
    std::vector<std::unique_ptr<Engine>> engines;
    std::vector<std::thread> threads;
    const auto join = [&] {
      for (std::thread& thread : threads)
        thread.join();
    };
    try {
      for (std::size_t i = 1; i < std::min(kThreads, keys_.size()); ++i) {
        engines.push_back(engine.reader());
        threads.emplace_back([this, &other = *engines.back()] { work(other); });
      }
    } catch (...) {
      hasFailed_ = true;
      join();
      throw;
    }
    work(engine);
    join();
    if (failure_) std::rethrow_exception(failure_);
  }

  /// Goes by the order of the keys, whatever order the threads read them in.
  CompareAnswer answer(Ledger& ledger, const CompareRequest& request) {
    CompareAnswer answer{request, ledger.devicesAtLeast(), {}, 0, 0};
    for (std::size_t i = 0; i < keys_.size(); ++i) {
      const auto& [before, after] = results_[i]->sides;
      const std::string subject = subjectOf(keys_[i].kind, keys_[i].name);
      const std::string means = subjectOfMeans(keys_[i].kind, keys_[i].name);
      const auto isAllowed = [&](const SideResult& side) {
        return ledger.allows(subject, *side.logs) &&
               (side.withMean->empty() || ledger.allows(means, *side.withMean));
      };
      if (!isAllowed(before) || !isAllowed(after)) {
        const auto hasEnough = [&](const SideResult& side) {
          return side.logs->devices(ledger.table()) >= ledger.devicesAtLeast();
        };
        if (hasEnough(before) || hasEnough(after)) ++answer.leftOut;
        continue;
      }
      if (!before.measured || !after.measured) {
        ++answer.unfit;
        continue;
      }
      for (const SideResult& side : results_[i]->sides) {
        ledger.noteShown(subject, *side.logs);
        ledger.noteShown(means, *side.withMean);
      }
      answer.comparisons.push_back(
          comparisonOf(keys_[i], results_[i]->difference, *before.measured, *after.measured));
    }
    return answer;
  }

 private:
  std::unique_ptr<KeyResult> read(Engine& engine, const Key& key) {
    const LogTable& table = ledger_.table();
    std::array<Sample, 2> samples = {Sample(table), Sample(table)};
    const auto add = [&](LogId id, const auto& value) {
      const LogIndex log = table.find(id);
      if (log == kNoLog || sides_[log] == Side::Neither) return;
      samples[static_cast<std::size_t>(sides_[log])].add(log, value);
    };
    if (key.kind == KeyKind::Scalar) {
      engine.scalars(key.name, [&](std::span<const ScalarValue> rows) {
        for (const ScalarValue& row : rows)
          add(row.log, row.value);
      });
    } else {
      engine.distributions(key.name, [&](std::span<const DistributionValue> rows) {
        for (const DistributionValue& row : rows) {
          if (row.numbers.count != 0) add(row.log, row.numbers);
        }
      });
    }
    const auto& [before, after] = samples;
    auto result = std::make_unique<KeyResult>(KeyResult{{resultOf(before), resultOf(after)}, 0});
    if (result->sides[0].measured && result->sides[1].measured)
      result->difference = ExactMoments::differenceOfMeans(before.moments, after.moments);
    return result;
  }

  SideResult resultOf(const Sample& sample) {
    const LogSet logs = sample.logs.set();
    SideResult result;
    result.logs = result.withMean = keep(logs);
    if (sample.withoutMean) result.withMean = keep(logs.without(sample.withoutMean->set()));
    result.measured = measure(sample, *result.logs, *result.withMean);
    return result;
  }

  std::shared_ptr<const LogSet> keep(const LogSet& logs) {
    const std::lock_guard lock(mutex_);
    return sets_.keep(logs);
  }

  const Ledger& ledger_;
  const std::vector<Side> sides_;
  const std::vector<Key> keys_;
  std::vector<std::unique_ptr<KeyResult>> results_;
  std::mutex mutex_;  // of `sets_`
  SharedLogSets sets_;
  std::atomic<std::size_t> next_ = 0;
  std::atomic<bool> hasFailed_ = false;
  std::exception_ptr failure_;
};

void correctAndSort(std::vector<Comparison>& comparisons) {
  std::vector<double> pValues;
  pValues.reserve(comparisons.size());
  for (const Comparison& one : comparisons)
    pValues.push_back(one.pValue);
  const std::vector<double> adjusted = holm(pValues);
  for (std::size_t i = 0; i < comparisons.size(); ++i)
    comparisons[i].adjustedPValue = adjusted[i];
  const auto strength = [](const Comparison& one) {
    return one.effect ? std::abs(*one.effect) : std::numeric_limits<double>::infinity();
  };
  std::stable_sort(comparisons.begin(), comparisons.end(),
                   [&](const Comparison& a, const Comparison& b) {
                     if (a.isSignificant() != b.isSignificant()) return a.isSignificant();
                     return strength(a) > strength(b);
                   });
}

}  // namespace

CompareAnswer compare(Engine& engine, Ledger& ledger, const CompareRequest& request) {
  std::vector<Key> keys = engine.keys();
  std::erase_if(keys, [](const Key& key) { return key.kind == KeyKind::Histogram; });
  Comparer comparer(ledger, request, std::move(keys));
  comparer.run(engine);
  CompareAnswer answer = comparer.answer(ledger, request);
  correctAndSort(answer.comparisons);
  return answer;
}

std::optional<std::pair<std::string, std::string>> newestVersions(const Ledger& ledger,
                                                                  const DayRange& days) {
  const std::vector<std::string> versions = shownVersions(ledger, days);
  if (versions.size() < 2) return std::nullopt;
  return std::pair(versions[versions.size() - 2], versions.back());
}

}  // namespace tavrel::fleet
