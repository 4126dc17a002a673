// Labels of histogram buckets: "(-inf, 10]", "(10, 2.5e+20]", "(2.5e+20, inf)".
#pragma once

#include <optional>
#include <string_view>

#include "fleet/model/interval.h"

namespace tavrel::fleet {

/// Nothing when the text is not such a label, or when the interval holds no value.
std::optional<Interval> parseIntervalLabel(std::string_view label);

}  // namespace tavrel::fleet
