// A range of numbers.
#pragma once

namespace tavrel::fleet {

/// The values above `lower`, up to and including `upper`.
struct Interval {
  double lower = 0;
  double upper = 0;

  bool operator==(const Interval&) const = default;
};

}  // namespace tavrel::fleet
