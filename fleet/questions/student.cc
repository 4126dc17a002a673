#include "fleet/questions/student.h"

#include <algorithm>
#include <cmath>
#include <numbers>
#include <numeric>

namespace tavrel::fleet {

namespace {

/// ln Γ(x + 1/2) - ln Γ(x), for x > 0. The asymptotic series is accurate only for large x; for
/// smaller ones, the recurrence Γ(x + 1) = x Γ(x) leads there.
double logGammaStep(double x) {
  constexpr double kLarge = 20;
  double product = 1;
  while (x < kLarge) {
    product *= x / (x + 0.5);
    x += 1;
  }
  const double y = 1 / (x * x);
  const double series = -(1.0 / 8 - y * (1.0 / 192 - y * (1.0 / 640 - y * (17.0 / 14336)))) / x;
  return 0.5 * std::log(x) + series + std::log(product);
}

/// The continued fraction of the incomplete beta function, by Lentz's method.
double betaFraction(double a, double b, double x) {
  constexpr double kTiny = 1e-300;
  constexpr double kEnough = 1e-16;
  constexpr int kSteps = 10'000;
  const auto step = [](double value) { return std::abs(value) < kTiny ? kTiny : value; };
  double c = 1;
  double d = 1 / step(1 - (a + b) * x / (a + 1));
  double result = d;
  for (int m = 1; m <= kSteps; ++m) {
    const double even = m * (b - m) * x / ((a + 2 * m - 1) * (a + 2 * m));
    d = 1 / step(1 + even * d);
    c = step(1 + even / c);
    result *= d * c;
    const double odd = -(a + m) * (a + b + m) * x / ((a + 2 * m) * (a + 2 * m + 1));
    d = 1 / step(1 + odd * d);
    c = step(1 + odd / c);
    const double factor = d * c;
    result *= factor;
    if (std::abs(factor - 1) <= kEnough) break;
  }
  return result;
}

}  // namespace

double studentTwoSided(double t, double degreesOfFreedom) {
  if (std::isinf(t)) return 0;
  // Above this, the normal distribution differs relatively by about t^4 / (4 degreesOfFreedom), and
  // the fraction below takes more and more steps.
  constexpr double kNormal = 1e8;
  if (degreesOfFreedom > kNormal) return std::erfc(std::abs(t) / std::numbers::sqrt2);

  // The regularised incomplete beta function at x = degreesOfFreedom / (degreesOfFreedom + t²).
  const double a = degreesOfFreedom / 2;
  const double b = 0.5;
  const double ratio = t * t / degreesOfFreedom;
  if (std::isinf(ratio)) return 0;
  const double x = 1 / (1 + ratio);
  const double y = ratio / (1 + ratio);
  if (y == 0) return 1;
  const double front = std::exp(-a * std::log1p(ratio) + b * std::log(y) + logGammaStep(a)) /
                       std::sqrt(std::numbers::pi);
  if (x <= (a + 1) / (a + b + 2)) return std::min(1.0, front * betaFraction(a, b, x) / a);
  return std::clamp(1 - front * betaFraction(b, a, y) / b, 0.0, 1.0);
}

double studentQuantile(double probability, double degreesOfFreedom) {
  double low = 0;
  double high = 1;
  while (studentTwoSided(high, degreesOfFreedom) > probability && std::isfinite(high)) {
    low = high;
    high *= 2;
  }
  double middle = (low + high) / 2;
  while (low < middle && middle < high) {
    (studentTwoSided(middle, degreesOfFreedom) > probability ? low : high) = middle;
    middle = (low + high) / 2;
  }
  return high;
}

std::vector<double> holm(std::span<const double> pValues) {
  std::vector<std::size_t> order(pValues.size());
  std::iota(order.begin(), order.end(), std::size_t{0});
  std::sort(order.begin(), order.end(), [&](auto a, auto b) { return pValues[a] < pValues[b]; });
  std::vector<double> adjusted(pValues.size());
  double largest = 0;
  auto left = static_cast<double>(order.size());
  for (const std::size_t index : order) {
    largest = std::max(largest, std::min(1.0, pValues[index] * left));
    adjusted[index] = largest;
    left -= 1;
  }
  return adjusted;
}

}  // namespace tavrel::fleet
