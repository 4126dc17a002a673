#include "fleet/logs/record_order.h"

#include <algorithm>
#include <cstdint>
#include <span>
#include <string_view>
#include <vector>

#include "base/format.h"
#include "platform/tallied_log.h"

namespace tavrel::fleet {
namespace {

constexpr std::size_t kShownBytes = 100;

// Sorts rows, which mostly come sorted. Returns a row whose key occurs twice, or null.
template <class Row>
const Row* sortByKey(std::vector<Row>& rows) {
  const auto before = [](const Row& a, const Row& b) { return a.key < b.key; };
  const auto notBefore = [](const Row& a, const Row& b) { return a.key >= b.key; };
  if (std::ranges::adjacent_find(rows, notBefore) == rows.end()) return nullptr;
  std::ranges::sort(rows, before);
  const auto twice = std::ranges::adjacent_find(rows, {}, &Row::key);
  return twice == rows.end() ? nullptr : &*twice;
}

std::string fault(std::string_view section, std::string_view key, std::string_view reason) {
  return format("%s/%s: %s", section, key.substr(0, kShownBytes), reason);
}

void sortCells(std::vector<CellRow>& cells) {
  std::ranges::sort(cells, [](const CellRow& a, const CellRow& b) {
    // Cells of one key mostly share its text, so compare the pointers first.
    if (a.key.data() != b.key.data()) {
      if (const auto order = a.key.compare(b.key)) return order < 0;
    }
    return a.lower != b.lower ? a.lower < b.lower : a.label < b.label;
  });
}

// Why the buckets of one key are not a histogram of `count` values.
const char* histogramFault(std::span<const CellRow> cells, std::uint64_t count) {
  std::uint64_t sum = 0;
  for (std::size_t i = 0; i < cells.size(); ++i) {
    // Each occurrence of a key in the log has its own text.
    if (cells[i].key.data() != cells[0].key.data()) return "occurs twice";
    if (i != 0 && cells[i - 1].upper > cells[i].lower) {
      return cells[i - 1].label == cells[i].label ? "has a bucket twice"
                                                  : "has buckets that overlap";
    }
    if (cells[i].count > count - sum) return "counts more values than its distribution has";
    sum += cells[i].count;
  }
  return sum == count ? nullptr : "counts fewer values than its distribution has";
}

}  // namespace

std::string putInOrder(LogRecord& record) {
  if (const ScalarRow* const twice = sortByKey(record.scalars)) {
    return fault(kScalarsMember, twice->key, "occurs twice");
  }
  if (const DistributionRow* const twice = sortByKey(record.distributions)) {
    return fault(kDistributionsMember, twice->key, "occurs twice");
  }
  sortCells(record.cells);
  auto distribution = record.distributions.begin();
  for (auto cell = record.cells.begin(); cell != record.cells.end();) {
    const std::string_view key = cell->key;
    const auto first = cell;
    while (cell != record.cells.end() && cell->key == key)
      ++cell;
    while (distribution != record.distributions.end() && distribution->key < key)
      ++distribution;
    if (distribution == record.distributions.end() || distribution->key != key) {
      return fault(kHistogramsMember, key, "has no distribution");
    }
    if (const char* const reason = histogramFault({first, cell}, distribution->numbers.count)) {
      return fault(kHistogramsMember, key, reason);
    }
  }
  return {};
}

}  // namespace tavrel::fleet
