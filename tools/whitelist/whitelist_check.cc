#include "tools/whitelist/whitelist_check.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <optional>
#include <unordered_map>

#include "base/format.h"
#include "base/limits.h"
#include "config/bh_config.h"
#include "tools/console/value_text.h"
#include "tools/whitelist/whitelist_coarseness.h"
#include "tools/whitelist/whitelist_model.h"
#include "tools/whitelist/whitelist_rules.h"

namespace tavrel {
namespace {

constexpr std::string_view kTableNames =
    "ScalarKeys, ScalarKeyPrefixes, DistributionKeys, DistributionKeyPrefixes";

constexpr WhitelistTable kTables[] = {WhitelistTable::ScalarKeys, WhitelistTable::ScalarPrefixes,
                                      WhitelistTable::DistributionKeys,
                                      WhitelistTable::DistributionPrefixes};

std::string_view nameOf(WhitelistTable table) {
  return kWhitelistTables[static_cast<std::size_t>(table)];
}

std::optional<WhitelistTable> tableNamed(std::string_view name) {
  for (const WhitelistTable table : kTables) {
    if (nameOf(table) == name) return table;
  }
  return std::nullopt;
}

/// The findings so far; beyond the limit they are only counted.
class Findings {
 public:
  void add(std::string path, std::string message) {
    if (list_.size() < limits::kWhitelistFindings) {
      list_.push_back({std::move(path), std::move(message)});
    } else {
      ++surplus_;
    }
  }

  std::vector<WhitelistFinding> take() {
    if (surplus_ > 0) list_.push_back({"", format("has %zu more findings", surplus_)});
    return std::move(list_);
  }

 private:
  std::vector<WhitelistFinding> list_;
  std::size_t surplus_ = 0;
};

/// Collects findings, each with the path of its place.
class Checker {
 public:
  explicit Checker(Findings& findings) : findings_(findings) {}

  void checkFile(const plist::Value& whitelist) {
    if (!whitelist.dictionary()) {
      add(format("is %s: a whitelist is a dictionary of groups: nothing is reported",
                 kindWithArticle(whitelist)));
      return;
    }
    for (const plist::Entry& group : whitelist.dictionary()) {
      const Place place(*this, group.key);
      // Statistics that leave only internal devices are meant to be exact.
      isForAll_ = isLoadedByDefault(group.key);
      checkGroup(group.value);
    }
  }

  void add(std::string message) { findings_.add(path_, std::move(message)); }

  /// Extends the path during its lifetime.
  class Place {
   public:
    Place(Checker& checker, std::string_view name)
        : checker_(checker), length_(checker.path_.size()) {
      if (length_ > 0) checker.path_ += '/';
      checker.path_ += shownName(name);
    }
    Place(const Place&) = delete;
    Place& operator=(const Place&) = delete;
    ~Place() { checker_.path_.resize(length_); }

   private:
    Checker& checker_;
    std::size_t length_;
  };

 private:
  void checkGroup(const plist::Value& group) {
    if (!group.dictionary()) {
      add(format("is %s: a group is a dictionary of tables: ignored", kindWithArticle(group)));
      return;
    }
    for (const plist::Entry& table : group.dictionary()) {
      const Place place(*this, table.key);
      const auto known = tableNamed(table.key);
      if (!known) {
        add(format("is not a table of a group: ignored; the tables are %s", kTableNames));
      } else if (!table.value.dictionary()) {
        add(format("is %s: a table is a dictionary from keys to options: ignored",
                   kindWithArticle(table.value)));
      } else {
        checkTable(*known, table.value.dictionary());
      }
    }
  }

  void checkTable(WhitelistTable table, const plist::Dictionary& rules) {
    for (const plist::Entry& rule : rules) {
      const Place place(*this, rule.key);
      if (!rule.value.dictionary()) {
        add(
            format("is %s: options are a dictionary, an empty one to report the value unchanged: "
                   "ignored",
                   kindWithArticle(rule.value)));
        continue;
      }
      if (isForAll_ && isPrefixTable(table) && rule.key.view().empty()) {
        add("is the empty prefix: every key begins with it");
      }
      if (isForAll_ && !isDistributionTable(table) && coarsensNoScalar(rule.value.dictionary())) {
        add("is let out unchanged: coarsen it, or say with a bucket_interval of 1 that this is "
            "intended");
      }
      if (isForAll_ && table == WhitelistTable::DistributionPrefixes) {
        add("lets out the exact minimum and maximum of every distribution with this prefix: list "
            "keys one by one");
      }
      for (const plist::Entry& option : rule.value.dictionary()) {
        const Place optionPlace(*this, option.key);
        checkOption(table, option);
      }
    }
  }

