#include "fleet/questions/compare.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <cmath>
#include <exception>
#include <functional>
#include <limits>
#include <thread>

#include "fleet/questions/exact_moments.h"
#include "fleet/questions/grouping.h"
#include "fleet/questions/student.h"

namespace tavrel::fleet {

namespace {

constexpr std::size_t kThreads = 2;

enum class Side : std::uint8_t { kBefore, kAfter, kNeither };

std::vector<Side> sidesOf(const LogTable& table, const CompareRequest& request) {
  const auto before = table.number(Attribute::kOs, request.oldVersion);
  const auto after = table.number(Attribute::kOs, request.newVersion);
  std::vector<Side> sides(table.size(), Side::kNeither);
  for (LogIndex log = 0; log < table.size(); ++log) {
    if (!request.days.contains(table.day(log))) continue;
    const std::uint32_t version = table.attribute(Attribute::kOs, log);
    if (version == before) sides[log] = Side::kBefore;
    if (version == after) sides[log] = Side::kAfter;
  }
  return sides;
}

/// What the logs of one side tell of one key.
struct Sample {
  explicit Sample(const LogTable& table) : logs(table) {}

  LogSet logs;
  ExactMoments moments;
};

/// The mean of n logs of devices with m1, m2, ... logs each is at least as certain as that of
/// n² / Σ m² independent values; it is exactly so uncertain when the logs of a device are all
/// alike. The m are not known. Given the numbers of logs of the days, Σ m² is largest when the
/// devices of each day are among those of every day with more logs; with these numbers in
/// descending order it is then Σ (2t - 1) × number of day t, for t = 1, 2, ...
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

/// What is left of a sample once its rows are read.
struct Measured {
  ComparedSide side;
  double squaredError = 0;  // of the mean
  double independent = 0;   // values that the mean counts as
  double variance = 0;
};

struct KeyResult {
  std::array<LogSet, 2> logs;
  std::array<std::optional<Measured>, 2> measured;
};

std::optional<Measured> measure(const Sample& sample, const LogTable& table) {
  Measured result;
  ComparedSide& side = result.side;
  side.logs = sample.logs.logs();
  side.devices = sample.logs.devices(table);
  side.mean = sample.moments.mean();
  const double squared = sample.moments.squaredDeviations();
  if (!std::isfinite(side.mean) || !std::isfinite(squared)) return std::nullopt;
  const auto logs = static_cast<double>(side.logs);
  result.independent = independentValues(sample.logs.logsByDay(table));
  if (result.independent <= 1) return std::nullopt;
  result.variance = squared / logs * (result.independent / (result.independent - 1));
  result.squaredError = result.variance / result.independent;
  side.deviation = std::sqrt(result.variance);
  return result;
}

/// Welch's test: the variances of the two sides may differ.
Comparison comparisonOf(const Key& key, const Measured& before, const Measured& after) {
  Comparison result;
  result.key = key;
  result.before = before.side;
  result.after = after.side;
  result.difference = after.side.mean - before.side.mean;
  if (before.side.mean != 0) result.relative = result.difference / std::abs(before.side.mean);
  const double squaredError = before.squaredError + after.squaredError;
  if (squaredError == 0) {
    if (result.difference == 0) result.effect = 0;
    result.probability = result.difference == 0 ? 1 : 0;
    return result;
  }
  const auto term = [&](const Measured& one) {
    const double share = one.squaredError / squaredError;
    return share * share / (one.independent - 1);
  };
  const double freedom = 1 / (term(before) + term(after));
  const double error = std::sqrt(squaredError);
  result.effect = result.difference / std::sqrt((before.variance + after.variance) / 2);
  result.margin = studentQuantile(1 - kConfidence, freedom) * error;
  result.probability = studentTwoSided(result.difference / error, freedom);
  return result;
}

class Comparer {
 public:
  Comparer(const Ledger& ledger, const CompareRequest& request, std::vector<Key> keys)
      : ledger_(ledger),
        sides_(sidesOf(ledger.table(), request)),
        keys_(std::move(keys)),
        results_(keys_.size()) {}

  /// Takes keys that no thread has taken until none is left, or until one has failed.
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

