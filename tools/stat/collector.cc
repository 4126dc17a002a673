#include "tools/stat/collector.h"

#include <cmath>

#include "base/arithmetic.h"

namespace tavrel {
namespace {

// The value to keep: of a sum, the whole part; the next reading gets the rest.
double kept(const MachineStatistic& statistic, double value, CollectState& now) {
  if (statistic.keeping != Keeping::Sum) return value;
  double& remainder = now.remainders[statistic.key];
  const double sum = value + remainder;
  const double whole = std::floor(sum);
  remainder = sum - whole;
  return whole;
}

}  // namespace

void Collector::read(std::chrono::nanoseconds at, ValueTime time) {
  const auto processes = count_ % readingsPerCount_ == 0 ? Processes::Counted : Processes::LeftOut;
  CollectState now{.at = at, .machine = sources_.read(processes), .remainders = {}};
  const MachineReading* const before = last_ ? &last_->machine : nullptr;
  const double secondsBetween = last_ ? std::chrono::duration<double>(at - last_->at).count() : 0;
  if (waiting_ == 0) before_ = last_;
  if (last_) now.remainders = std::move(last_->remainders);
  for (const MachineStatistic& statistic : machineStatistics()) {
    const auto value = statistic.measure(now.machine, before, secondsBetween);
    if (value) values_.push_back({time, &statistic, kept(statistic, *value, now)});
  }
  last_ = std::move(now);
  ++count_;
  ++waiting_;
}

Status Collector::keep() {
  for (const TimedValue& value : values_) {
    provided_.insert(value.statistic->key);
    if (Status done = keepValue(value); !done) return done;
  }
  Status done = recorder_.keep();
  if (!done && !isInMemory()) return done;
  values_.clear();
  waiting_ = 0;
  return done;
}

std::string Collector::missing() const {
  std::string keys;
  for (const MachineStatistic& statistic : machineStatistics()) {
    if (!provided_.contains(statistic.key)) keys.append(" ").append(statistic.key);
  }
  return keys;
}

Status Collector::keepValue(const TimedValue& given) {
  const auto& [time, statistic, value] = given;
  switch (statistic->keeping) {
    case Keeping::Latest:
      return recorder_.set(time, statistic->key, saturatingInt64(value));
    case Keeping::Sum:
      return recorder_.add(time, statistic->key, saturatingInt64(value));
    case Keeping::Series:
      return recorder_.append(time, statistic->key, value);
  }
  return Done{};
}

}  // namespace tavrel
