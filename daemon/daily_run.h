// The daily run: the day's tasks in their fixed order, at most once per calendar day.
#pragma once

#include <cstdint>

#include "base/plist.h"
#include "platform/platform.h"
#include "platform/step_observer.h"

namespace tavrel {

/// The gated run: does yesterday's tasks unless they were done before, and remembers the day.
/// `appInfo` is the list of activated applications, an empty handle when there is none. Calls
/// `onStep` for the gate, for each task, and for the end.
void runDailyIfNeeded(Platform& platform, const plist::Array& appInfo,
                      const StepObserver& onStep = {});

/// The tasks for one day, without the gate. A task that fails, even with an exception, does not
/// stop the ones after it.
void dailyTasksForDay(Platform& platform, std::int32_t day, const plist::Array& appInfo,
                      const StepObserver& onStep = {});

}  // namespace tavrel
