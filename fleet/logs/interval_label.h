// Labels of histogram buckets: "(-inf, 10]", "(10, 2.5e+20]", "(2.5e+20, inf)".
#pragma once

#include <optional>
#include <string_view>

namespace tavrel::fleet {

/// The values above `lower`, up to and including `upper`.
struct Interval {
  double lower = 0;
  double upper = 0;
};

/// Nothing when the text is not such a label, or when the interval holds no value.
std::optional<Interval> parseIntervalLabel(std::string_view label);

}  // namespace tavrel::fleet
