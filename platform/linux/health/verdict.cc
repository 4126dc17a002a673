#include "platform/linux/health/verdict.h"

#include "base/format.h"

namespace tavrel::health {
namespace {

constexpr std::int64_t kOldSeconds = 172'800;

struct Rule {
  std::string_view figure;
  std::int64_t atLeast;
  Problem problem;
};

constexpr Rule kRules[] = {
    {"critical_warning", 1, kFailing},
    {"failing_attributes", 1, kFailing},
    {"pre_eol", 3, kFailing},
    {"used_pct", 100, kWorn},
    {"life_a_pct", 110, kWorn},
    {"life_b_pct", 110, kWorn},
    {"pre_eol", 2, kWorn},
    {"media_errors", 1, kErrors},
    {"uncorrectable_reads", 1, kErrors},
    {"ecc_failures", 1, kErrors},
    {"bad_sectors", 1, kErrors},
};

}  // namespace

const char* Verdict::word() const {
  if ((problems & kFailing) != 0) return "failing";
  if ((problems & kWorn) != 0) return "worn";
  if ((problems & kErrors) != 0) return "errors";
  return (problems & kUnread) != 0 ? "unknown" : "good";
}

Verdict judge(const Reading& reading, std::int64_t nowSeconds, const std::string& boot) {
  Verdict verdict;
  const auto find = [&verdict](Problem problem, std::string reason) {
    verdict.problems |= problem;
    verdict.reasons.push_back(std::move(reason));
  };
  if (!reading.error.empty()) find(kUnread, reading.error);
  for (const Rule& rule : kRules) {
    const std::int64_t* const value = valueOf(reading.figures, rule.figure);
    if (value != nullptr && *value >= rule.atLeast) {
      find(rule.problem, format("%s is %lld", rule.figure, *value));
    }
  }
  const std::int64_t* const good = valueOf(reading.figures, "smart_good");
  if (good != nullptr && *good == 0) find(kFailing, "SMART status is failing");
  const std::int64_t* const spare = valueOf(reading.figures, "spare_pct");
  const std::int64_t* const threshold = valueOf(reading.figures, "spare_threshold_pct");
  if (spare != nullptr && threshold != nullptr && *spare < *threshold) {
    find(kWorn, format("spare_pct is %lld, below the threshold of %lld", *spare, *threshold));
  }
  if (!boot.empty() && !reading.boot.empty() && boot != reading.boot) {
    find(kOld, "read before the last start of the system");
  } else if (nowSeconds - reading.time > kOldSeconds) {
    find(kOld, "read more than two days ago");
  }
  return verdict;
}

}  // namespace tavrel::health
