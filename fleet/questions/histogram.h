// Histograms of many logs as one, also of logs whose whitelists drew the boundaries differently.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <vector>

namespace tavrel::fleet {

/// `count` values above `lower`, up to and including `upper`. `lower` is less than `upper`.
struct Cell {
  double lower = 0;
  double upper = 0;
  std::uint64_t count = 0;

  bool operator==(const Cell&) const = default;
};

/// Between two neighbouring boundaries there are at least `least` and at most `most` values: a cell
/// that spans several pieces may have its values in any of them. Counts stay at 2^64 - 1.
struct Piece {
  double lower = 0;
  double upper = 0;
  std::uint64_t least = 0;
  std::uint64_t most = 0;

  bool operator==(const Piece&) const = default;
};

/// The pieces between all boundaries of the cells, ascending.
std::vector<Piece> piecesOf(std::span<const Cell> cells);

std::uint64_t valuesOf(std::span<const Cell> cells);

/// Above `lower`, up to and including `upper`.
struct Interval {
  double lower = 0;
  double upper = 0;

  bool operator==(const Interval&) const = default;
};

/// Where the values lie that have rank ceil(percent × n / 100) when the n values of the cells
/// ascend: nothing narrower follows from the cells. Nothing without values. `percents` ascend, from
/// 1 to 100.
std::vector<Interval> percentilesOf(std::span<const Cell> cells,
                                    std::span<const unsigned> percents);

/// The rank, from 1, of a percentile among `count` values, by the nearest-rank rule.
std::uint64_t nearestRank(std::uint64_t count, unsigned percent);

}  // namespace tavrel::fleet
