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
#include "base/quantity_text.h"
#include "storage/nand_info_keys.h"
#include "tools/console/table.h"
#include "tools/console/value_text.h"
#include "tools/nand/nand_derived.h"
#include "tools/shared/distribution_view.h"
#include "tools/shared/error_figures.h"

namespace tavrel {
namespace {

// A flash whose free share is smaller than this is marked.
constexpr double kShortShare = 0.05;

struct Group {
  std::string_view title;
  std::span<const std::string_view> keys;  // "E2E_*": all keys with that prefix, by name
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
  View(const Page& page, const plist::Dictionary& info, bool showsZeros)
      : page_(page), derived_(info), histograms_(nandHistograms(info)), showsZeros_(showsZeros) {
    for (const plist::Entry& entry : info) {
      std::string_view key = entry.key.view();
      if (key.starts_with(kNANDInfoKeyPrefix)) key.remove_prefix(kNANDInfoKeyPrefix.size());
      values_.emplace(key, entry.value);
    }
  }

  void print() {
    for (const auto& [stem, buckets] : histograms_) {
      for (const NandBucket& bucket : buckets)
        printed_.insert(bucket.key);
    }
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
    printZeros();
  }

 private:
  using Values = std::map<std::string_view, plist::Value>;
  std::optional<std::uint64_t> number(std::string_view key) const {
    const auto at = values_.find(key);
    const auto value = at == values_.end() ? std::nullopt : at->second.number();
    if (!value || value->int64() < 0) return std::nullopt;
    return static_cast<std::uint64_t>(value->int64());
  }

  void title(std::string_view text) {
    if (hasPrinted_) page_.out << '\n';
    hasPrinted_ = true;
    page_.out << page_.styled(printable(text), Emphasis::Strong) << '\n';
  }

  // Prints the keys that exist and have not been printed yet.
  void printGroup(const Group& group) {
    Table table({{"", Table::Align::Whole}, {"", Table::Align::Right}, {""}}, 2);
    for (const std::string_view key : group.keys) {
      const bool isPrefix = key.ends_with('*');
      const std::string_view begin = key.substr(0, key.size() - (isPrefix ? 1 : 0));
      for (auto at = values_.lower_bound(begin); at != values_.end(); ++at) {
        if (isPrefix ? !at->first.starts_with(begin) : at->first != begin) break;
        if (printed_.insert(at->first).second) addFigure(table, at->first, at->second);
      }
    }
    if (table.empty()) return;
    title(group.title);
    table.print(page_);
  }

  void addFigure(Table& table, std::string_view key, const plist::Value& value) {
    const bool isZero = number(key) == 0U;
    if (isZero && !showsZeros_) return;
    const auto emphasis =
        (isErrorFigure(key) && !isZero) || isShort(key) ? Emphasis::Alarm : Emphasis::None;
    table.add({{std::string(key), emphasis}, {inlineText(value), emphasis}, remark(key)});
  }

  void printHistogram(std::string_view stem, const std::vector<NandBucket>& buckets) {
    const auto holds = [](const NandBucket& bucket) { return bucket.count > 0; };
    const auto first = std::find_if(buckets.begin(), buckets.end(), holds);
    if (first == buckets.end()) {
      if (showsZeros_) title(format("%s: %zu buckets, all 0", stem, buckets.size()));
      return;
    }
    const auto end = std::find_if(buckets.rbegin(), buckets.rend(), holds).base();
    std::vector<DistributionView::Bucket> bars;
    addEmpty(bars, {buckets.begin(), first});
    for (auto at = first; at != end; ++at)
      bars.push_back({std::to_string(at->number), at->count});
    addEmpty(bars, {end, buckets.end()});
    title(stem);
    printBuckets(page_, bars);
  }

  // Empty buckets at an end of a histogram share a line.
  static void addEmpty(std::vector<DistributionView::Bucket>& bars,
                       std::span<const NandBucket> empty) {
    if (empty.empty()) return;
    std::string label = std::to_string(empty.front().number);
    if (empty.size() > 1) appendFormat(label, " to %llu", empty.back().number);
    bars.push_back({std::move(label), 0});
  }

  std::string remark(std::string_view key) const {
    const auto size = [](const std::optional<std::uint64_t>& bytes) {
      return sizeText(static_cast<double>(*bytes));
    };
    if (key == "ExportVersion" && number(key)) return format("%#llx", *number(key));
    if (key == "formatDaysSince2000" && number(key)) {
      if (!derived_.formattedFrom) return "weeks";
      return format("weeks: formatted in the week of %s", dateText(*derived_.formattedFrom));
    }
    if (key == "NumVirtualBlocks" && derived_.capacityBytes) {
      return format("of %s, %s in total", size(derived_.virtualBlockBytes),
                    size(derived_.capacityBytes));
    }
    if (const auto share = freeShare(key)) return percentText(*share);
    const auto& traffic =
        key == "NumLogicalReads" ? derived_.logicalReadBytes : derived_.logicalWriteBytes;
    if ((key == "NumLogicalReads" || key == "NumLogicalWrites") && traffic) {
      return format("sectors of 4 KiB: %s", size(traffic));
    }
    return {};
  }

  std::optional<double> freeShare(std::string_view key) const {
    if (key == "NumFreeVirtualBlocks") return derived_.freeBlocksShare;
    if (key == "NodesFree") return derived_.freeNodesShare;
    return std::nullopt;
  }

  bool isShort(std::string_view key) const {
    const auto share = freeShare(key);
    return share && *share < kShortShare;
  }

  void printWriteAmplification() {
    if (!derived_.writeAmplification) return;
    title(kWriteAmplification);
    page_.out << format("  %.2f  erases x virtual block / logical writes\n",
                        *derived_.writeAmplification);
  }

  void printZeros() {
    if (showsZeros_ || derived_.zeros == 0) return;
    const bool isOne = derived_.zeros == 1;
    if (hasPrinted_) page_.out << '\n';
    page_.out << format("%s %s 0; --all shows %s\n", counted(derived_.zeros, "figure"),
                        isOne ? "is" : "are", isOne ? "it" : "them");
  }

  const Page& page_;
  const NandDerived derived_;
  const std::map<std::string_view, std::vector<NandBucket>> histograms_;
  const bool showsZeros_;
  Values values_;
  std::set<std::string_view> printed_;
  bool hasPrinted_ = false;
};

}  // namespace

void printNandInfo(const Page& page, const plist::Dictionary& info, bool showsZeros) {
  View(page, info, showsZeros).print();
}

}  // namespace tavrel
