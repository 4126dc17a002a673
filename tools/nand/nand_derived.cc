#include "tools/nand/nand_derived.h"

#include <algorithm>
#include <nlohmann/json.hpp>
#include <string>

#include "base/arithmetic.h"
#include "storage/nand_info_keys.h"

namespace tavrel {
namespace {

constexpr std::uint64_t kSectorBytes = 4096;  // the unit of logical traffic
constexpr std::int64_t kDaysTo2000 = 10957;   // since 1970
// A stem with fewer keys is not a histogram; its keys are shown one by one.
constexpr std::size_t kFewestBuckets = 3;

constexpr std::uint64_t kMostWeeks = 1'000'000;

std::optional<std::uint64_t> product(std::optional<std::uint64_t> a,
                                     std::optional<std::uint64_t> b) {
  if (!a || !b || *a == 0 || *b == 0) return std::nullopt;
  return checkedMultiply(*a, *b);
}

std::optional<double> share(std::optional<std::uint64_t> part, std::optional<std::uint64_t> whole) {
  if (!part || !whole || *whole == 0) return std::nullopt;
  return static_cast<double>(*part) / static_cast<double>(*whole);
}

bool isEmpty(const NandBucket& bucket) {
  return bucket.count == 0;
}

template <class Value>
Json orNull(const std::optional<Value>& value) {
  return value ? Json(*value) : Json(nullptr);
}

}  // namespace

std::optional<std::uint64_t> nandFigure(const plist::Dictionary& info, std::string_view key) {
  const auto value = info.number(std::string(kNANDInfoKeyPrefix) + std::string(key));
  if (!value || value->int64() < 0) return std::nullopt;
  return static_cast<std::uint64_t>(value->int64());
}

NandDerived::NandDerived(const plist::Dictionary& info) {
  const auto figure = [&](std::string_view key) { return nandFigure(info, key); };
  virtualBlockBytes = product(figure("PagesPerVirtualBlock"), figure("BytesPerPage"));
  capacityBytes = product(virtualBlockBytes, figure("NumVirtualBlocks"));
  logicalReadBytes = product(figure("NumLogicalReads"), kSectorBytes);
  logicalWriteBytes = product(figure("NumLogicalWrites"), kSectorBytes);
  freeBlocksShare = share(figure("NumFreeVirtualBlocks"), figure("NumVirtualBlocks"));
  freeNodesShare = share(figure("NodesFree"), figure("NodesTotal"));
  if (const auto erases = figure("NumPhysicalErases"); erases && virtualBlockBytes) {
    if (const auto ofBlock = share(virtualBlockBytes, logicalWriteBytes)) {
      writeAmplification = static_cast<double>(*erases) * *ofBlock;
    }
  }
  const std::uint64_t weeks = figure("formatDaysSince2000").value_or(0);
  if (weeks > 0 && weeks <= kMostWeeks) {
    formattedFrom = civilFromDays(kDaysTo2000 + 7 * static_cast<std::int64_t>(weeks));
  }
  for (const plist::Entry& entry : info) {
    const auto number = entry.value.number();
    if (number && number->int64() == 0) ++zeros;
  }
  for (const auto& [stem, buckets] : nandHistograms(info)) {
    const auto empty = std::count_if(buckets.begin(), buckets.end(), isEmpty);
    if (static_cast<std::size_t>(empty) < buckets.size()) zeros -= static_cast<std::size_t>(empty);
  }
}

std::map<std::string_view, std::vector<NandBucket>> nandHistograms(const plist::Dictionary& info) {
  std::map<std::string_view, std::vector<NandBucket>> histograms;
  for (const plist::Entry& entry : info) {
    std::string_view key = entry.key.view();
    if (key.starts_with(kNANDInfoKeyPrefix)) key.remove_prefix(kNANDInfoKeyPrefix.size());
    const std::size_t stem = key.find_last_not_of("0123456789") + 1;
    const std::string_view digits = key.substr(stem);
    const auto count = entry.value.number();
    if (digits.empty() || digits.size() > 9 || !count || count->int64() < 0) continue;
    histograms[key.substr(0, stem)].push_back(
        {key, std::stoul(std::string(digits)), static_cast<std::uint64_t>(count->int64())});
  }
  std::erase_if(histograms,
                [](const auto& histogram) { return histogram.second.size() < kFewestBuckets; });
  for (auto& [stem, buckets] : histograms) {
    std::sort(buckets.begin(), buckets.end(),
              [](const NandBucket& a, const NandBucket& b) { return a.number < b.number; });
  }
  return histograms;
}

Json jsonOf(const NandDerived& derived) {
  return {{"virtual_block_bytes", orNull(derived.virtualBlockBytes)},
          {"capacity_bytes", orNull(derived.capacityBytes)},
          {"free_virtual_blocks_share", orNull(derived.freeBlocksShare)},
          {"free_nodes_share", orNull(derived.freeNodesShare)},
          {"logical_read_bytes", orNull(derived.logicalReadBytes)},
          {"logical_write_bytes", orNull(derived.logicalWriteBytes)},
          {"write_amplification", orNull(derived.writeAmplification)},
          {"formatted_from",
           derived.formattedFrom ? Json(dateText(*derived.formattedFrom)) : Json(nullptr)},
          {"figures_at_zero", derived.zeros}};
}

}  // namespace tavrel
