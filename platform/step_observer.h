// Follows a run from step to step.
#pragma once

#include <functional>
#include <string_view>

namespace tavrel {

/// Called with the name of each step as it begins. May be empty.
using StepObserver = std::function<void(std::string_view step)>;

inline void beginStep(const StepObserver& observer, std::string_view step) {
  if (observer) observer(step);
}

}  // namespace tavrel
