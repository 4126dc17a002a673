// Student's t distribution and the correction of many tests made at once.
#pragma once

#include <span>
#include <vector>

namespace tavrel::fleet {

/// The probability of a value at least as far from 0 as `t`, on either side. `degreesOfFreedom`
/// must be positive and need not be a whole number.
double studentTwoSided(double t, double degreesOfFreedom);

/// The t beyond which, on both sides together, `probability` lies (above 0, below 1).
double studentQuantile(double probability, double degreesOfFreedom);

/// P-values adjusted by Holm's step-down correction, in the order of the arguments: with
/// probability 1 - a or more, no difference whose adjusted value is below `a` is due to chance.
std::vector<double> holm(std::span<const double> pValues);

}  // namespace tavrel::fleet
