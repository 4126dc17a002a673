// Student's t distribution and the correction of many tests made at once.
#pragma once

#include <span>
#include <vector>

namespace tavrel::fleet {

/// The probability of a value at least as far from 0 as `t`, on either side. `freedom`, the degrees
/// of freedom, is positive and need not be whole.
double studentTwoSided(double t, double freedom);

/// The t beyond which, on both sides together, lies `probability` (above 0, below 1).
double studentQuantile(double probability, double freedom);

/// Holm's step-down correction: below `a`, with probability 1 - a none of the differences that are
/// called real is due to chance. In the order of the arguments.
std::vector<double> holm(std::span<const double> probabilities);

}  // namespace tavrel::fleet
