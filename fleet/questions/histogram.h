// Combines the histograms of many logs, even when whitelists drew their boundaries differently.
#pragma once

#include <cstdint>
#include <span>
#include <vector>

#include "fleet/model/interval.h"

namespace tavrel::fleet {

/// `count` values above `lower`, up to and including `upper`; `lower` is less than `upper`.
struct Cell {
  double lower = 0;
  double upper = 0;
  std::uint64_t count = 0;

  bool operator==(const Cell&) const = default;
};

/// A range between neighbouring boundaries, with at least `least` and at most `most` values: those
/// of a cell that spans several pieces may lie in any of them. Counts saturate at 2^64 - 1.
struct Piece {
  double lower = 0;
  double upper = 0;
  std::uint64_t least = 0;
  std::uint64_t most = 0;

  bool operator==(const Piece&) const = default;
};

/// The pieces between the boundaries of all cells, in ascending order.
std::vector<Piece> piecesOf(std::span<const Cell> cells);

std::uint64_t valuesOf(std::span<const Cell> cells);

/// For each percent, the narrowest interval that the cells allow for the value of rank
/// ceil(percent × n / 100) among their n values in ascending order. Nothing without values.
/// `percents` ascend, from 1 to 100.
std::vector<Interval> percentilesOf(std::span<const Cell> cells,
                                    std::span<const unsigned> percents);

/// The rank, counted from 1, of a percentile among `count` values, by the nearest-rank rule.
std::uint64_t nearestRank(std::uint64_t count, unsigned percent);

}  // namespace tavrel::fleet
