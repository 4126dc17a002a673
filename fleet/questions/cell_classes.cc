#include "fleet/questions/cell_classes.h"

#include <algorithm>
#include <iterator>
#include <limits>

#include "base/arithmetic.h"

namespace tavrel::fleet {

namespace {

constexpr double kInfinity = std::numeric_limits<double>::infinity();

/// A cell that overlaps cells of this many classes counts only by its number of values: this bounds
/// the time that logs with made-up cells can take.
constexpr std::size_t kMostClasses = 64;

void addTo(std::uint64_t& sum, std::uint64_t count) {
  sum = saturatingAdd(sum, count);
}

}  // namespace

void CellClasses::add(LogIndex log, const Cell& cell) {
  if (!(cell.lower < cell.upper) || cell.count == 0) return;
  Counted& counted = cells_[{cell.lower, cell.upper}];
  addTo(counted.count, cell.count);
  counted.logs.push_back(log);
}

/// The most frequent cells choose their class first. `rest` gets cells that fit in no class.
std::vector<CellClasses::Class> CellClasses::classes(std::vector<const Counted*>& rest) const {
  std::vector<const std::pair<const Ends, Counted>*> order;
  for (const auto& entry : cells_)
    order.push_back(&entry);
  std::stable_sort(order.begin(), order.end(), [](const auto* a, const auto* b) {
    return a->second.logs.size() > b->second.logs.size();
  });
  std::vector<Class> result;
  for (const auto* entry : order) {
    const auto& [ends, counted] = *entry;
    const double lower = ends.first;
    const double upper = ends.second;
    const auto fits = [&](const Class& all) {
      const auto next = all.lower_bound({lower, -kInfinity});
      return (next == all.end() || next->first.first >= upper) &&
             (next == all.begin() || std::prev(next)->first.second <= lower);
    };
    auto home = std::find_if(result.begin(), result.end(), fits);
    if (home == result.end()) {
      if (result.size() == kMostClasses) {
        rest.push_back(&counted);
        continue;
      }
      home = result.emplace(result.end());
    }
    home->emplace(ends, &counted);
  }
  return result;
}

/// Appends the cells of a class of enough devices, joining neighbours until each cell has enough.
void CellClasses::joinSmall(const Class& all, std::size_t devicesAtLeast, DeviceCounter& counter,
                            Coarsened& result) const {
  const std::size_t first = result.cells.size();
  bool isOpen = false;  // whether the last cell still has too few devices
  counter.clear();
  for (const auto& [ends, counted] : all) {
    if (!isOpen) result.cells.push_back({ends.first, ends.second, 0});
    result.isJoined = result.isJoined || isOpen;
    Cell& cell = result.cells.back();
    cell.upper = ends.second;
    addTo(cell.count, counted->count);
    for (const LogIndex log : counted->logs)
      counter.insert(log);
    isOpen = counter.devices() < devicesAtLeast;
    if (!isOpen) counter.clear();
  }
  if (!isOpen || result.cells.size() == first + 1) return;
  const Cell last = result.cells.back();
  result.cells.pop_back();
  result.cells.back().upper = last.upper;
  addTo(result.cells.back().count, last.count);
  result.isJoined = true;
}

CellClasses::Coarsened CellClasses::coarsened(std::size_t devicesAtLeast) const {
  Coarsened result;
  std::vector<const Counted*> rest;
  DeviceCounter counter(table_);
  for (const Class& one : classes(rest)) {
    counter.clear();
    for (const auto& [ends, counted] : one) {
      for (const LogIndex log : counted->logs)
        counter.insert(log);
    }
    if (counter.devices() >= devicesAtLeast) {
      joinSmall(one, devicesAtLeast, counter, result);
    } else {
      for (const auto& [ends, counted] : one)
        rest.push_back(counted);
    }
  }
  if (rest.empty()) return result;

  result.isJoined = true;
  Cell anywhere{-kInfinity, kInfinity, 0};
  counter.clear();
  for (const Counted* counted : rest) {
    for (const LogIndex log : counted->logs)
      counter.insert(log);
    addTo(anywhere.count, counted->count);
  }
  if (counter.devices() < devicesAtLeast) {
    if (result.cells.empty()) return result;
    const auto least =
        std::min_element(result.cells.begin(), result.cells.end(),
                         [](const Cell& a, const Cell& b) { return a.count < b.count; });
    addTo(anywhere.count, least->count);
    result.cells.erase(least);
  }
  result.cells.push_back(anywhere);
  return result;
}

}  // namespace tavrel::fleet
