#include "tools/whitelist/whitelist_data.h"

#include <algorithm>
#include <cmath>
#include <optional>

#include "base/format.h"
#include "base/limits.h"
#include "config/bh_config.h"
#include "platform/linux/store/sqlite_store.h"
#include "report/histogram.h"
#include "tools/console/day_argument.h"
#include "tools/console/table.h"
#include "tools/whitelist/whitelist_model.h"
#include "tools/whitelist/whitelist_rules.h"

namespace tavrel {
namespace {

// Four values are four unknowns, which minimum, maximum, mean, deviation and count can determine.
constexpr std::int64_t kKnownFromSummary = 4;

// With less than two values per bucket on average, a histogram reveals most values individually. If
// there are few buckets, that may be chance.
constexpr std::int64_t kFewBuckets = 8;

/// Counts what the log would reveal of one distribution.
struct Shown {
  std::int64_t values = 0;
  std::int64_t notNumbers = 0;
  std::int64_t finite = 0;
  std::int64_t buckets = 0;  // buckets that are not empty; 0 without a histogram

  Shown(BHHistoryDistributionEnumerator& enumerator, const plist::Dictionary& options) {
    const plist::Array intervals = options.array(kIntervalsOption);
    auto histogram = intervals ? Histogram::create(intervals) : std::nullopt;
    double value = 0;
    std::uint32_t second = 0;
    while (enumerator.getNextValue(value, second)) {
      ++values;
      notNumbers += std::isnan(value) ? 1 : 0;
      finite += std::isfinite(value) ? 1 : 0;
      if (histogram) histogram->count(value);
    }
    if (histogram) {
      buckets =
          std::ranges::count_if(histogram->counts(), [](std::uint32_t count) { return count > 0; });
    }
  }
};

class DataCheck {
 public:
  explicit DataCheck(const plist::Value& whitelist) : model_(whitelist), rules_(model_, true) {}

  void look(std::string_view key, std::int32_t day, BHHistoryDistributionEnumerator& values) {
    const WhitelistRule* const rule = rules_.ofKey(key);
    if (rule == nullptr || findings.size() >= limits::kWhitelistFindings) return;
    const Shown shown(values, rule->options);
    const std::string which = format("%s on %s", key, dayDateText(day));
    const std::string counts = counted(static_cast<std::uint64_t>(shown.values), "value");
    if (shown.notNumbers > 0) {
      add(*rule, format("%s: mean and deviation are nan, as %lld of %s %s not a number: fix the "
                        "program that records it",
                        which, shown.notNumbers, counts, shown.notNumbers == 1 ? "is" : "are"));
    }
    if (shown.values > 0 && shown.values <= kKnownFromSummary && shown.finite == shown.values) {
      add(*rule, format("%s: minimum, maximum, mean and deviation are exact and reveal %s", which,
                        shown.values == 1 ? "its only value" : "each of its " + counts));
    } else if (shown.buckets >= kFewBuckets && 2 * shown.buckets > shown.values) {
      add(*rule, format("%s: intervals are finer than what is recorded: %s fill %lld buckets",
                        which, counts, shown.buckets));
    }
  }

  std::vector<WhitelistFinding> findings;

 private:
  void add(const WhitelistRule& rule, std::string message) {
    findings.push_back({pathOfRule(rule), std::move(message)});
  }

  WhitelistModel model_;
  WhitelistRules rules_;
};

// The last day before today.
std::optional<std::int32_t> dayToCheck(const std::vector<std::int32_t>& days, std::int32_t today) {
  const auto next = std::ranges::lower_bound(days, today);
  return next == days.begin() ? std::nullopt : std::optional(*std::prev(next));
}

}  // namespace

std::vector<WhitelistFinding> checkAgainstData(ToolContext& context,
                                               const plist::Value& whitelist) {
  const auto fail = [&](const Error& error) {
    context.fail(error.message + "; the whitelist is not checked against what is recorded");
  };
  auto history = context.storeForReading().openHistory();
  if (!history) {
    fail(history.error());
    return {};
  }
  if (!(*history)->hasStore()) return {};
  DataCheck check(whitelist);
  const auto days = (*history)->days();
  Status read = days ? Status(Done{}) : Status(days.error());
  const auto day =
      days ? dayToCheck(*days, context.storeForReading().BHDaysSince1970()) : std::nullopt;
  if (day) {
    read = (*history)->walkDistributions(
        "", *day, *day,
        [&](std::string_view key, std::int32_t of, std::int64_t,
            BHHistoryDistributionEnumerator& values, bool&) { check.look(key, of, values); });
  }
  if (!read) fail(read.error());
  return std::move(check.findings);
}

}  // namespace tavrel
