#include "fleet/questions/histogram.h"

#include <algorithm>
#include <limits>

#include "fleet/questions/wide_sum.h"

namespace tavrel::fleet {

namespace {

std::uint64_t saturated(Uint128 value) {
  constexpr auto kMost = std::numeric_limits<std::uint64_t>::max();
  return value > kMost ? kMost : lowHalf(value);
}

/// The r-th smallest ends, for ascending ranks r, when each cell's end occurs `count` times.
std::vector<double> endsAt(std::vector<std::pair<double, std::uint64_t>> ends,
                           std::span<const std::uint64_t> ranks) {
  std::sort(ends.begin(), ends.end());
  std::vector<double> found;
  Uint128 passed = 0;
  auto end = ends.begin();
  for (const std::uint64_t rank : ranks) {
    while (passed + end->second < rank)
      passed += (end++)->second;
    found.push_back(end->first);
  }
  return found;
}

}  // namespace

std::vector<Piece> piecesOf(std::span<const Cell> cells) {
  std::vector<double> boundaries;
  for (const Cell& cell : cells)
    boundaries.insert(boundaries.end(), {cell.lower, cell.upper});
  std::sort(boundaries.begin(), boundaries.end());
  boundaries.erase(std::unique(boundaries.begin(), boundaries.end()), boundaries.end());
  if (boundaries.empty()) return {};

  // For each piece: the count of the cells that are exactly this piece, and by how much the wider
  // cells over it count more than those over the previous piece.
  std::vector<Uint128> own(boundaries.size());
  std::vector<Uint128> wider(boundaries.size());
  const auto position = [&](double boundary) {
    return static_cast<std::size_t>(
        std::lower_bound(boundaries.begin(), boundaries.end(), boundary) - boundaries.begin());
  };
  for (const Cell& cell : cells) {
    const std::size_t begin = position(cell.lower);
    const std::size_t end = position(cell.upper);
    if (end - begin == 1) {
      own[begin] += cell.count;
    } else {
      wider[begin] += cell.count;
      wider[end] -= cell.count;
    }
  }
  std::vector<Piece> pieces;
  Uint128 over = 0;
  for (std::size_t i = 0; i + 1 < boundaries.size(); ++i) {
    over += wider[i];
    pieces.push_back(
        {boundaries[i], boundaries[i + 1], saturated(own[i]), saturated(own[i] + over)});
  }
  return pieces;
}

std::uint64_t valuesOf(std::span<const Cell> cells) {
  Uint128 sum = 0;
  for (const Cell& cell : cells)
    sum += cell.count;
  return saturated(sum);
}

std::uint64_t nearestRank(std::uint64_t count, unsigned percent) {
  return lowHalf((static_cast<Uint128>(count) * percent + 99) / 100);
}

std::vector<Interval> percentilesOf(std::span<const Cell> cells,
                                    std::span<const unsigned> percents) {
  const std::uint64_t values = valuesOf(cells);
  if (values == 0) return {};
  std::vector<std::uint64_t> ranks;
  for (const unsigned percent : percents)
    ranks.push_back(nearestRank(values, percent));
  std::vector<std::pair<double, std::uint64_t>> lowers;
  std::vector<std::pair<double, std::uint64_t>> uppers;
  for (const Cell& cell : cells) {
    lowers.emplace_back(cell.lower, cell.count);
    uppers.emplace_back(cell.upper, cell.count);
  }
  const std::vector<double> low = endsAt(std::move(lowers), ranks);
  const std::vector<double> high = endsAt(std::move(uppers), ranks);
  std::vector<Interval> intervals;
  for (std::size_t i = 0; i < ranks.size(); ++i)
    intervals.push_back({low[i], high[i]});
  return intervals;
}

}  // namespace tavrel::fleet
