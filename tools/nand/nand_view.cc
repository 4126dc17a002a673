#include "tools/nand/nand_view.h"

#include <algorithm>
#include <cstdint>
#include <map>
#include <ostream>
#include <set>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "base/civil_time.h"
#include "base/format.h"
#include "storage/nand_info_keys.h"
#include "tools/shared/distribution_view.h"
#include "tools/shared/table.h"
#include "tools/shared/value_text.h"

namespace tavrel {
namespace {

// So many keys that differ only in a number at their end make a histogram.
constexpr std::size_t kFewestBuckets = 3;

constexpr std::uint64_t kSectorBytes = 4096;  // of logical traffic
constexpr std::int64_t kDaysTo2000 = 10957;   // since 1970

struct Group {
  std::string_view title;
  std::span<const std::string_view> keys;  // "E2E_*": all that begin so, by name
};

constexpr std::string_view kDevice[] = {"ExportVersion",       "DriverVersion", "DemoMode",
                                        "formatDaysSince2000", "NumSleepOps",   "UncleanBoots",
                                        "NumClockLoss"};
constexpr std::string_view kGeometry[] = {
    "NumVirtualBlocks", "BlocksPerVirtualBlock", "PagesPerVirtualBlock",
    "BytesPerPage",     "NumFreeVirtualBlocks",  "NodesTotal",
    "NodesFree",        "StaticDataSizeInMB",    "IntermediatePartitionSize"};
constexpr std::string_view kWear[] = {"NumPhysicalErases",
                                      "IntermediateBandErases",
                                      "NumWearLevelOps",
                                      "HighEnduranceBlockEraseCount",
                                      "ColdestCycle",
                                      "HottestCycle",
                                      "IntermediateColdestCycle",
                                      "IntermediateHottestCycle",
                                      "NumBandsRefreshedOnError",
                                      "NumRefreshesOnClockLoss",
                                      "NumPaddingsForAge",
                                      "AgeInducedWriteSectors",
                                      "NumOfAvoidedGCDueToTemp",
                                      "NumMaintenanceRequests",
                                      "MaintenanceRequestsFailed*"};
constexpr std::string_view kTraffic[] = {"NumLogicalReads",  "NumLogicalWrites",
                                         "NumPhysicalReads", "NumPhysicalWrites",
                                         "NumFlushes",       "NumFences",
                                         "NumHostChoke",     "NumGC*",
                                         "NumLOnlyGCWrites", "NumIntermediateMoves",
                                         "VMFreezer.*",      "gc*",
                                         "wcacheDS*"};
constexpr std::string_view kMemory[] = {"numMem*", "maxMem*", "mem*", "NumBandGets*", "indmb*"};
constexpr std::string_view kErrors[] = {"SuccessfulReconstruction*",
                                        "FailedReconstruction*",
                                        "raidSuccessful*",
                                        "raidFailed*",
                                        "InvalidParity",
                                        "MetaMismatchReread",
                                        "numCrossTempUecc",
                                        "openBandReadFail",
                                        "AbortSkip_*",
                                        "E2E_*",
                                        "BitFlip*"};

constexpr std::string_view kWriteAmplification = "Write amplification";
constexpr Group kGroups[] = {
    {"Device", kDevice},       {"Geometry", kGeometry}, {"Wear", kWear},     {"Traffic", kTraffic},
    {kWriteAmplification, {}}, {"Memory", kMemory},     {"Errors", kErrors},
};

class View {
 public:
  View(std::ostream& out, const plist::Dictionary& info, std::optional<std::size_t> columns)
      : out_(out), columns_(columns) {
    for (const plist::Entry& entry : info) {
      std::string_view key = entry.key.view();
      if (key.starts_with(kNANDInfoKeyPrefix)) key.remove_prefix(kNANDInfoKeyPrefix.size());
      values_.emplace(key, entry.value);
    }
  }

  void print() {
    takeHistograms();
    for (const Group& group : kGroups) {
      if (group.title == kWriteAmplification) {
        printWriteAmplification();
      } else {
        printGroup(group);
      }
    }
    for (const auto& [stem, buckets] : histograms_)
      printHistogram(stem, buckets);
    constexpr std::string_view kRest[] = {"*"};
    printGroup({"Other", kRest});
  }

 private:
  using Values = std::map<std::string_view, plist::Value>;
  struct Bucket {
    std::uint64_t number;  // after the stem
    std::uint64_t count;
  };
  using Buckets = std::map<std::string_view, Bucket>;  // by key

  void takeHistograms() {
    for (const auto& [key, value] : values_) {
      const std::size_t stem = key.find_last_not_of("0123456789") + 1;
      const std::string_view digits = key.substr(stem);
      const auto count = number(key);
      if (digits.empty() || digits.size() > 9 || !count) continue;
      histograms_[key.substr(0, stem)][key] = {std::stoul(std::string(digits)), *count};
    }
    std::erase_if(histograms_,
                  [](const auto& histogram) { return histogram.second.size() < kFewestBuckets; });
    for (const auto& [stem, buckets] : histograms_) {
      for (const auto& [key, bucket] : buckets)
        printed_.insert(key);
    }
  }