  void checkOption(WhitelistTable table, const plist::Entry& option) {
    const bool isIntervals = option.key == kIntervalsOption;
    if (!isIntervals && option.key != kSignificantFiguresOption &&
        option.key != kBucketIntervalOption) {
      add("is not an option: ignored; the options are sig_fig, bucket_interval, intervals");
    } else if (isIntervals != isDistributionTable(table)) {
      add(isIntervals ? "does not affect scalars: ignored"
                      : "does not affect distributions: ignored");
    } else if (isIntervals) {
      checkIntervals(option.value);
    } else {
      checkInteger(option);
    }
  }

  void checkInteger(const plist::Entry& option) {
    const auto number = option.value.number();
    if (!number) {
      add(format("is %s: expected an integer: ignored", kindWithArticle(option.value)));
      return;
    }
    if (number->isFloating() || *number != plist::Number(number->uint32())) {
      add(format("is %s: expected an integer from 0 to 4294967295: used as %u",
                 inlineText(option.value), number->uint32()));
    }
    if (option.key == kBucketIntervalOption && number->uint32() == 0) {
      add("is 0: a bucket has a width: the value is not bucketed");
    }
  }

  void checkIntervals(const plist::Value& value) {
    const plist::Array intervals = value.array();
    if (!intervals) {
      add(format("is %s: expected an array of numbers: no histogram is made",
                 kindWithArticle(value)));
      return;
    }
    if (intervals.size() > limits::kHistogramBoundaries) {
      add(format("has %zu boundaries, at most %zu are allowed: no histogram is made",
                 intervals.size(), limits::kHistogramBoundaries));
      return;
    }
    double largest = -std::numeric_limits<double>::infinity();
    std::size_t index = 0;
    for (const plist::Value& boundary : intervals) {
      const std::string name = std::to_string(index);
      const Place place(*this, name);
      const auto number = boundary.number();
      if (!number) {
        add(
            format("is %s: expected a number: its bucket stays empty, and tavrel-fleet may refuse "
                   "the logs",
                   kindWithArticle(boundary)));
      } else if (std::isnan(number->real())) {
        add("is not a number: its bucket stays empty, and tavrel-fleet may refuse the logs");
      } else if (std::isinf(number->real())) {
        add("is infinite: leave it out, the outer buckets are open already, and tavrel-fleet may "
            "refuse the logs");
        largest = std::max(largest, number->real());
      } else if (index > 0 && number->real() <= largest) {
        add(
            format("is %s, not above the boundaries before it: its bucket stays empty, and "
                   "tavrel-fleet may refuse the logs",
                   inlineText(boundary)));
      } else {
        largest = number->real();
      }
      ++index;
    }
  }

  std::string path_;
  bool isForAll_ = true;  // whether the group is for all devices
  Findings& findings_;
};

// Devices that are not internal do not load a later group for internal devices, so the entry still
// counts there.
void findRivals(const std::vector<WhitelistRule>& rules, Findings& findings) {
  std::unordered_map<std::string_view, const WhitelistRule*> winners;
  for (const WhitelistRule& rule : rules) {
    if (isLoadedByDefault(rule.group)) winners[rule.key] = &rule;
  }
  for (const WhitelistRule& rule : rules) {
    const auto winner = winners.find(rule.key);
    if (winner == winners.end() || winner->second <= &rule) continue;
    findings.add(pathOfRule(rule), format("is also listed by group %s, which comes later and wins",
                                          shownName(winner->second->group)));
  }
}

// When sorted, a prefix directly follows those that it begins with; the stack holds these. Groups
// for internal devices are left out: on other devices their prefixes hide nothing.
void findHiddenPrefixes(const std::vector<WhitelistRule>& rules, Findings& findings) {
  std::vector<const WhitelistRule*> sorted;
  sorted.reserve(rules.size());
  for (const WhitelistRule& rule : rules) {
    if (isLoadedByDefault(rule.group)) sorted.push_back(&rule);
  }
  std::stable_sort(sorted.begin(), sorted.end(),
                   [](const auto* a, const auto* b) { return a->key < b->key; });
  std::vector<const WhitelistRule*> enclosing;
  for (const WhitelistRule* rule : sorted) {
    while (!enclosing.empty() && !rule->key.starts_with(enclosing.back()->key)) {
      enclosing.pop_back();
    }
    if (!enclosing.empty() && enclosing.back()->key == rule->key) {
      enclosing.pop_back();  // a rival in another group, already found
    } else if (!enclosing.empty()) {
      findings.add(pathOfRule(*enclosing.back()),
                   format("is hidden by the longer prefix %s for keys that begin with that",
                          pathOfRule(*rule)));
    }
    enclosing.push_back(rule);
  }
}

}  // namespace

std::vector<WhitelistFinding> checkWhitelist(const plist::Value& whitelist) {
  Findings findings;
  Checker(findings).checkFile(whitelist);
  const WhitelistModel model(whitelist);
  for (const WhitelistTable table : kTables) {
    findRivals(model.rules(table), findings);
    if (isPrefixTable(table)) findHiddenPrefixes(model.rules(table), findings);
  }
  return findings.take();
}

}  // namespace tavrel