  /// In the order of the keys, whatever the threads did.
  CompareAnswer answer(Ledger& ledger, const CompareRequest& request) {
    CompareAnswer answer{request, ledger.devicesAtLeast(), {}, 0, 0, 0};
    for (std::size_t i = 0; i < keys_.size(); ++i) {
      if (!results_[i]) {
        ++answer.missing;
        continue;
      }
      const auto& [before, after] = results_[i]->logs;
      const std::string subject =
          (keys_[i].kind == KeyKind::kScalar ? "scalar " : "distribution ") + keys_[i].name;
      if (!ledger.allows(subject, before) || !ledger.allows(subject, after)) {
        ++answer.tooFew;
        continue;
      }
      const auto& [measuredBefore, measuredAfter] = results_[i]->measured;
      if (!measuredBefore || !measuredAfter) {
        ++answer.unfit;
        continue;
      }
      ledger.noteShown(subject, before);
      ledger.noteShown(subject, after);
      answer.comparisons.push_back(comparisonOf(keys_[i], *measuredBefore, *measuredAfter));
    }
    return answer;
  }

 private:
  std::unique_ptr<KeyResult> read(Engine& engine, const Key& key) const {
    const LogTable& table = ledger_.table();
    std::array<Sample, 2> samples = {Sample(table), Sample(table)};
    const auto add = [&](LogId id, auto value) {
      const LogIndex log = table.find(id);
      if (log == kNoLog || sides_[log] == Side::kNeither) return;
      Sample& sample = samples[static_cast<std::size_t>(sides_[log])];
      sample.logs.insert(log);
      sample.moments.add(value);
    };
    if (key.kind == KeyKind::kScalar) {
      engine.scalars(key.name, [&](std::span<const ScalarValue> rows) {
        for (const ScalarValue& row : rows)
          add(row.log, row.value);
      });
    } else {
      engine.distributions(key.name, [&](std::span<const DistributionValue> rows) {
        for (const DistributionValue& row : rows) {
          if (row.numbers.count != 0) add(row.log, row.numbers.mean);
        }
      });
    }
    const auto& [before, after] = samples;
    if (before.logs.empty() || after.logs.empty()) return nullptr;
    return std::make_unique<KeyResult>(
        KeyResult{{before.logs, after.logs}, {measure(before, table), measure(after, table)}});
  }

  const Ledger& ledger_;
  const std::vector<Side> sides_;
  const std::vector<Key> keys_;
  std::vector<std::unique_ptr<KeyResult>> results_;
  std::atomic<std::size_t> next_ = 0;
  std::atomic<bool> hasFailed_ = false;
  std::exception_ptr failure_;
};

void correctAndSort(std::vector<Comparison>& comparisons) {
  std::vector<double> probabilities;
  for (const Comparison& one : comparisons)
    probabilities.push_back(one.probability);
  const std::vector<double> corrected = holm(probabilities);
  for (std::size_t i = 0; i < comparisons.size(); ++i)
    comparisons[i].corrected = corrected[i];
  const auto strength = [](const Comparison& one) {
    return one.effect ? std::abs(*one.effect) : std::numeric_limits<double>::infinity();
  };
  std::stable_sort(comparisons.begin(), comparisons.end(),
                   [&](const Comparison& a, const Comparison& b) {
                     if (a.isReal() != b.isReal()) return a.isReal();
                     return strength(a) > strength(b);
                   });
}

}  // namespace

CompareAnswer compare(Engine& engine, Ledger& ledger, const CompareRequest& request) {
  std::vector<Key> keys = engine.keys();
  std::erase_if(keys, [](const Key& key) { return key.kind == KeyKind::kHistogram; });
  Comparer comparer(ledger, request, std::move(keys));
  comparer.run(engine);
  CompareAnswer answer = comparer.answer(ledger, request);
  correctAndSort(answer.comparisons);
  return answer;
}

std::optional<std::pair<std::string, std::string>> newestVersions(const Ledger& ledger,
                                                                  const DayRange& days) {
  const LogTable& table = ledger.table();
  LogSet all(table);
  for (LogIndex log = 0; log < table.size(); ++log) {
    if (days.contains(table.day(log))) all.insert(log);
  }
  std::vector<std::string> versions;
  for (const Group& group : groupsOf(table, all, GroupBy::kOs, ledger.devicesAtLeast())) {
    if (group.isSmall || !ledger.hasEnough(group.logs)) continue;
    if (table.number(Attribute::kOs, group.title)) versions.push_back(group.title);
  }
  if (versions.size() < 2) return std::nullopt;
  return std::pair(versions[versions.size() - 2], versions.back());
}

}  // namespace tavrel::fleet