  std::optional<std::uint64_t> number(std::string_view key) const {
    const auto at = values_.find(key);
    const auto value = at == values_.end() ? std::nullopt : at->second.number();
    if (!value || value->int64() < 0) return std::nullopt;
    return static_cast<std::uint64_t>(value->int64());
  }

  void title(std::string_view text) {
    if (hasPrinted_) out_ << '\n';
    hasPrinted_ = true;
    out_ << printable(text) << '\n';
  }

  // Prints the keys that exist and were not printed yet.
  void printGroup(const Group& group) {
    Table table({{""}, {"", Table::Align::Right}, {""}}, 2);
    for (const std::string_view key : group.keys) {
      const bool isPrefix = key.ends_with('*');
      const std::string_view begin = key.substr(0, key.size() - (isPrefix ? 1 : 0));
      for (auto at = values_.lower_bound(begin); at != values_.end(); ++at) {
        if (isPrefix ? !at->first.starts_with(begin) : at->first != begin) break;
        if (!printed_.insert(at->first).second) continue;
        table.add({std::string(at->first), inlineText(at->second), remark(at->first)});
      }
    }
    if (table.empty()) return;
    title(group.title);
    table.print(out_, columns_);
  }

  void printHistogram(std::string_view stem, const Buckets& buckets) {
    std::vector<Bucket> sorted;
    for (const auto& [key, bucket] : buckets)
      sorted.push_back(bucket);
    std::sort(sorted.begin(), sorted.end(),
              [](const Bucket& a, const Bucket& b) { return a.number < b.number; });
    const auto holds = [](const Bucket& bucket) { return bucket.count > 0; };
    const auto first = std::find_if(sorted.begin(), sorted.end(), holds);
    if (first == sorted.end()) {
      return title(format("%s: %zu buckets, all 0", stem, sorted.size()));
    }
    const auto end = std::find_if(sorted.rbegin(), sorted.rend(), holds).base();
    std::vector<DistributionView::Bucket> bars;
    addEmpty(bars, {sorted.begin(), first});
    for (auto at = first; at != end; ++at)
      bars.push_back({std::to_string(at->number), at->count});
    addEmpty(bars, {end, sorted.end()});
    title(stem);
    printBuckets(out_, bars, columns_);
  }

  // Empty buckets at an end of a histogram share a line.
  static void addEmpty(std::vector<DistributionView::Bucket>& bars, std::span<const Bucket> empty) {
    if (empty.empty()) return;
    std::string label = std::to_string(empty.front().number);
    if (empty.size() > 1) appendFormat(label, " to %llu", empty.back().number);
    bars.push_back({std::move(label), 0});
  }

  // The products and shares are approximations for people.
  double real(std::string_view key) const { return static_cast<double>(number(key).value_or(0)); }

  double virtualBlockBytes() const { return real("PagesPerVirtualBlock") * real("BytesPerPage"); }

  std::string remark(std::string_view key) const {
    if (!number(key)) return {};
    if (key == "ExportVersion") return format("0x%llx", number(key).value_or(0));
    if (key == "formatDaysSince2000") {
      const auto weeks = number(key).value_or(0);
      if (weeks == 0 || weeks > 1'000'000) return "weeks";
      const auto day = kDaysTo2000 + 7 * static_cast<std::int64_t>(weeks);
      return format("weeks: formatted in the week from %s on", dateText(civilFromDays(day)));
    }
    if (key == "NumVirtualBlocks" && virtualBlockBytes() > 0) {
      return format("of %s, %s in all", sizeText(virtualBlockBytes()),
                    sizeText(virtualBlockBytes() * real(key)));
    }
    if (key == "NumFreeVirtualBlocks") return share(key, "NumVirtualBlocks");
    if (key == "NodesFree") return share(key, "NodesTotal");
    if (key == "NumLogicalReads" || key == "NumLogicalWrites") {
      return format("sectors of 4 KiB: %s", sizeText(real(key) * double{kSectorBytes}));
    }
    return {};
  }

  std::string share(std::string_view key, std::string_view whole) const {
    if (!number(whole) || real(whole) <= 0) return {};
    return format("%.1f %%", 100 * real(key) / real(whole));
  }

  static std::string sizeText(double bytes) {
    constexpr std::string_view kUnits[] = {"bytes", "KiB", "MiB", "GiB", "TiB", "PiB", "EiB"};
    std::size_t unit = 0;
    for (; bytes >= 1024 && unit + 1 < std::size(kUnits); ++unit)
      bytes /= 1024;
    return format("%.*f %s", unit == 0 ? 0 : 1, bytes, kUnits[unit]);
  }

  void printWriteAmplification() {
    const double writes = real("NumLogicalWrites") * double{kSectorBytes};
    if (writes <= 0 || !number("NumPhysicalErases") || virtualBlockBytes() <= 0) return;
    title(kWriteAmplification);
    out_ << format("  %.2f  erases x virtual block / logical writes\n",
                   real("NumPhysicalErases") * virtualBlockBytes() / writes);
  }

  std::ostream& out_;
  std::optional<std::size_t> columns_;
  Values values_;
  std::set<std::string_view> printed_;
  std::map<std::string_view, Buckets> histograms_;
  bool hasPrinted_ = false;
};

}  // namespace

void printNandInfo(std::ostream& out, const plist::Dictionary& info,
                   std::optional<std::size_t> columns) {
  View(out, info, columns).print();
}

}  // namespace tavrel
